#include <gtest/gtest.h>
#include <memory>

#include "tests/support/FakeDaemon.h"
#include "tests/support/FakeDaemonConnection.h"
#include "tests/support/Once.h"

// How the fake daemon's downloads end: what the tests of cancellation and failure rest on.

namespace droxa {

namespace {

const NSError kBroken(NSCocoaErrorDomain, NSXPCConnectionInterrupted);
const NSError kOffline(NSCocoaErrorDomain, 4355);

class FakeDaemonContents : public testing::Test {
 protected:
  FakeDaemonContents() {
    daemon_->addDatalessDocument("a", 10);
    daemon_->replies().hold("download");
  }
  std::shared_ptr<QVTransfer> start(const std::string &path = "a") {
    Once<std::shared_ptr<QVTransfer>, NSError> answer("download");
    daemon_->startDownloadAtURL(daemon_->url(path), QVDownloadForReader, answer.completion());
    return answer.value<0>();
  }
  const std::shared_ptr<FakeDaemon> daemon_ = FakeDaemon::make("/replica");
};

}  // namespace

TEST_F(FakeDaemonContents, aHeldDownloadEndsWhenTheTestSays) {
  const auto transfer = start();
  Once<NSError> end("end");
  transfer->waitWithReply(end.completion());
  EXPECT_FALSE(end.called());
  EXPECT_TRUE(daemon_->isDownloading("a"));
  EXPECT_FALSE(daemon_->item("a")->fields().isDownloaded);
  daemon_->finishDownload("a");
  EXPECT_EQ(end.value<0>(), NSError());
  EXPECT_TRUE(daemon_->item("a")->fields().isDownloaded);
  daemon_->replies().release("download");
  EXPECT_EQ(end.calls(), 1);
}

TEST_F(FakeDaemonContents, aDownloadFailsAsTheTestSays) {
  const auto first = start();
  Once<NSError> firstEnd("end");
  first->waitWithReply(firstEnd.completion());
  daemon_->failDownload("a", kOffline);
  EXPECT_EQ(firstEnd.value<0>(), kOffline);
  const auto second = start();
  Once<NSError> secondEnd("end");
  second->waitWithReply(secondEnd.completion());
  daemon_->replies().failNext("download", kBroken);
  daemon_->replies().release("download");
  EXPECT_EQ(secondEnd.value<0>(), kBroken);
  EXPECT_FALSE(daemon_->item("a")->fields().isDownloaded);
}

TEST_F(FakeDaemonContents, interestsShareADownloadUntilTheLastIsCancelled) {
  const auto first = start();
  auto second = start();
  EXPECT_EQ(daemon_->downloadsStarted(), 1U);
  EXPECT_EQ(daemon_->interests("a"), 2U);
  Once<NSError> end("end");
  first->waitWithReply(end.completion());
  first->cancel();
  first->cancel();
  EXPECT_TRUE(end.value<0>().is(QVTessalyErrorDomain, QVErrorCancelled));
  EXPECT_TRUE(daemon_->isDownloading("a"));
  second.reset();
  EXPECT_FALSE(daemon_->isDownloading("a"));
  EXPECT_EQ(daemon_->log().count("transfer 2: released"), 1U);
  daemon_->replies().release("download");
  EXPECT_FALSE(daemon_->item("a")->fields().isDownloaded);
}

TEST_F(FakeDaemonContents, aPinKeepsADownloadThatNobodyWaitsFor) {
  const auto transfer = start();
  Once<NSError> pinned("pin");
  daemon_->setPinnedAtURL(daemon_->url("a"), true, pinned.completion());
  transfer->cancel();
  EXPECT_TRUE(daemon_->isDownloading("a"));
  daemon_->finishDownload("a");
  EXPECT_TRUE(daemon_->item("a")->fields().isDownloaded);
}

TEST_F(FakeDaemonContents, progressIsThatOfTheBytes) {
  const auto transfer = start();
  daemon_->progressDownload("a", 4);
  Once<std::uint64_t, std::uint64_t> progress("progress");
  transfer->getProgress(progress.completion());
  EXPECT_EQ(progress.value<0>(), 4U);
  EXPECT_EQ(progress.value<1>(), 10U);
}

TEST_F(FakeDaemonContents, anEvictionIsRefusedForWhatIsUnsentOrInUse) {
  daemon_->addDocument("b", 3);
  const auto code = [this] {
    Once<QVContentsResult, NSError> answer("eviction");
    daemon_->evictItemAtURL(daemon_->url("b"), answer.completion());
    return answer.value<1>().code();
  };
  daemon_->setInUse("b", true);
  EXPECT_EQ(code(), QVErrorDocumentInUse);
  daemon_->setUnsent("b", true);
  EXPECT_EQ(code(), QVErrorUnsentChanges);
  daemon_->setInUse("b", false);
  daemon_->setUnsent("b", false);
  EXPECT_EQ(code(), 0);
  EXPECT_FALSE(daemon_->item("b")->fields().isDownloaded);
}

TEST_F(FakeDaemonContents, anUploadIsWaitedFor) {
  daemon_->addDocument("b", 3);
  daemon_->setUnsent("b", true);
  Once<NSError> safe("upload");
  daemon_->waitForUploadAtURL(NSURL(), safe.completion());
  EXPECT_FALSE(safe.called());
  daemon_->setUnsent("b", false);
  EXPECT_EQ(safe.value<0>(), NSError());
}

TEST_F(FakeDaemonContents, aWaitEndsWithTheConnection) {
  FakeDaemonConnection connection(daemon_);
  Once<std::shared_ptr<QVTransfer>, NSError> answer("download");
  connection.remoteObjectProxyWithErrorHandler(nullptr)->startDownloadAtURL(daemon_->url("a"), 1,
                                                                            answer.completion());
  const auto transfer = answer.value<0>();
  Once<NSError> failure("error handler");
  transfer->remoteObjectProxyWithErrorHandler(failure.completion())->waitWithReply([](const NSError &) {
    ADD_FAILURE() << "the reply ran";
  });
  connection.breakOff(kBroken);
  EXPECT_EQ(failure.value<0>(), kBroken);
  daemon_->finishDownload("a");
  EXPECT_EQ(failure.calls(), 1);
}

}  // namespace droxa
