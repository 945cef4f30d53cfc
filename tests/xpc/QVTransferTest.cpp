#include <gtest/gtest.h>
#include <memory>

#include "tessaly/xpc/QVProtocolInterface.h"
#include "tests/support/FakeDaemon.h"
#include "tests/support/Once.h"
#include "tests/xpc/ConnectedPair.h"

// A transfer at the other end of a connection.

namespace droxa {

namespace {

class TransferOverConnection : public testing::Test {
 protected:
  TransferOverConnection() {
    daemon_->addDatalessDocument("a", 10);
    daemon_->replies().hold("download");
    pair_.serve<QVProtocol>(QVProtocolInterface(), daemon_);
  }
  std::shared_ptr<QVTransfer> start() {
    Once<std::shared_ptr<QVTransfer>, NSError> answer("download");
    pair_.client
        ->remoteObjectProxyWithErrorHandler<QVProtocol>(
            [](const NSError &error) { ADD_FAILURE() << error.description(); })
        ->startDownloadAtURL(daemon_->url("a"), QVDownloadForReader, answer.completion());
    EXPECT_TRUE(answer.value<0>());
    return answer.value<0>();
  }
  const std::shared_ptr<FakeDaemon> daemon_ = FakeDaemon::make("/replica");
  ConnectedPair pair_;
};

}  // namespace

TEST_F(TransferOverConnection, isReleasedAtTheDaemonWhenTheClientLetsGo) {
  auto transfer = start();
  EXPECT_EQ(daemon_->interests("a"), 1U);
  transfer.reset();
  EXPECT_TRUE(eventually([this] { return !daemon_->isDownloading("a"); }));
  EXPECT_EQ(daemon_->log().count("transfer 1: released"), 1U);
}

TEST_F(TransferOverConnection, isReleasedAtTheDaemonWhenTheConnectionEnds) {
  const auto transfer = start();
  Once<NSError> failure("error handler");
  transfer->remoteObjectProxyWithErrorHandler(failure.completion())->waitWithReply([](const NSError &) {
    ADD_FAILURE() << "the reply ran";
  });
  ASSERT_TRUE(daemon_->log().waitFor("transfer 1: waitWithReply"));
  pair_.server->invalidate();
  EXPECT_TRUE(eventually([this] { return !daemon_->isDownloading("a"); }));
  EXPECT_EQ(failure.value<0>().domain(), NSCocoaErrorDomain);
}

TEST_F(TransferOverConnection, isKeptByAWaitAlone) {
  auto transfer = start();
  Once<NSError> end("end");
  transfer->waitWithReply(end.completion());
  ASSERT_TRUE(daemon_->log().waitFor("transfer 1: waitWithReply"));
  transfer.reset();
  daemon_->finishDownload("a");
  EXPECT_EQ(end.value<0>(), NSError());
  EXPECT_TRUE(daemon_->item("a")->fields().isDownloaded);
}

TEST_F(TransferOverConnection, tellsProgressAndIsCancelled) {
  const auto transfer = start();
  daemon_->progressDownload("a", 4);
  Once<std::uint64_t, std::uint64_t> progress("progress");
  transfer->getProgress(progress.completion());
  EXPECT_EQ(progress.value<0>(), 4U);
  EXPECT_EQ(progress.value<1>(), 10U);
  Once<NSError> end("end");
  transfer->waitWithReply(end.completion());
  // The connection may end before the word of it is answered.
  transfer->remoteObjectProxyWithErrorHandler([](const NSError &) {})->cancel();
  EXPECT_TRUE(end.value<0>().is(QVTessalyErrorDomain, QVErrorCancelled));
  EXPECT_FALSE(daemon_->isDownloading("a"));
}

TEST_F(TransferOverConnection, carriesEveryField) {
  daemon_->setUnsent("a", true);
  daemon_->addFolder("f");
  Once<QVContentsStatus, NSError> near("status");
  daemon_->getContentsStatusAtURL(daemon_->url(""), near.completion());
  Once<QVContentsStatus, NSError> far("status");
  pair_.client->remoteObjectProxyWithErrorHandler<QVProtocol>(nullptr)->getContentsStatusAtURL(
      daemon_->url(""), far.completion());
  EXPECT_EQ(near.value<0>(), far.value<0>());
  EXPECT_EQ(far.value<0>().unsent, 1U);
  EXPECT_EQ(far.value<0>().dataless, 1U);
}

}  // namespace droxa
