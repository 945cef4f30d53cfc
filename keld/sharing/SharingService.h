#pragma once

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "keld/sharing/SharingItems.h"
#include "keld/sharing/SharingQueue.h"
#include "keld/sync/KnownShares.h"
#include "tessaly/QVProtocol.h"

namespace droxa::keld {

// Who asks, and how it is told and cancelled.
struct SharingCaller {
  std::shared_ptr<SharingOwner> owner;
  std::shared_ptr<QVOperationClient> client;  // may be null
};

// How an item is shared, as getShareOptionsOfItemIdentifier tells it.
struct ShareOptions {
  bool isShared = false, isSharedByOthers = false, isSharedByItself = false;
  std::optional<std::string> sharedFolderName;
};

// The sharing operations of all connections, as QVShareOperationProtocol.h tells them: against the cloud,
// with what the sync knows of the items. What changed is known here when the reply comes. Thread contract:
// any thread. Operations run on the pool (SharingQueue).
class SharingService final : public std::enable_shared_from_this<SharingService> {
 public:
  SharingService(SharingHost host, SharingPlaces places, SharingOptions options);

  void copySharingInfo(const SharingCaller &caller, const NSURL &url, QVShareAndURLReply reply);
  void copyShareURL(const SharingCaller &caller, const std::optional<CKShare> &share,
                    const std::optional<std::string> &appName, QVShareAndURLReply reply);
  void saveSharingInfo(const SharingCaller &caller, const std::optional<CKShare> &share, QVShareReply reply);
  void createSharingInfo(const SharingCaller &caller, const NSURL &url, QVShareReply reply);
  void unshare(const SharingCaller &caller, const std::optional<CKShare> &share, bool forceDelete,
               QVShareOutcomeReply reply);
  void modifyRecordAccess(const SharingCaller &caller, const NSURL &url, bool allowAccess,
                          QVRecordAccessReply reply);
  void copyParticipantToken(const SharingCaller &caller, const NSURL &url, QVParticipantTokenReply reply);
  void prepFolder(const SharingCaller &caller, const NSURL &url, QVShareOutcomeReply reply);
  void copyCurrentUser(const SharingCaller &caller, QVCurrentUserReply reply);
  void processSubitems(const SharingCaller &caller, const NSURL &url, std::uint64_t maxSubsharesFailures,
                       std::uint64_t processType, QVShareOutcomeReply reply);
  void lookUpParticipants(const SharingCaller &caller, const QVShareParticipants &participants,
                          QVParticipantsReply reply);
  void copyDocumentURL(const SharingCaller &caller, const std::optional<CKRecordID> &recordID,
                       bool syncIfNeeded, QVSandboxingURLReply reply);

  // The other questions of QVProtocol about sharing.
  NSError checkShareable(ItemNumber number) const;
  ShareOptions shareOptions(const ItemRecord &item) const;
  void refreshSharingState(const SharingCaller &caller, ItemNumber number, QVErrorReply reply);
  std::map<QVFileObjectID, CKRecordID> contentRecords(const std::vector<QVFileObjectID> &identifiers) const;

  SharingQueue &queue() { return *queue_; }

 private:
  using Perform = std::function<NSError(SharingOperation &operation)>;
  void start(const SharingCaller &caller, Perform perform, std::function<void(const NSError &)> answer);

  // What the operations do; each answers its error.
  NSError refresh(SharingOperation &operation, const std::shared_ptr<SyncEngine> &engine);
  SharingPlace placeOf(const SharingItem &item) const { return places_.ofZone(item.engine->scope().zone); }
  // The sync of the zone, as this account writes it; null when there is none (any more).
  std::shared_ptr<SyncEngine> engineOf(const CKRecordZoneID &zone) const;
  std::optional<SyncRow> rowOf(const CKRecordID &record) const;
  NSError fetch(SharingOperation &operation, const KnownShare &known, CKShare *share);
  NSError fetchNearest(SharingOperation &operation, const ItemRecord &item, CKShare *share);
  NSError fetchOwn(SharingOperation &operation, const NSURL &url, CKShare *share);
  NSError save(SharingOperation &operation, const CKShare &share, CKShare *saved,
               const std::string &appName = {});
  NSError makeShare(SharingOperation &operation, const NSURL &url, CKShare *share);
  NSError withdraw(SharingOperation &operation, const CKShare &share, bool forceDelete);
  NSError setPublicAccess(SharingOperation &operation, const NSURL &url, bool allowAccess, CKShare *share);
  NSError withdrawBelow(SharingOperation &operation, const NSURL &folder, std::uint64_t mostFailures,
                        bool onlyChecks);
  NSError withdrawOne(SharingOperation &operation, const KnownShare &known, bool onlyChecks);
  NSError lookUp(SharingOperation &operation, std::vector<CKShareParticipant> *participants);
  NSError openDocument(SharingOperation &operation, const CKRecordID &record, bool syncIfNeeded,
                       std::shared_ptr<const FPSandboxingURLWrapper> *opened);
  NSError materialise(SharingOperation &operation, const SharingItem &item);
  NSError sharesOf(SharingOperation &operation, ItemNumber number);
  void noteSaved(const CKShare &share);
  void noteGone(const CKRecordID &share);

  const SharingHost host_;
  const SharingPlaces places_;
  mutable SharingItems items_;
  const std::shared_ptr<SharingQueue> queue_;
};

}  // namespace droxa::keld
