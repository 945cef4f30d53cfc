#pragma once

#include <memory>
#include <string>

#include "platform/cloudkit/CKCloud.h"

namespace droxa {

// A cloud to which there is no way: every call says so at once. For tests that are about something else.
class UnreachableCloud final : public CKCloud {
 public:
  UUID cloudIdentifier() override { return {}; }
  CKAccountReply accountStatus(const CKCallContext &) override { return {error(), {}}; }
  const std::string &deviceName() const override { return device_; }
  std::string description() const override { return "no cloud"; }
  std::shared_ptr<CKCloud> sharedDatabase() override { return std::make_shared<UnreachableCloud>(); }
  NSError saveZone(const CKRecordZoneID &, const CKCallContext &) override { return error(); }
  NSError deleteZone(const CKRecordZoneID &, const CKCallContext &) override { return error(); }
  CKZoneList listZones(const CKCallContext &) override { return {error(), {}}; }
  CKFetchReply fetchRecords(const std::vector<CKRecordID> &, const CKDesiredKeys &,
                            const CKCallContext &) override {
    return {error(), {}};
  }
  CKModifyReply modifyRecords(const CKModifyRequest &, const CKCallContext &) override {
    return {error(), {}, {}};
  }
  CKZoneChanges fetchZoneChanges(const CKRecordZoneID &, const CKServerChangeToken &, const CKDesiredKeys &,
                                 std::size_t, const CKCallContext &) override {
    CKZoneChanges changes;
    changes.error = error();
    return changes;
  }
  CKUploadReply uploadAsset(int, std::uint64_t, const CKProgressHandler &, const CKCallContext &) override {
    return {error(), {}};
  }
  NSError readAsset(const CKAssetReference &, std::uint64_t, const CKAssetSink &, const CKProgressHandler &,
                    const CKCallContext &) override {
    return error();
  }
  CKAssetPresence hasAsset(const CKAssetReference &, const CKCallContext &) override {
    return {error(), false};
  }
  CKUserIdentityReply currentUserIdentity(const CKCallContext &) override { return {error(), {}}; }
  CKShareParticipantsReply lookUpShareParticipants(const std::vector<std::string> &,
                                                   const CKCallContext &) override {
    return {error(), {}};
  }
  CKShareMetadataReply fetchShareMetadata(const NSURL &, const CKCallContext &) override {
    return {error(), {}};
  }
  CKShareMetadataReply acceptShare(const NSURL &, const CKCallContext &) override { return {error(), {}}; }
  CKShareTokens shareTokens(const CKRecordID &, const CKCallContext &) override { return {error(), {}, {}}; }
  CKShareTokenReply verifyShareToken(const std::string &, const CKCallContext &) override {
    return {error(), {}, {}, {}};
  }
  std::unique_ptr<CKSubscription> subscribe(CKZonesChangedHandler, NSError *problem) override {
    if (problem) *problem = error();
    return nullptr;
  }

 private:
  static NSError error() {
    return CKErrorMake(CKErrorCode::networkUnavailable, "there is no way to the cloud");
  }
  const std::string device_ = "nowhere";
};

}  // namespace droxa
