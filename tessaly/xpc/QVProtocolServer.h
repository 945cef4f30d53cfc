#pragma once

#include <memory>

#include "platform/xpc/capnp/Exported.h"
#include "tessaly/QVProtocol.h"
#include "tessaly/xpc/QVProtocol.capnp.h"
#include "tessaly/xpc/QVShareOperationServer.h"

namespace droxa {

// The daemon's object as its clients call it.
// Thread contract: the loop; the object is called on the pool, several calls at a time.
class QVProtocolServer final : public schema::QVProtocol::Server, public QVShareOperationServer {
 public:
  QVProtocolServer(Session &session, std::shared_ptr<QVProtocol> object)
      : QVShareOperationServer(session, object), exported_(session, std::move(object)) {}

  kj::Promise<void> enumerateItemsInFolder(EnumerateItemsInFolderContext context) override;
  kj::Promise<void> enumerateAllFoldersWithSortOrder(
      EnumerateAllFoldersWithSortOrderContext context) override;
  kj::Promise<void> currentNotifRankWithReply(CurrentNotifRankWithReplyContext context) override;
  kj::Promise<void> enumerateWorkingSetChangesFromChangeToken(
      EnumerateWorkingSetChangesFromChangeTokenContext context) override;
  kj::Promise<void> getItemUpdateSenderWithReceiver(GetItemUpdateSenderWithReceiverContext context) override;
  kj::Promise<void> getURLForItemIdentifier(GetURLForItemIdentifierContext context) override;
  kj::Promise<void> getURLForFileObjectID(GetURLForFileObjectIDContext context) override;
  kj::Promise<void> getQueryItemForURL(GetQueryItemForURLContext context) override;
  kj::Promise<void> getContainerItem(GetContainerItemContext context) override;
  kj::Promise<void> getContainers(GetContainersContext context) override;
  kj::Promise<void> setMetadataAtURL(SetMetadataAtURLContext context) override;
  kj::Promise<void> subscribeToNotifications(SubscribeToNotificationsContext context) override;
  kj::Promise<void> getAccount(GetAccountContext context) override;
  kj::Promise<void> signIn(SignInContext context) override;
  kj::Promise<void> signOut(SignOutContext context) override;
  kj::Promise<void> getStatus(GetStatusContext context) override;

  kj::Promise<void> startDownloadAtURL(StartDownloadAtURLContext context) override;
  kj::Promise<void> evictItemAtURL(EvictItemAtURLContext context) override;
  kj::Promise<void> setPinnedAtURL(SetPinnedAtURLContext context) override;
  kj::Promise<void> getContentsStatusAtURL(GetContentsStatusAtURLContext context) override;
  kj::Promise<void> getTransferStatus(GetTransferStatusContext context) override;
  kj::Promise<void> waitForUploadAtURL(WaitForUploadAtURLContext context) override;
  kj::Promise<void> getMoveCapability(GetMoveCapabilityContext context) override;
  kj::Promise<void> allowDeletionAtURL(AllowDeletionAtURLContext context) override;
  kj::Promise<void> confirmDeletions(ConfirmDeletionsContext context) override;

  kj::Promise<void> checkIfItemIsShareableWithInode(CheckIfItemIsShareableWithInodeContext context) override;
  kj::Promise<void> getShareOptionsOfItemIdentifier(GetShareOptionsOfItemIdentifierContext context) override;
  kj::Promise<void> refreshSharingStateForItemIdentifier(
      RefreshSharingStateForItemIdentifierContext context) override;
  kj::Promise<void> acceptShareWithURL(AcceptShareWithURLContext context) override;
  kj::Promise<void> resolveFileObjectIDsToContentRecordIDs(
      ResolveFileObjectIDsToContentRecordIDsContext context) override;
  kj::Promise<void> getContainerURLForID(GetContainerURLForIDContext context) override;

 private:
  Exported<QVProtocol> exported_;
};

}  // namespace droxa
