#include <gtest/gtest.h>

#include "tessaly/QVUnreachableDaemon.h"

namespace droxa {

TEST(UnreachableDaemon, everyCallFailsOnceAndNeverReplies) {
  int failures = 0;
  const auto daemon = QVUnreachableDaemon([&failures] { ++failures; });
  const auto reply = [](const auto &...) { ADD_FAILURE() << "a reply ran"; };
  daemon->enumerateItemsInFolder(std::nullopt, 0, 0, 10, reply);
  daemon->enumerateAllFoldersWithSortOrder(0, 0, 10, reply);
  daemon->currentNotifRankWithReply(reply);
  daemon->enumerateWorkingSetChangesFromChangeToken(NSData(), 10, reply);
  daemon->getItemUpdateSenderWithReceiver(nullptr, reply);
  daemon->getURLForItemIdentifier("d1", reply);
  daemon->getURLForFileObjectID(QVFileObjectID::documentID(1), reply);
  daemon->getQueryItemForURL(NSURL(), false, reply);
  daemon->getContainerItem("", false, reply);
  daemon->getContainers(reply);
  daemon->subscribeToNotifications(nullptr, reply);
  daemon->getAccount(reply);
  daemon->signIn("anna", reply);
  daemon->signOut(reply);
  daemon->getStatus(reply);
  daemon->startDownloadAtURL(NSURL(), QVDownloadForReader, reply);
  daemon->evictItemAtURL(NSURL(), reply);
  daemon->setPinnedAtURL(NSURL(), false, reply);
  daemon->getContentsStatusAtURL(NSURL(), reply);
  daemon->getTransferStatus(reply);
  daemon->waitForUploadAtURL(NSURL(), reply);
  daemon->getMoveCapability(NSURL(), NSURL(), reply);
  daemon->confirmDeletions(true, reply);
  daemon->setMetadataAtURL(NSURL(), {}, reply);
  daemon->allowDeletionAtURL(NSURL(), reply);
  EXPECT_EQ(failures, 25);
}

}  // namespace droxa
