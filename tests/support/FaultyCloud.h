#pragma once

#include <chrono>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/cloudkit/CKCloud.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// Another cloud, whose calls go wrong as a test says. Without faults it is the other cloud.
// Thread contract: every member may be called on any thread; mutex_ is held for no call.
class FaultyCloud final : public CKCloud {
 public:
  enum class Call : std::uint8_t {
    accountStatus,
    saveZone,
    deleteZone,
    listZones,
    fetchRecords,
    modifyRecords,
    fetchZoneChanges,
    uploadAsset,
    readAsset,
    hasAsset,
    currentUserIdentity,
    lookUpShareParticipants,
    fetchShareMetadata,
    acceptShare,
    shareTokens,
    verifyShareToken,
  };
  // What goes wrong with a call, in this order. Waits end early, as they should, with the call's context.
  struct Fault {
    std::chrono::milliseconds delay{0};
    bool hangs = false;       // until it is cancelled or its deadline passes
    NSError error;            // answered in place of carrying the call out
    bool dropsReply = false;  // carries it out, and answers networkFailure
    // Of readAsset alone. Offsets are the asset's.
    std::optional<std::uint64_t> wrongByteAt;  // that byte comes inverted
    std::optional<std::uint64_t> endsAt;       // no byte from there on: answers `errorAtEnd`, nil too
    NSError errorAtEnd;
    bool hangsAtEnd = false;  // there, until it is cancelled or its deadline passes
  };

  explicit FaultyCloud(std::shared_ptr<CKCloud> cloud) : cloud_(std::move(cloud)) {}

  // The n-th such call from now on (1: the next one), once.
  void onCall(Call call, int n, Fault fault) EXCLUDES(mutex_);
  void onNextCall(Call call, Fault fault) { onCall(call, 1, std::move(fault)); }
  // Every such call without a fault of its own, or every call of any kind, until clearFaults().
  void onEveryCall(Call call, Fault fault) EXCLUDES(mutex_);
  void onEveryCall(const Fault &fault) EXCLUDES(mutex_);
  void clearFaults() EXCLUDES(mutex_);

  int count(Call call) const EXCLUDES(mutex_);  // calls so far, failed ones too
  int hanging() const EXCLUDES(mutex_);         // calls that hang right now

  UUID cloudIdentifier() override { return cloud_->cloudIdentifier(); }
  const std::string &deviceName() const override { return cloud_->deviceName(); }
  std::string description() const override { return cloud_->description(); }
  CKAccountReply accountStatus(const CKCallContext &context) override;
  // A faulty cloud of its own, whose faults are set apart.
  std::shared_ptr<CKCloud> sharedDatabase() override {
    return std::make_shared<FaultyCloud>(cloud_->sharedDatabase());
  }
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
  std::unique_ptr<CKSubscription> subscribe(CKZonesChangedHandler handler, NSError *error) override {
    return cloud_->subscribe(std::move(handler), error);
  }

 private:
  Fault begin(Call call) EXCLUDES(mutex_);
  // Delays, hangs and fails as told; nil: the call is to be carried out.
  NSError before(const Fault &fault, const CKCallContext &context) EXCLUDES(mutex_);
  NSError hang(const CKCallContext &context) EXCLUDES(mutex_);
  template <class Reply, class Body>
  Reply perform(Call call, const CKCallContext &context, const Body &body);

  const std::shared_ptr<CKCloud> cloud_;
  mutable Mutex mutex_;
  std::map<Call, int> counts_ GUARDED_BY(mutex_);
  std::map<Call, std::map<int, Fault>> scripted_ GUARDED_BY(mutex_);  // by the number of the call
  std::map<Call, Fault> always_ GUARDED_BY(mutex_);
  int hanging_ GUARDED_BY(mutex_) = 0;
};

}  // namespace droxa
