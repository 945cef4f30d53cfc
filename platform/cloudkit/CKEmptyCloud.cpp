#include "platform/cloudkit/CKEmptyCloud.h"

namespace droxa {
namespace {

class EmptyCloud final : public CKCloud {
 public:
  explicit EmptyCloud(std::shared_ptr<CKCloud> beside) : beside_(std::move(beside)) {}

  UUID cloudIdentifier() override { return beside_->cloudIdentifier(); }
  CKAccountReply accountStatus(const CKCallContext &context) override {
    return beside_->accountStatus(context);
  }
  const std::string &deviceName() const override { return beside_->deviceName(); }
  std::string description() const override { return "nothing shared in " + beside_->description(); }

  NSError saveZone(const CKRecordZoneID &zone, const CKCallContext &context) override {
    if (NSError stopped = context.check()) return stopped;
    return CKErrorMake(CKErrorCode::invalidArguments, "No zone can be made here: " + zone.description());
  }
  NSError deleteZone(const CKRecordZoneID &zone, const CKCallContext &context) override {
    if (NSError stopped = context.check()) return stopped;
    return noZone(zone);
  }
  CKZoneList listZones(const CKCallContext &context) override { return {context.check(), {}}; }

  CKFetchReply fetchRecords(const std::vector<CKRecordID> &ids, const CKDesiredKeys &,
                            const CKCallContext &context) override {
    if (NSError stopped = context.check()) return {stopped, {}};
    CKFetchReply reply;
    for (const CKRecordID &id : ids) reply.results.push_back({id, noZone(id.zoneID), {}});
    if (!ids.empty()) reply.error = CKErrorMake(CKErrorCode::partialFailure, "Some records weren't fetched");
    return reply;
  }

  CKModifyReply modifyRecords(const CKModifyRequest &request, const CKCallContext &context) override {
    if (NSError stopped = context.check()) return {stopped, {}, {}};
    CKModifyReply reply;
    for (const CKRecord &record : request.recordsToSave) {
      reply.saved.push_back({record.recordID, noZone(record.recordID.zoneID), {}});
    }
    for (const CKRecordDeletion &deletion : request.recordsToDelete) {
      reply.deleted.push_back({deletion.recordID, noZone(deletion.recordID.zoneID)});
    }
    if (!reply.saved.empty() || !reply.deleted.empty()) {
      reply.error = CKErrorMake(CKErrorCode::partialFailure, "Some records weren't modified");
    }
    return reply;
  }

  CKZoneChanges fetchZoneChanges(const CKRecordZoneID &zone, const CKServerChangeToken &,
                                 const CKDesiredKeys &, std::size_t, const CKCallContext &context) override {
    CKZoneChanges changes;
    changes.error = context.check();
    if (!changes.error) changes.error = noZone(zone);
    return changes;
  }

  CKUploadReply uploadAsset(int, std::uint64_t, const CKProgressHandler &,
                            const CKCallContext &context) override {
    if (NSError stopped = context.check()) return {stopped, {}};
    return {CKErrorMake(CKErrorCode::invalidArguments, "Nothing can be uploaded here"), {}};
  }
  NSError readAsset(const CKAssetReference &asset, std::uint64_t, const CKAssetSink &,
                    const CKProgressHandler &, const CKCallContext &context) override {
    if (NSError stopped = context.check()) return stopped;
    return CKErrorMake(CKErrorCode::unknownItem, "No contents " + asset.description());
  }
  CKAssetPresence hasAsset(const CKAssetReference &, const CKCallContext &context) override {
    return {context.check(), false};
  }

  // Nothing ever changes here, so nobody is ever told.
  std::unique_ptr<CKSubscription> subscribe(CKZonesChangedHandler, NSError *) override {
    class Silence final : public CKSubscription {};
    return std::make_unique<Silence>();
  }

 private:
  static NSError noZone(const CKRecordZoneID &zone) {
    return CKErrorMake(CKErrorCode::zoneNotFound, "No zone " + zone.description());
  }
  const std::shared_ptr<CKCloud> beside_;
};

}  // namespace

std::shared_ptr<CKCloud> CKEmptyCloudBeside(std::shared_ptr<CKCloud> accountCloud) {
  return std::make_shared<EmptyCloud>(std::move(accountCloud));
}

}  // namespace droxa
