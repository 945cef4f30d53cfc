#include <gtest/gtest.h>
#include <memory>

#include "platform/foundation/NSOperationQueue.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVFileProvidingOperation.h"
#include "tessaly/QVPersona.h"
#include "tests/support/FakeDaemonConnection.h"
#include "tests/support/Once.h"

namespace droxa {

namespace {

const NSError kBroken(NSCocoaErrorDomain, NSXPCConnectionInterrupted);

class ProvidingOperation : public testing::Test {
 protected:
  ProvidingOperation() { daemon_.replies().hold("download"); }
  ~ProvidingOperation() override {
    // Each is finished, whatever became of it.
    const std::size_t left = isAdded_ ? 0 : queue_.operationCount();
    EXPECT_TRUE(eventually([&] { return queue_.operationCount() == left; }));
    EXPECT_EQ(done_.calls(), 1);
    EXPECT_TRUE(eventually([this] { return !daemon_.isDownloading("a"); }));
  }
  void add() {
    isAdded_ = true;
    queue_.addOperation(operation_);
  }
  void addAndWaitUntil(const std::string &call) {
    add();
    ASSERT_TRUE(daemon_.log().waitFor(call));
  }
  void expectCancelled() const {
    EXPECT_TRUE(done_.value<0>().is(QVTessalyErrorDomain, QVErrorCancelled))
        << done_.value<0>().description();
    EXPECT_TRUE(operation_->isCancelled());
  }

  NSURL makeDocument() {
    daemon_.addDatalessDocument("a", 10);
    return daemon_.url("a");
  }

