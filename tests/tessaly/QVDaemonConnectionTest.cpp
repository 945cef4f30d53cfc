#include <gtest/gtest.h>
#include <thread>

#include "tessaly/QVDaemonConnection.h"
#include "tessaly/QVDaemonConnectionInProcess.h"
#include "tests/support/FakeDaemonConnection.h"

namespace droxa {

namespace {

const NSError kBroken(NSCocoaErrorDomain, NSXPCConnectionInvalid);

void refuse(const NSError &error) {
  ADD_FAILURE() << error.description();
}

}  // namespace

TEST(DaemonConnection, theDefaultConnectionIsTheOneThatWasSet) {
  const auto connection = std::make_shared<QVDaemonConnectionInProcess>(FakeDaemon::make());
  QVDaemonConnection::setDefaultConnection(connection);
  EXPECT_EQ(QVDaemonConnection::defaultConnection(), connection);
  QVDaemonConnection::setDefaultConnection(nullptr);
  const auto made = QVDaemonConnection::defaultConnection();
  EXPECT_NE(made, nullptr);
  EXPECT_NE(made, connection);
  EXPECT_EQ(QVDaemonConnection::defaultConnection(), made);
  QVDaemonConnection::setDefaultConnection(nullptr);
}

TEST(DaemonConnectionInProcess, itsProxyIsTheDaemon) {
  const auto daemon = FakeDaemon::make();
  QVDaemonConnectionInProcess connection(daemon);
  EXPECT_EQ(connection.remoteObjectProxyWithErrorHandler(refuse), daemon);
}

TEST(SyncProxy, theReplyRunsOnTheCallingThreadBeforeTheCallReturns) {
  const auto daemon = FakeDaemon::make();
  daemon->replies().answerOnAnotherThread(true);
  QVDaemonConnectionInProcess connection(daemon);
  const auto proxy = connection.newSyncProxy();
  std::thread::id ranOn;
  (*proxy)->currentNotifRankWithReply([&](std::uint64_t rank, const NSError &error) {
    ranOn = std::this_thread::get_id();
    proxy->setObjResult(rank, error);
  });
  EXPECT_EQ(ranOn, std::this_thread::get_id());
  EXPECT_EQ(proxy->result<std::uint64_t>(), daemon->rank());
  EXPECT_FALSE(proxy->error());
}

TEST(SyncProxy, theReplysErrorIsStored) {
  const auto daemon = FakeDaemon::make();
  QVDaemonConnectionInProcess connection(daemon);
  const auto proxy = connection.newSyncProxy();
  (*proxy)->getURLForItemIdentifier(
      "d99", [&](const NSURL &url, const NSError &error) { proxy->setObjResult(url, error); });
  EXPECT_FALSE(proxy->result<NSURL>());
  EXPECT_EQ(proxy->error(), qvc_errorNoSuchItem("d99"));
}

TEST(SyncProxy, aTransportFailureIsStoredInsteadOfTheReply) {
  const auto daemon = FakeDaemon::make();
  FakeDaemonConnection connection(daemon);
  daemon->replies().answerOnAnotherThread(true);
  daemon->replies().failNextInTransport("getAccount", kBroken);
  const auto proxy = connection.newSyncProxy();
  (*proxy)->getAccount([](const auto &, const NSError &) { ADD_FAILURE() << "the reply ran"; });
  EXPECT_EQ(proxy->error(), kBroken);
  EXPECT_EQ(proxy->result<std::string>(), "");
}

TEST(SyncProxy, aResultOfAnotherTypeReadsAsNil) {
  const auto proxy = QVDaemonConnectionInProcess(FakeDaemon::make()).newSyncProxy();
  proxy->setObjResult(std::string("text"), NSError());
  EXPECT_EQ(proxy->result<std::string>(), "text");
  EXPECT_FALSE(proxy->result<NSURL>());
}

TEST(SyncProxy, everyOperationWaitsForItsAnswer) {
  const auto daemon = FakeDaemon::make();
  const QVFileObjectID document = daemon->addDocument("a");
  daemon->replies().answerOnAnotherThread(true);
  const auto proxy = QVDaemonConnectionInProcess(daemon).newSyncProxy();
  QVProtocol &there = *proxy->operator->();
  int replies = 0;
  const auto reply = [&replies](const auto &...) { ++replies; };
  there.enumerateItemsInFolder(std::nullopt, 0, 0, 10, reply);
  there.enumerateAllFoldersWithSortOrder(0, 0, 10, reply);
  there.currentNotifRankWithReply(reply);
  there.enumerateWorkingSetChangesFromChangeToken(NSData(), 10, reply);
  there.getItemUpdateSenderWithReceiver(nullptr, reply);
  there.getURLForItemIdentifier(document.asString(), reply);
  there.getURLForFileObjectID(document, reply);
  there.getQueryItemForURL(daemon->url("a"), false, reply);
  there.getContainerItem("com.quorva.Tessaly.desktop", false, reply);
  there.getContainers(reply);
  there.getAccount(reply);
  there.signIn("anna", reply);
  there.signOut(reply);
  there.getStatus(reply);
  there.subscribeToNotifications(nullptr, reply);
  there.startDownloadAtURL(daemon->url("a"), QVDownloadForReader, reply);
  there.evictItemAtURL(daemon->url("a"), reply);
  there.setPinnedAtURL(daemon->url("a"), false, reply);
  there.getContentsStatusAtURL(daemon->url("a"), reply);
  there.getTransferStatus(reply);
  there.waitForUploadAtURL(daemon->url("a"), reply);
  there.getMoveCapability(daemon->url("a"), daemon->url(""), reply);
  there.confirmDeletions(true, reply);
  there.setMetadataAtURL(daemon->url("a"), {}, reply);
  there.allowDeletionAtURL(daemon->url("a"), reply);
  EXPECT_EQ(replies, 25);
  EXPECT_EQ(daemon->calls().size(), 25U);
}

}  // namespace droxa
