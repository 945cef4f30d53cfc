#include "platform/cloudkit/CKLateCloud.h"

#include <type_traits>
#include <utility>

namespace droxa {

struct CKLateCloud::State {
  State(std::string name, std::string device, Opener open, std::chrono::milliseconds least)
      : description(std::move(name)), deviceName(std::move(device)), opener(std::move(open)), pause(least) {}

  std::shared_ptr<CKCloud> opened(NSError *error) {
    {
      const Lock lock(mutex);
      if (cloud) return cloud;
      if (isOpening || std::chrono::steady_clock::now() < nextTry) {
        *error = unavailable();
        return nullptr;
      }
      isOpening = true;
    }
    NSError why;
    std::shared_ptr<CKCloud> made = opener(&why);
    const Lock lock(mutex);
    isOpening = false;
    nextTry = std::chrono::steady_clock::now() + pause;
    problem = why;
    cloud = std::move(made);
    if (!cloud) *error = unavailable();
    return cloud;
  }

  NSError unavailable() const REQUIRES(mutex) {
    const std::string why = problem ? ": " + problem.localizedDescription() : "";
    return CKErrorMake(CKErrorCode::serviceUnavailable, description + " can't be opened" + why, problem);
  }

  const std::string description;
  const std::string deviceName;
  const Opener opener;
  const std::chrono::milliseconds pause;
  mutable Mutex mutex;
  std::shared_ptr<CKCloud> cloud GUARDED_BY(mutex);
  bool isOpening GUARDED_BY(mutex) = false;
  std::chrono::steady_clock::time_point nextTry GUARDED_BY(mutex);
  NSError problem GUARDED_BY(mutex);  // the last
};

CKLateCloud::CKLateCloud(std::string description, std::string deviceName, Opener opener,
                         std::chrono::milliseconds pause)
    : deviceName_(std::move(deviceName)),
      state_(std::make_shared<State>(std::move(description), deviceName_, std::move(opener), pause)) {}

CKLateCloud::CKLateCloud(std::shared_ptr<State> state, bool isShared)
    : deviceName_(state->deviceName), state_(std::move(state)), isShared_(isShared) {}

CKLateCloud::~CKLateCloud() = default;

std::shared_ptr<CKCloud> CKLateCloud::opened(NSError *error) const {
  std::shared_ptr<CKCloud> cloud = state_->opened(error);
  return cloud && isShared_ ? cloud->sharedDatabase() : cloud;
}

// The reply of the open cloud, or one that holds nothing but why there is none.
template <class Reply, class Call>
Reply CKLateCloud::ask(const Call &call) const {
  NSError error;
  if (const auto cloud = opened(&error)) return call(*cloud);
  Reply reply;
  if constexpr (std::is_same_v<Reply, NSError>)
    reply = error;
  else
    reply.error = error;
  return reply;
}

UUID CKLateCloud::cloudIdentifier() {
  NSError ignored;
  const auto cloud = opened(&ignored);
  return cloud ? cloud->cloudIdentifier() : UUID();
}

CKAccountReply CKLateCloud::accountStatus(const CKCallContext &context) {
  return ask<CKAccountReply>([&](CKCloud &cloud) { return cloud.accountStatus(context); });
}

// Doesn't try to open it.
std::string CKLateCloud::description() const {
  const Lock lock(state_->mutex);
  return state_->cloud ? state_->cloud->description() : state_->description;
}

std::shared_ptr<CKCloud> CKLateCloud::sharedDatabase() {
  return std::shared_ptr<CKCloud>(new CKLateCloud(state_, true));
}

NSError CKLateCloud::saveZone(const CKRecordZoneID &zone, const CKCallContext &context) {
  return ask<NSError>([&](CKCloud &cloud) { return cloud.saveZone(zone, context); });
}

NSError CKLateCloud::deleteZone(const CKRecordZoneID &zone, const CKCallContext &context) {
  return ask<NSError>([&](CKCloud &cloud) { return cloud.deleteZone(zone, context); });
}

CKZoneList CKLateCloud::listZones(const CKCallContext &context) {
  return ask<CKZoneList>([&](CKCloud &cloud) { return cloud.listZones(context); });
}

CKFetchReply CKLateCloud::fetchRecords(const std::vector<CKRecordID> &ids, const CKDesiredKeys &desiredKeys,
                                       const CKCallContext &context) {
  return ask<CKFetchReply>([&](CKCloud &cloud) { return cloud.fetchRecords(ids, desiredKeys, context); });
}

CKModifyReply CKLateCloud::modifyRecords(const CKModifyRequest &request, const CKCallContext &context) {
  return ask<CKModifyReply>([&](CKCloud &cloud) { return cloud.modifyRecords(request, context); });
}

CKZoneChanges CKLateCloud::fetchZoneChanges(const CKRecordZoneID &zone, const CKServerChangeToken &token,
                                            const CKDesiredKeys &desiredKeys, std::size_t limit,
                                            const CKCallContext &context) {
  return ask<CKZoneChanges>(
      [&](CKCloud &cloud) { return cloud.fetchZoneChanges(zone, token, desiredKeys, limit, context); });
}

CKUploadReply CKLateCloud::uploadAsset(int descriptor, std::uint64_t size, const CKProgressHandler &progress,
                                       const CKCallContext &context) {
  return ask<CKUploadReply>(
      [&](CKCloud &cloud) { return cloud.uploadAsset(descriptor, size, progress, context); });
}

NSError CKLateCloud::readAsset(const CKAssetReference &asset, std::uint64_t offset, const CKAssetSink &sink,
                               const CKProgressHandler &progress, const CKCallContext &context) {
  return ask<NSError>(
      [&](CKCloud &cloud) { return cloud.readAsset(asset, offset, sink, progress, context); });
}

CKAssetPresence CKLateCloud::hasAsset(const CKAssetReference &asset, const CKCallContext &context) {
  return ask<CKAssetPresence>([&](CKCloud &cloud) { return cloud.hasAsset(asset, context); });
}

CKUserIdentityReply CKLateCloud::currentUserIdentity(const CKCallContext &context) {
  return ask<CKUserIdentityReply>([&](CKCloud &cloud) { return cloud.currentUserIdentity(context); });
}

CKShareParticipantsReply CKLateCloud::lookUpShareParticipants(const std::vector<std::string> &namesOrHandles,
                                                              const CKCallContext &context) {
  return ask<CKShareParticipantsReply>(
      [&](CKCloud &cloud) { return cloud.lookUpShareParticipants(namesOrHandles, context); });
}

CKShareMetadataReply CKLateCloud::fetchShareMetadata(const NSURL &url, const CKCallContext &context) {
  return ask<CKShareMetadataReply>([&](CKCloud &cloud) { return cloud.fetchShareMetadata(url, context); });
}

CKShareMetadataReply CKLateCloud::acceptShare(const NSURL &url, const CKCallContext &context) {
  return ask<CKShareMetadataReply>([&](CKCloud &cloud) { return cloud.acceptShare(url, context); });
}

CKShareTokens CKLateCloud::shareTokens(const CKRecordID &record, const CKCallContext &context) {
  return ask<CKShareTokens>([&](CKCloud &cloud) { return cloud.shareTokens(record, context); });
}

CKShareTokenReply CKLateCloud::verifyShareToken(const std::string &token, const CKCallContext &context) {
  return ask<CKShareTokenReply>([&](CKCloud &cloud) { return cloud.verifyShareToken(token, context); });
}

std::unique_ptr<CKSubscription> CKLateCloud::subscribe(CKZonesChangedHandler handler, NSError *error) {
  NSError why;
  if (const auto cloud = opened(&why)) return cloud->subscribe(std::move(handler), error);
  if (error != nullptr) *error = why;
  return nullptr;
}

}  // namespace droxa
