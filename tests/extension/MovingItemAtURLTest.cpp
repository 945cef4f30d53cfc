#include "tessaly/QVErrors.h"
#include "tessaly/QVMoveCapability.h"
#include "tests/extension/ProvidingFixture.h"

namespace droxa {
namespace {

class MovingItem : public ProvidingTest {
 protected:
  std::pair<bool, NSError> move(const NSURL &from, const NSURL &to) {
    const Once<bool, NSError> answer("completion");
    extension->movingItemAtURL_requiresProvidingWithDestinationURL(from, to, answer.completion());
    EXPECT_EQ(answer.calls(), 1);
    return {answer.value<0>(), answer.value<1>()};
  }
  bool moveWith(std::uint64_t capability) {
    daemon.setMoveCapability(capability);
    const auto [requires_, error] = move(at("a"), at("b"));
    EXPECT_EQ(error, NSError());
    return requires_;
  }
};

TEST_F(MovingItem, requiresProvidingForEachBitThatSaysSo) {
  for (unsigned bit = 0; bit < 32; ++bit)
    EXPECT_EQ(moveWith(std::uint64_t{1} << bit), ((0x243aU >> bit) & 1) != 0) << bit;
}

TEST_F(MovingItem, answersAsTheCapabilitySays) {
  EXPECT_TRUE(moveWith(0x0400));
  EXPECT_TRUE(moveWith(0x0401));
  EXPECT_FALSE(moveWith(0x0001));
  EXPECT_FALSE(moveWith(0));
}

TEST_F(MovingItem, onlyTheLowHalfOfTheCapabilityCounts) {
  EXPECT_FALSE(moveWith(std::uint64_t{0x243a} << 32));
}

TEST_F(MovingItem, asksTheDaemonAndLogsNothing) {
  const NSURL away = NSURL::fileURLWithPath("/tmp/a");
  EXPECT_EQ(move(at("a"), away), std::pair(true, NSError()));
  EXPECT_EQ(move(at("a"), at("b")), std::pair(false, NSError()));
  EXPECT_EQ(asked(), (Lines{"getMoveCapability(" + at("a").path() + ", /tmp/a)",
                            "getMoveCapability(" + at("a").path() + ", " + at("b").path() + ")"}));
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(MovingItem, aQuestionThatFailsIsNoWithTheErrorAsItIs) {
  EXPECT_EQ(move(at("missing"), at("b")), std::pair(false, qvc_errorNoSuchItem(at("missing").path())));
  const NSError broken(NSCocoaErrorDomain, NSXPCConnectionInterrupted);
  daemon.replies().failNextInTransport("getMoveCapability", broken);
  EXPECT_EQ(move(at("a"), at("b")), std::pair(false, broken));
}

TEST_F(MovingItem, aChangedItemIsOnlyLogged) {
  extension->itemChangedAtURL(at("a"));
  EXPECT_EQ(logged(), Lines{"debug: [DEBUG] Item changed at URL " + at("a").description()});
  EXPECT_EQ(asked(), Lines{});
}

TEST_F(MovingItem, aPlaceholderIsProvidedWithoutBeingWritten) {
  const Once<NSError> done("completion");
  extension->providePlaceholderAtURL(at("a"), done.completion());
  EXPECT_EQ(done.calls(), 1);
  EXPECT_EQ(done.value<0>(), NSError());
  extension->providePlaceholderAtURL(at("a"), nullptr);
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(asked(), Lines{});
  EXPECT_FALSE(std::filesystem::exists(at("a").path()));
}

}  // namespace
}  // namespace droxa
