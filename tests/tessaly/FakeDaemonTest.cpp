#include <gtest/gtest-spi.h>
#include <gtest/gtest.h>
#include <thread>

#include "tests/support/FakeDaemon.h"
#include "tests/support/FakeDaemonConnection.h"
#include "tests/support/Once.h"
#include "tests/support/RecordingReceivers.h"

// The doubles that the other tests rest on.

namespace droxa {

namespace {

const NSError kBroken(NSCocoaErrorDomain, NSXPCConnectionInterrupted);

using Page = Once<QVQueryItems, std::uint64_t, NSError>;

// Never replies, or more than once.
class FaultyReceiver final : public QVItemNotificationReceiving {
 public:
  explicit FaultyReceiver(int replies) : replies_(replies) {}
  void receiveUpdates(const QVQueryItems &, const std::vector<std::string> &,
                      const std::vector<std::string> &, QVReply reply) override {
    for (int i = 0; i < replies_; ++i) reply();
  }
  void receiveProgressUpdates(const std::vector<std::string> &, QVReply) override {}

 private:
  const int replies_;
};

std::shared_ptr<QVItemNotificationSender> watch(const std::shared_ptr<FakeDaemon> &daemon,
                                                std::shared_ptr<QVItemNotificationReceiving> receiver) {
  Once<std::shared_ptr<QVItemNotificationSender>, std::map<std::string, std::string>, NSError> answer(
      "sender");
  daemon->getItemUpdateSenderWithReceiver(std::move(receiver), answer.completion());
  Once<NSError> gathered("watch");
  answer.value<0>()->watchItemAtURL(daemon->url(""), 19, gathered.completion());
  return answer.value<0>();
}

void pushTo(int replies) {
  const auto daemon = FakeDaemon::make();
  watch(daemon, std::make_shared<FaultyReceiver>(replies));
  daemon->addDocument("a");
}

}  // namespace

TEST(FakeDaemon, writesDownWhatItWasAsked) {
  const auto daemon = FakeDaemon::make("/replica");
  const QVFileObjectID folder = daemon->addFolder("f");
  Page page("page");
  daemon->enumerateItemsInFolder(folder, 0, 0, 200, page.completion());
  Page folders("folders");
  daemon->enumerateAllFoldersWithSortOrder(1, 7, 9, folders.completion());
  watch(daemon, std::make_shared<RecordingReceiver>())->boostPriority([] {});
  EXPECT_EQ(daemon->calls(),
            std::vector<std::string>({
                "enumerateItemsInFolder(" + folder.asString() + ", sort 0, offset 0, limit 200)",
                "enumerateAllFoldersWithSortOrder(sort 1, offset 7, limit 9)",
                "getItemUpdateSenderWithReceiver()",
                "sender 1: watchItemAtURL(/replica/com.quorva.Tessaly.default/Documents, options 19)",
                "sender 1: boostPriority",
            }));
}

TEST(FakeDaemon, failsTheNextCallOfAnOperation) {
  const auto daemon = FakeDaemon::make();
  daemon->replies().failNext("enumerateItemsInFolder", kBroken);
  Page first("first");
  daemon->enumerateItemsInFolder(std::nullopt, 0, 0, 200, first.completion());
  EXPECT_EQ(first.value<2>(), kBroken);
  Page second("second");
  daemon->enumerateItemsInFolder(std::nullopt, 0, 0, 200, second.completion());
  EXPECT_EQ(second.value<2>(), NSError());
}

TEST(FakeDaemon, holdsRepliesUntilTheyAreReleased) {
  const auto daemon = FakeDaemon::make();
  daemon->replies().hold("enumerateItemsInFolder");
  Page page("page");
  daemon->enumerateItemsInFolder(std::nullopt, 0, 0, 200, page.completion());
  EXPECT_FALSE(page.called());
  EXPECT_EQ(daemon->replies().heldCount("enumerateItemsInFolder"), 1U);
  daemon->replies().release("enumerateItemsInFolder");
  EXPECT_TRUE(page.called());
}

TEST(FakeDaemon, answersFromAnotherThreadWhenAsked) {
  const auto daemon = FakeDaemon::make();
  daemon->replies().answerOnAnotherThread(true);
  Once<std::thread::id> ranOn("reply");
  daemon->currentNotifRankWithReply(
      [answer = ranOn.completion()](std::uint64_t, const NSError &) { answer(std::this_thread::get_id()); });
  EXPECT_NE(ranOn.value<0>(), std::this_thread::get_id());
}

TEST(FakeDaemon, aFolderMayBeUnreadable) {
  const auto daemon = FakeDaemon::make();
  const QVFileObjectID folder = daemon->addFolder("f");
  daemon->setReadable("f", false);
  Page refused("page");
  daemon->enumerateItemsInFolder(folder, 0, 0, 200, refused.completion());
  EXPECT_TRUE(refused.value<2>().is(QVTessalyErrorDomain, QVErrorUnreadable));
  daemon->setReadable("f", true);
  Page page("page");
  daemon->enumerateItemsInFolder(folder, 0, 0, 200, page.completion());
  EXPECT_EQ(page.value<2>(), NSError());
}

TEST(FakeDaemon, aMisspeltOperationFailsTheTest) {
  const auto daemon = FakeDaemon::make();
  EXPECT_NONFATAL_FAILURE(daemon->replies().hold("enumerateItems"),
                          "the daemon has no operation enumerateItems");
}

TEST(FakeDaemon, aReceiverThatDoesNotReplyFailsTheTest) {
  EXPECT_NONFATAL_FAILURE(pushTo(0), "reply to receiveUpdates: dropped without a call");
}

TEST(FakeDaemon, aReceiverThatRepliesTwiceFailsTheTest) {
  EXPECT_NONFATAL_FAILURE(pushTo(2), "reply to receiveUpdates: called again");
}

TEST(FakeDaemon, keepsNoReceiverAlive) {
  std::weak_ptr<RecordingReceiver> weak;
  {
    const auto daemon = FakeDaemon::make();
    const auto receiver = std::make_shared<RecordingReceiver>();
    weak = receiver;
    watch(daemon, receiver);
  }
  EXPECT_TRUE(weak.expired());
}

TEST(FakeDaemonConnection, failsTheNextCallInTransport) {
  const auto daemon = FakeDaemon::make();
  FakeDaemonConnection connection(daemon);
  daemon->replies().failNextInTransport("getStatus", kBroken);
  Once<NSError> failed("error handler");
  connection.remoteObjectProxyWithErrorHandler(failed.completion())
      ->getStatus([](const auto &, const NSError &) { ADD_FAILURE() << "the reply ran"; });
  EXPECT_EQ(failed.value<0>(), kBroken);
  EXPECT_EQ(daemon->calls(), std::vector<std::string>({"getStatus failed in transport"}));
}

TEST(FakeDaemonConnection, breakingOffEndsTheCallsUnderWayThroughTheirHandlers) {
  const auto daemon = FakeDaemon::make();
  FakeDaemonConnection connection(daemon);
  daemon->replies().hold("getStatus");
  Once<NSError> failed("error handler");
  connection.remoteObjectProxyWithErrorHandler(failed.completion())
      ->getStatus([](const auto &, const NSError &) { ADD_FAILURE() << "the reply ran"; });
  EXPECT_EQ(connection.callsUnderWay(), 1U);
  connection.breakOff(kBroken);
  daemon->replies().release("getStatus");
  EXPECT_EQ(failed.value<0>(), kBroken);
  EXPECT_EQ(connection.callsUnderWay(), 0U);
}

TEST(FakeDaemonConnection, aSendersProxyFailsInTransportWhenAsked) {
  const auto daemon = FakeDaemon::make();
  const auto sender = watch(daemon, std::make_shared<RecordingReceiver>());
  daemon->replies().failNextInTransport("watchItemAtURL", kBroken);
  Once<NSError> failed("error handler");
  sender->remoteObjectProxyWithErrorHandler(failed.completion())
      ->watchItemAtURL(daemon->url(""), 19, [](const NSError &) { ADD_FAILURE() << "the reply ran"; });
  EXPECT_EQ(failed.value<0>(), kBroken);
}

TEST(Once, aCompletionThatNeverComesFailsTheTest) {
  EXPECT_NONFATAL_FAILURE({ const Once<int> never("answer"); }, "answer: never called");
}

TEST(Once, aSecondCallFailsTheTest) {
  const auto callTwice = [] {
    const Once<int> twice("answer");
    twice.completion()(1);
    twice.completion()(2);
  };
  EXPECT_NONFATAL_FAILURE(callTwice(), "answer: called 2 times");
}

}  // namespace droxa
