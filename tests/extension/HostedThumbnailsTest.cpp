#include <gtest/gtest.h>

#include "extension/HostedThumbnails.h"
#include "platform/dispatch/dispatch.h"
#include "tests/extension/ScriptedPrincipal.h"
#include "tests/support/Eventually.h"
#include "tests/support/Once.h"

namespace droxa {
namespace {

using Thumbnails = std::vector<FPDThumbnail>;
using Next = Once<Thumbnails, bool, NSError>;

class HostedThumbnailsTest : public testing::Test {
 protected:
  // Begun: the principal has been asked.
  void begin(const Next &first) {
    thumbnails->nextWithReply(first.completion());
    ASSERT_TRUE(principal->log.waitFor("thumbnails d1 d2"));
  }
  static NSData megabytes(std::size_t count) { return NSData::dataWithString(std::string(count << 20, 'x')); }

  const std::shared_ptr<ScriptedPrincipal> principal = std::make_shared<ScriptedPrincipal>();
  std::shared_ptr<HostedThumbnails> thumbnails =
      std::make_shared<HostedThumbnails>(principal, std::vector<std::string>{"d1", "d2"}, CGSize{64, 64});
};

TEST_F(HostedThumbnailsTest, beginsWhenTheNextOnesAreFirstAskedFor) {
  EXPECT_TRUE(principal->log.calls().empty());
  const Next first("first");
  begin(first);
  principal->takeThumbnailCompletion()(NSError());
  EXPECT_TRUE(first.value<1>());
  EXPECT_EQ(principal->log.count("thumbnails"), 1U);
}

TEST_F(HostedThumbnailsTest, eachIsToldAsItComes) {
  const Next first("first"), second("second"), last("last");
  begin(first);
  const auto handler = principal->takeThumbnailHandler();
  handler("d1", NSData::dataWithString("one"), "a type", NSError());
  ASSERT_EQ(first.value<0>().size(), 1U);
  EXPECT_EQ(first.value<0>()[0].identifier, "d1");
  EXPECT_EQ(first.value<0>()[0].imageData, NSData::dataWithString("one"));
  EXPECT_EQ(first.value<0>()[0].contentType, "a type");
  EXPECT_FALSE(first.value<1>());

  const NSError none(NSPOSIXErrorDomain, ENOENT);
  handler("d2", NSData(), std::nullopt, none);
  thumbnails->nextWithReply(second.completion());
  EXPECT_EQ(second.value<0>()[0].error, none);
  EXPECT_FALSE(second.value<0>()[0].imageData);

  thumbnails->nextWithReply(last.completion());
  const NSError outcome(NSPOSIXErrorDomain, EIO);
  principal->takeThumbnailCompletion()(outcome);
  EXPECT_TRUE(last.value<0>().empty());
  EXPECT_TRUE(last.value<1>());
  EXPECT_EQ(last.value<2>(), outcome);
}

TEST_F(HostedThumbnailsTest, whatCameIsToldBeforeTheEnd) {
  const Next first("first"), last("last");
  begin(first);
  const auto handler = principal->takeThumbnailHandler();
  handler("d1", NSData(), std::nullopt, NSError());
  EXPECT_FALSE(first.value<1>());
  handler("d2", NSData(), std::nullopt, NSError());
  principal->takeThumbnailCompletion()(NSError());
  thumbnails->nextWithReply(last.completion());
  EXPECT_EQ(last.value<0>().size(), 1U);
  EXPECT_TRUE(last.value<1>());
}

TEST_F(HostedThumbnailsTest, thePrincipalIsHeldUpWhileNobodyAsks) {
  const Next first("first");
  begin(first);
  const auto handler = principal->takeThumbnailHandler();
  const auto completion = principal->takeThumbnailCompletion();
  std::atomic<int> told{0};
  dispatch_async_global([&] {
    for (int i = 0; i < 5; ++i) {
      handler("d" + std::to_string(i), megabytes(6), std::nullopt, NSError());
      ++told;
    }
    completion(NSError());
  });
  EXPECT_EQ(first.value<0>().size(), 1U);
  ASSERT_TRUE(eventually([&] { return told == 3; })) << "what was taken, and what may wait";
  std::size_t came = 1;
  for (bool isLast = false; !isLast;) {
    const Next next("next");
    thumbnails->nextWithReply(next.completion());
    came += next.value<0>().size();
    isLast = next.value<1>();
  }
  EXPECT_EQ(came, 5U);
  EXPECT_EQ(told, 5);
}

TEST_F(HostedThumbnailsTest, cancellingEndsItAtOnceAndLetsThePrincipalGo) {
  const Next first("first");
  begin(first);
  const auto handler = principal->takeThumbnailHandler();
  const auto completion = principal->takeThumbnailCompletion();
  ASSERT_TRUE(eventually([&] {
    thumbnails->cancel();
    return principal->thumbnailProgress->isCancelled();
  }));
  EXPECT_TRUE(first.value<1>());
  EXPECT_TRUE(first.value<2>().is(NSCocoaErrorDomain, NSUserCancelledError));
  for (int i = 0; i < 5; ++i) handler("d1", megabytes(6), std::nullopt, NSError());  // held up by nobody
  completion(NSError());
  const Next again("again");
  thumbnails->nextWithReply(again.completion());
  EXPECT_TRUE(again.value<0>().empty());
  EXPECT_TRUE(again.value<2>().is(NSCocoaErrorDomain, NSUserCancelledError));
}

TEST_F(HostedThumbnailsTest, lettingGoOfItCancels) {
  const Next first("first");
  begin(first);
  thumbnails = nullptr;
  EXPECT_TRUE(eventually([&] { return principal->thumbnailProgress->isCancelled(); }));
  EXPECT_TRUE(first.value<1>());
}

TEST_F(HostedThumbnailsTest, aPrincipalThatDropsItIsAnError) {
  const Next first("first");
  begin(first);
  principal->takeThumbnailHandler();
  { const auto dropped = principal->takeThumbnailCompletion(); }
  EXPECT_TRUE(first.value<1>());
  EXPECT_TRUE(first.value<2>().is(NSCocoaErrorDomain, NSXPCConnectionReplyInvalid));
}

TEST_F(HostedThumbnailsTest, tellsHowFarItIs) {
  const Next first("first");
  begin(first);
  principal->takeThumbnailHandler()("d1", NSData(), std::nullopt, NSError());
  const Once<std::int64_t, std::int64_t> progress("progress");
  thumbnails->getProgress(progress.completion());
  EXPECT_EQ(progress.values(), (std::tuple<std::int64_t, std::int64_t>(1, 2)));
  principal->takeThumbnailCompletion()(NSError());
}

TEST_F(HostedThumbnailsTest, aSecondAskerIsRefusedWhileOneWaits) {
  const Next first("first"), second("second");
  begin(first);
  thumbnails->nextWithReply(second.completion());
  EXPECT_TRUE(second.value<2>());
  EXPECT_FALSE(first.called());
  principal->takeThumbnailCompletion()(NSError());
  EXPECT_EQ(first.value<2>(), NSError());
}

}  // namespace
}  // namespace droxa
