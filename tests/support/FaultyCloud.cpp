#include "tests/support/FaultyCloud.h"

#include <algorithm>
#include <type_traits>

namespace droxa {
namespace {

NSError lostReply() {
  return CKErrorMake(CKErrorCode::networkFailure, "The reply was lost");
}

// Passes an asset's bytes on, wrong or not at all where the fault says so.
class FaultySink {
 public:
  FaultySink(const FaultyCloud::Fault &fault, std::uint64_t offset, const CKAssetSink &sink)
      : fault_(fault), at_(offset), sink_(sink) {}

  NSError take(std::span<const std::uint8_t> bytes) {
    if (fault_.endsAt && at_ + bytes.size() >= *fault_.endsAt) {
      hasEnded_ = true;
      bytes = bytes.first(static_cast<std::size_t>(*fault_.endsAt - std::min(at_, *fault_.endsAt)));
    }
    if (NSError refused = pass(bytes)) {
      hasEnded_ = false;  // the sink's own error is the answer
      return refused;
    }
    // Any error: it ends the transfer, and is not the answer.
    return hasEnded_ ? NSError("FaultySink", 1) : NSError();
  }
  bool hasEnded() const { return hasEnded_; }

 private:
  NSError pass(std::span<const std::uint8_t> bytes) {
    if (bytes.empty()) return {};
    const std::uint64_t start = at_;
    at_ += bytes.size();
    if (!fault_.wrongByteAt || *fault_.wrongByteAt < start || *fault_.wrongByteAt >= at_) return sink_(bytes);
    std::vector<std::uint8_t> wrong(bytes.begin(), bytes.end());
    wrong[static_cast<std::size_t>(*fault_.wrongByteAt - start)] ^= 0xff;
    return sink_(wrong);
  }

