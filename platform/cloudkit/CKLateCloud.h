#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <string>

#include "platform/cloudkit/CKCloud.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// Stands in for a cloud that can't be opened yet: each call tries to open it first, at most once in
// `pause`, and until that succeeds answers serviceUnavailable, with what is in the way as the underlying
// error. From then on it is that cloud. Subscriptions are refused before.
// Thread contract: every member may be called on any thread, concurrently; the opener is called by one at a
// time, and others don't wait for it.
class CKLateCloud final : public CKCloud {
 public:
  // The cloud; null with an error when it still can't be opened.
  using Opener = std::function<std::shared_ptr<CKCloud>(NSError *error)>;
  // `description` names it while it isn't open.
  CKLateCloud(std::string description, std::string deviceName, Opener opener,
              std::chrono::milliseconds pause = std::chrono::seconds(2));
  ~CKLateCloud() override;

  UUID cloudIdentifier() override;
  CKAccountReply accountStatus(const CKCallContext &context) override;
  const std::string &deviceName() const override { return deviceName_; }
  std::string description() const override;
  std::shared_ptr<CKCloud> sharedDatabase() override;
  NSError saveZone(const CKRecordZoneID &zone, const CKCallContext &context) override;
  NSError deleteZone(const CKRecordZoneID &zone, const CKCallContext &context) override;
  CKZoneList listZones(const CKCallContext &context) override;
  CKFetchReply fetchRecords(const std::vector<CKRecordID> &ids, const CKDesiredKeys &desiredKeys,
                            const CKCallContext &context) override;
  CKModifyReply modifyRecords(const CKModifyRequest &request, const CKCallContext &context) override;
  CKZoneChanges fetchZoneChanges(const CKRecordZoneID &zone, const CKServerChangeToken &token,
                                 const CKDesiredKeys &desiredKeys, std::size_t limit,
                                 const CKCallContext &context) override;
  CKUploadReply uploadAsset(int descriptor, std::uint64_t size, const CKProgressHandler &progress,
                            const CKCallContext &context) override;
  NSError readAsset(const CKAssetReference &asset, std::uint64_t offset, const CKAssetSink &sink,
                    const CKProgressHandler &progress, const CKCallContext &context) override;
  CKAssetPresence hasAsset(const CKAssetReference &asset, const CKCallContext &context) override;
  CKUserIdentityReply currentUserIdentity(const CKCallContext &context) override;
  CKShareParticipantsReply lookUpShareParticipants(const std::vector<std::string> &namesOrHandles,
                                                   const CKCallContext &context) override;
  CKShareMetadataReply fetchShareMetadata(const NSURL &url, const CKCallContext &context) override;
  CKShareMetadataReply acceptShare(const NSURL &url, const CKCallContext &context) override;
  CKShareTokens shareTokens(const CKRecordID &record, const CKCallContext &context) override;
  CKShareTokenReply verifyShareToken(const std::string &token, const CKCallContext &context) override;
  std::unique_ptr<CKSubscription> subscribe(CKZonesChangedHandler handler, NSError *error) override;

 private:
  struct State;
  CKLateCloud(std::shared_ptr<State> state, bool isShared);
  std::shared_ptr<CKCloud> opened(NSError *error) const;
  template <class Reply, class Call>
  Reply ask(const Call &call) const;

  const std::string deviceName_;
  const std::shared_ptr<State> state_;
  const bool isShared_ = false;  // the shared database of what is opened
};

}  // namespace droxa