  FakeDaemonScope fake_;
  FakeDaemon &daemon_ = *fake_.daemon;
  NSOperationQueue queue_;
  const std::shared_ptr<QVFileProvidingOperation> operation_ =
      QVFileProvidingOperation::initWithURL(makeDocument(), 0x20000);
  const Once<NSError> done_{"completion"};
  bool isAdded_ = false;
};

// Its completion is set from the start.
class StartedProvidingOperation : public ProvidingOperation {
 protected:
  StartedProvidingOperation() { operation_->setFileProvidingCompletion(done_.completion()); }
};

}  // namespace

TEST_F(StartedProvidingOperation, asksTheDaemonForAReaderAndEndsWithTheDownload) {
  EXPECT_EQ(operation_->readingOptions(), 0x20000U);
  addAndWaitUntil("transfer 1: waitWithReply");
  EXPECT_EQ(daemon_.calls()[0], "startDownloadAtURL(" + daemon_.url("a").path() + ", options 1)");
  EXPECT_FALSE(done_.called());
  EXPECT_FALSE(operation_->isFinished());
  daemon_.finishDownload("a");
  EXPECT_EQ(done_.value<0>(), NSError());
  operation_->waitUntilFinished();
}

TEST_F(StartedProvidingOperation, whereTheCurrentVersionIsWantedTheCloudIsAskedFirst) {
  EXPECT_FALSE(operation_->wantsCurrentVersion());
  operation_->setWantsCurrentVersion(true);
  addAndWaitUntil("transfer 1: waitWithReply");
  EXPECT_EQ(daemon_.calls()[0], "startDownloadAtURL(" + daemon_.url("a").path() + ", options 9)");
  daemon_.finishDownload("a");
  EXPECT_EQ(done_.value<0>(), NSError());
}

TEST_F(StartedProvidingOperation, keepsNoThreadWhileItWaits) {
  addAndWaitUntil("transfer 1: waitWithReply");
  EXPECT_EQ(queue_.operationCount(), 1U);
  daemon_.finishDownload("a");
  queue_.waitUntilAllOperationsAreFinished();
  EXPECT_TRUE(done_.called());
}

TEST_F(StartedProvidingOperation, aRefusedStartIsItsError) {
  daemon_.replies().failNext("startDownloadAtURL", qvc_errorLoggedOut());
  add();
  EXPECT_EQ(done_.value<0>(), qvc_errorLoggedOut());
}

TEST_F(StartedProvidingOperation, aFailedDownloadIsItsError) {
  addAndWaitUntil("transfer 1: waitWithReply");
  const NSError quota(NSCocoaErrorDomain, 4354);
  daemon_.failDownload("a", quota);
  EXPECT_EQ(done_.value<0>(), quota);
}

TEST_F(StartedProvidingOperation, aDaemonThatIsNotThereIsTheConnectionsError) {
  fake_.connection->setUnreachable(kBroken);
  add();
  EXPECT_EQ(done_.value<0>(), kBroken);
}

TEST_F(StartedProvidingOperation, aDaemonThatGoesWhileItStartsIsTheConnectionsError) {
  daemon_.replies().hold("startDownloadAtURL");
  add();
  ASSERT_TRUE(eventually([this] { return daemon_.replies().heldCount("startDownloadAtURL") == 1; }));
  fake_.connection->loseDaemon(kBroken);
  EXPECT_EQ(done_.value<0>(), kBroken);
  daemon_.replies().release("startDownloadAtURL");
}

TEST_F(StartedProvidingOperation, aDaemonThatGoesWhileItWaitsIsTheConnectionsError) {
  addAndWaitUntil("transfer 1: waitWithReply");
  fake_.connection->loseDaemon(kBroken);
  EXPECT_EQ(done_.value<0>(), kBroken);
}

TEST_F(StartedProvidingOperation, cancelledBeforeItIsAddedItIsNeverAskedOfTheDaemon) {
  operation_->cancel();
  expectCancelled();
  add();
  operation_->waitUntilFinished();
  EXPECT_EQ(daemon_.calls().size(), 0U);
}

TEST_F(StartedProvidingOperation, cancelledAndNeverAddedItCompletesAllTheSame) {
  operation_->cancel();
  operation_->cancel();
  expectCancelled();
}

TEST_F(StartedProvidingOperation, cancelledWhileItStartsItGivesTheTransferUp) {
  daemon_.replies().hold("startDownloadAtURL");
  add();
  ASSERT_TRUE(eventually([this] { return daemon_.replies().heldCount("startDownloadAtURL") == 1; }));
  operation_->cancel();
  expectCancelled();
  EXPECT_TRUE(daemon_.isDownloading("a"));
  daemon_.replies().release("startDownloadAtURL");
  EXPECT_TRUE(daemon_.log().waitFor("transfer 1: cancel"));
}

TEST_F(StartedProvidingOperation, cancelledWhileItWaitsItGivesTheTransferUp) {
  addAndWaitUntil("transfer 1: waitWithReply");
  operation_->cancel();
  expectCancelled();
  EXPECT_TRUE(daemon_.log().waitFor("transfer 1: cancel"));
}

TEST_F(StartedProvidingOperation, aCancelOfADaemonThatDoesntAnswerCompletesAtOnce) {
  daemon_.replies().hold("waitWithReply");
  addAndWaitUntil("transfer 1: waitWithReply");
  operation_->cancel();
  expectCancelled();
  daemon_.replies().release("waitWithReply");
}

TEST_F(StartedProvidingOperation, aCancelAfterTheEndChangesNothing) {
  addAndWaitUntil("transfer 1: waitWithReply");
  daemon_.finishDownload("a");
  EXPECT_EQ(done_.value<0>(), NSError());
  operation_->cancel();
  operation_->waitUntilFinished();
  EXPECT_EQ(daemon_.log().count("transfer 1: cancel"), 0U);
}

TEST_F(ProvidingOperation, aCompletionThatIsSetAfterTheEndIsCalled) {
  operation_->cancel();
  operation_->setFileProvidingCompletion(done_.completion());
  expectCancelled();
}

TEST_F(StartedProvidingOperation, tellsItsProgress) {
  using Progress = QVFileProvidingOperation::Progress;
  EXPECT_EQ(operation_->progress(), Progress());
  addAndWaitUntil("transfer 1: waitWithReply");
  daemon_.progressDownload("a", 4);
  EXPECT_EQ(operation_->progress(), (Progress{4, 10}));
  daemon_.replies().failNextInTransport("getProgress", kBroken);
  EXPECT_EQ(operation_->progress(), (Progress{4, 10}));
  daemon_.finishDownload("a");
  done_.wait();
  EXPECT_EQ(operation_->progress(), (Progress{10, 10}));
}

TEST_F(ProvidingOperation, completesUnderAPersonaThatCantBeAdoptedAnyMore) {
  qvc_block_remember_persona = [](QVBlock) -> QVBlock { return [] {}; };  // as when the adoption fails
  operation_->setFileProvidingCompletion(done_.completion());
  qvc_block_remember_persona = nullptr;
  operation_->cancel();
  expectCancelled();
}

TEST(ProvidingOperations, cancelledAtAnyMomentEachCompletesOnce) {
  const FakeDaemonScope fake;
  fake.daemon->replies().answerOnAnotherThread(true);
  NSOperationQueue queue;
  for (int round = 0; round < 300; ++round) {
    fake.daemon->addDatalessDocument("d" + std::to_string(round), 1);
    const auto operation =
        QVFileProvidingOperation::initWithURL(fake.daemon->url("d" + std::to_string(round)), 0);
    const Once<NSError> done("completion");
    operation->setFileProvidingCompletion(done.completion());
    queue.addOperation(operation);
    if (round % 3 == 1) (void)fake.daemon->log().waitFor("startDownloadAtURL", 1);
    if (round % 3 == 2) operation->progress();
    operation->cancel();
    EXPECT_TRUE(done.wait());
    operation->waitUntilFinished();
    fake.daemon->log().clear();
  }
  EXPECT_EQ(queue.operationCount(), 0U);
}

}  // namespace droxa