  const FaultyCloud::Fault &fault_;
  std::uint64_t at_;
  const CKAssetSink &sink_;
  bool hasEnded_ = false;
};

}  // namespace

void FaultyCloud::onCall(Call call, int n, Fault fault) {
  const Lock lock(mutex_);
  scripted_[call].insert_or_assign(counts_[call] + n, std::move(fault));
}

void FaultyCloud::onEveryCall(Call call, Fault fault) {
  const Lock lock(mutex_);
  always_.insert_or_assign(call, std::move(fault));
}

void FaultyCloud::onEveryCall(const Fault &fault) {
  for (int i = 0; i <= static_cast<int>(Call::verifyShareToken); ++i)
    onEveryCall(static_cast<Call>(i), fault);
}

void FaultyCloud::clearFaults() {
  const Lock lock(mutex_);
  scripted_.clear();
  always_.clear();
}

int FaultyCloud::count(Call call) const {
  const Lock lock(mutex_);
  const auto found = counts_.find(call);
  return found == counts_.end() ? 0 : found->second;
}

int FaultyCloud::hanging() const {
  const Lock lock(mutex_);
  return hanging_;
}

FaultyCloud::Fault FaultyCloud::begin(Call call) {
  const Lock lock(mutex_);
  auto &scripted = scripted_[call];
  if (const auto own = scripted.extract(++counts_[call])) return own.mapped();
  const auto found = always_.find(call);
  return found == always_.end() ? Fault() : found->second;
}

NSError FaultyCloud::hang(const CKCallContext &context) {
  {
    const Lock lock(mutex_);
    ++hanging_;
  }
  NSError ended;
  while (!ended) ended = context.waitUntil(CKCallContext::Clock::time_point::max());
  const Lock lock(mutex_);
  --hanging_;
  return ended;
}

NSError FaultyCloud::before(const Fault &fault, const CKCallContext &context) {
  if (fault.delay.count() > 0) {
    if (NSError ended = context.waitUntil(CKCallContext::Clock::now() + fault.delay)) return ended;
  }
  return fault.hangs ? hang(context) : fault.error;
}

template <class Reply, class Body>
Reply FaultyCloud::perform(Call call, const CKCallContext &context, const Body &body) {
  const Fault fault = begin(call);
  NSError error = before(fault, context);
  if (!error) {
    Reply reply = body(fault);
    if (!fault.dropsReply) return reply;
    error = lostReply();
  }
  if constexpr (std::is_same_v<Reply, NSError>) {
    return error;
  } else {
    Reply reply;
    reply.error = std::move(error);
    return reply;
  }
}

CKAccountReply FaultyCloud::accountStatus(const CKCallContext &context) {
  return perform<CKAccountReply>(Call::accountStatus, context,
                                 [&](const Fault &) { return cloud_->accountStatus(context); });
}

NSError FaultyCloud::saveZone(const CKRecordZoneID &zone, const CKCallContext &context) {
  return perform<NSError>(Call::saveZone, context,
                          [&](const Fault &) { return cloud_->saveZone(zone, context); });
}

NSError FaultyCloud::deleteZone(const CKRecordZoneID &zone, const CKCallContext &context) {
  return perform<NSError>(Call::deleteZone, context,
                          [&](const Fault &) { return cloud_->deleteZone(zone, context); });
}

CKZoneList FaultyCloud::listZones(const CKCallContext &context) {
  return perform<CKZoneList>(Call::listZones, context,
                             [&](const Fault &) { return cloud_->listZones(context); });
}

CKFetchReply FaultyCloud::fetchRecords(const std::vector<CKRecordID> &ids, const CKDesiredKeys &desiredKeys,
                                       const CKCallContext &context) {
  return perform<CKFetchReply>(Call::fetchRecords, context, [&](const Fault &) {
    return cloud_->fetchRecords(ids, desiredKeys, context);
  });
}

CKModifyReply FaultyCloud::modifyRecords(const CKModifyRequest &request, const CKCallContext &context) {
  return perform<CKModifyReply>(Call::modifyRecords, context,
                                [&](const Fault &) { return cloud_->modifyRecords(request, context); });
}

CKZoneChanges FaultyCloud::fetchZoneChanges(const CKRecordZoneID &zone, const CKServerChangeToken &token,
                                            const CKDesiredKeys &desiredKeys, std::size_t limit,
                                            const CKCallContext &context) {
  return perform<CKZoneChanges>(Call::fetchZoneChanges, context, [&](const Fault &) {
    return cloud_->fetchZoneChanges(zone, token, desiredKeys, limit, context);
  });
}

CKUploadReply FaultyCloud::uploadAsset(int descriptor, std::uint64_t size, const CKProgressHandler &progress,
                                       const CKCallContext &context) {
  return perform<CKUploadReply>(Call::uploadAsset, context, [&](const Fault &) {
    return cloud_->uploadAsset(descriptor, size, progress, context);
  });
}

NSError FaultyCloud::readAsset(const CKAssetReference &asset, std::uint64_t offset, const CKAssetSink &sink,
                               const CKProgressHandler &progress, const CKCallContext &context) {
  return perform<NSError>(Call::readAsset, context, [&](const Fault &fault) {
    if (!sink) return cloud_->readAsset(asset, offset, sink, progress, context);
    FaultySink faulty(fault, offset, sink);
    NSError error = cloud_->readAsset(
        asset, offset, [&](std::span<const std::uint8_t> bytes) { return faulty.take(bytes); }, progress,
        context);
    if (!faulty.hasEnded()) return error;
    return fault.hangsAtEnd ? hang(context) : fault.errorAtEnd;
  });
}

CKAssetPresence FaultyCloud::hasAsset(const CKAssetReference &asset, const CKCallContext &context) {
  return perform<CKAssetPresence>(Call::hasAsset, context,
                                  [&](const Fault &) { return cloud_->hasAsset(asset, context); });
}

CKUserIdentityReply FaultyCloud::currentUserIdentity(const CKCallContext &context) {
  return perform<CKUserIdentityReply>(Call::currentUserIdentity, context,
                                      [&](const Fault &) { return cloud_->currentUserIdentity(context); });
}

CKShareParticipantsReply FaultyCloud::lookUpShareParticipants(const std::vector<std::string> &namesOrHandles,
                                                              const CKCallContext &context) {
  return perform<CKShareParticipantsReply>(Call::lookUpShareParticipants, context, [&](const Fault &) {
    return cloud_->lookUpShareParticipants(namesOrHandles, context);
  });
}

CKShareMetadataReply FaultyCloud::fetchShareMetadata(const NSURL &url, const CKCallContext &context) {
  return perform<CKShareMetadataReply>(Call::fetchShareMetadata, context, [&](const Fault &) {
    return cloud_->fetchShareMetadata(url, context);
  });
}

CKShareMetadataReply FaultyCloud::acceptShare(const NSURL &url, const CKCallContext &context) {
  return perform<CKShareMetadataReply>(Call::acceptShare, context,
                                       [&](const Fault &) { return cloud_->acceptShare(url, context); });
}

CKShareTokens FaultyCloud::shareTokens(const CKRecordID &record, const CKCallContext &context) {
  return perform<CKShareTokens>(Call::shareTokens, context,
                                [&](const Fault &) { return cloud_->shareTokens(record, context); });
}

CKShareTokenReply FaultyCloud::verifyShareToken(const std::string &token, const CKCallContext &context) {
  return perform<CKShareTokenReply>(Call::verifyShareToken, context,
                                    [&](const Fault &) { return cloud_->verifyShareToken(token, context); });
}

}  // namespace droxa
