#include <gtest/gtest.h>

#include "enumeration/QVFileEnumerator.h"
#include "tests/enumeration/EnumerationFixture.h"

namespace droxa {
namespace {

using Words = std::vector<std::string>;

class FileEnumeratorChannelLoss : public EnumerationTest {
 protected:
  // The channel is gone, the token is another, and the framework was told or not.
  void expectLost(OpenFileEnumerator &enumerator, const NSData &anchorBefore, const Words &signals) {
    enumerator.drain();
    EXPECT_FALSE(enumerator.hasSender());
    EXPECT_TRUE(isExpired(changesSince(enumerator, anchorBefore)->error()));
    EXPECT_EQ(host->signals(), signals);
    EXPECT_EQ(daemon.log().count("sender 1: invalidate"), 0u);
  }
  const NSError broken = NSError(NSCocoaErrorDomain, NSXPCConnectionInterrupted);
};

TEST_F(FileEnumeratorChannelLoss, isSignalledForADaemonsError) {
  const auto enumerator = makeListed();
  const NSData anchor = currentAnchor(*enumerator);
  const NSError error(QVTessalyErrorDomain, QVErrorShuttingDown);
  enumerator->_handleNotificationError(error);
  enumerator->drain();
  EXPECT_EQ(
      logLines(),
      (Words{"debug: [DEBUG] There was an error while fetching items: " + error.description(),
             "debug: [DEBUG] invalidating change token", "debug: [DEBUG] signal changes to fileproviderd"}));
  expectLost(*enumerator, anchor, {folder.asString()});
}

TEST_F(FileEnumeratorChannelLoss, isNotSignalledForAnyOtherError) {
  const auto enumerator = makeListed();
  const NSData anchor = currentAnchor(*enumerator);
  enumerator->_handleNotificationError(broken);
  enumerator->drain();
  EXPECT_EQ(logLines(),
            (Words{"debug: [DEBUG] There was an error while fetching items: " + broken.description(),
                   "debug: [DEBUG] invalidating change token"}));
  expectLost(*enumerator, anchor, {});
}

TEST_F(FileEnumeratorChannelLoss, dropsWhatIsPending) {
  const auto enumerator = makeListed();
  push(*enumerator, {live(1), dead(2)});
  enumerator->_handleNotificationError(broken);
  enumerator->drain();
  EXPECT_EQ(enumerator->pendingUpdates(), 0u);
  EXPECT_EQ(enumerator->pendingDeletions(), Words{});
}

TEST_F(FileEnumeratorChannelLoss, followsAnErrorOfTheSendersProxies) {
  const auto enumerator = makeListed();
  const NSData anchor = currentAnchor(*enumerator);
  daemon.lastSender()->callErrorHandlers(broken);  // of both proxies
  expectLost(*enumerator, anchor, {});
  EXPECT_EQ(countOfLines("debug: [DEBUG] There was an error while fetching items: " + broken.description()),
            2u);
}

TEST_F(FileEnumeratorChannelLoss, followsABoostThatFailsInTransport) {
  daemon.replies().failNextInTransport("boostPriority", broken);
  const auto enumerator = makeForFolder();
  const NSData anchor = currentAnchor(*enumerator);
  EXPECT_EQ(listPage(*enumerator, NSData())->error(), NSError());
  expectLost(*enumerator, anchor, {});
}

TEST_F(FileEnumeratorChannelLoss, followsAWatchThatFailsInTransport) {
  daemon.replies().failNextInTransport("watchItemAtURL", broken);
  const auto enumerator = makeForFolder();
  const NSData anchor = currentAnchor(*enumerator);
  EXPECT_EQ(listPage(*enumerator, NSData())->error(), NSError());
  expectLost(*enumerator, anchor, {});
}

TEST_F(FileEnumeratorChannelLoss, followsAWatchThatIsRefused) {
  const NSError error = qvc_errorNoSuchItem("Folder");
  daemon.replies().failNext("watchItemAtURL", error);
  const auto enumerator = makeForFolder();
  const NSData anchor = currentAnchor(*enumerator);
  EXPECT_EQ(listPage(*enumerator, NSData())->error(), NSError());
  expectLost(*enumerator, anchor, {folder.asString()});
  EXPECT_TRUE(logged("debug: [DEBUG] There was an error while fetching items: " + error.description()));
}

TEST_F(FileEnumeratorChannelLoss, isMendedByTheNextListing) {
  const auto enumerator = makeListed();
  fake.connection->loseDaemon(broken);
  enumerator->drain();
  EXPECT_FALSE(enumerator->hasSender());
  EXPECT_EQ(listPage(*enumerator, NSData())->error(), NSError());
  EXPECT_TRUE(enumerator->hasSender());
  EXPECT_EQ(daemon.log().count("getItemUpdateSenderWithReceiver"), 1u);
  EXPECT_EQ(daemon.log().count("sender 2: watchItemAtURL"), 1u);
}

TEST_F(FileEnumeratorChannelLoss, afterTheEnumeratorHasGoneIsNobodysBusiness) {
  auto enumerator =
      QVFileEnumerator::initWithFileObjectID(folder, daemon.url("Folder"), folder.asString(), false);
  listPage(*enumerator, NSData());
  enumerator->invalidate();
  const std::weak_ptr<QVFileEnumerator> weak = enumerator;
  enumerator.reset();
  ASSERT_TRUE(eventually([&] { return weak.expired(); }));
  log.clear();
  daemon.lastSender()->callErrorHandlers(NSError(QVTessalyErrorDomain, QVErrorShuttingDown));
  EXPECT_EQ(logLines(), Words{});
  EXPECT_EQ(host->signalCount(), 0u);
}

}  // namespace
}  // namespace droxa
