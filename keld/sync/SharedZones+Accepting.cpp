// Accepting what others share.

#include <algorithm>

#include "keld/SharedContainer.h"
#include "keld/sync/SharedZones.h"
#include "platform/dispatch/dispatch.h"
#include "tessaly/QVErrors.h"

namespace droxa::keld {

namespace {
constexpr std::chrono::milliseconds kCallTimeout{60'000};
constexpr std::chrono::seconds kLongestWait{60};
constexpr std::chrono::milliseconds kFirstPause{5}, kLongestPause{200};
}  // namespace

void SharedZones::acceptShare(const NSURL &url, QVURLReply reply) {
  if (!url || url.isFileURL()) {
    const std::string asked = url ? url.description() : "nothing";
    return reply(NSURL(), qvc_error(QVErrorInvalidArgument,
                                    asked + " isn't the URL of a share; ask its owner for that"));
  }
  dispatch_async_global(
      [self = shared_from_this(), url, reply = std::move(reply)] { self->accept(url, reply); });
}

void SharedZones::accept(const NSURL &url, const QVURLReply &reply) {
  CKCallContext call = CKCallContext::withTimeout(kCallTimeout);
  call.cancellation = stopping_;
  const CKShareMetadataReply accepted = cloud_->acceptShare(url, call);
  if (accepted.error) return reply(NSURL(), accepted.error);
  const CKShareMetadata &metadata = accepted.metadata;
  if (!metadata.share.rootRecordID)
    return reply(NSURL(), qvc_error(QVErrorNoSuchItem, url.description() + ": it shares nothing"));
  const bool isOwn = metadata.participant.role == CKShareParticipantRole::owner;
  const std::string path = waitForItem(*metadata.share.rootRecordID, isOwn);
  if (!path.empty()) return reply(NSURL::fileURLWithPath(host_.replicaPath + "/" + path), NSError());
  if (stopping_->isCancelled())
    return reply(NSURL(), qvc_error(QVErrorShuttingDown, "the daemon is shutting down"));
  reply(NSURL(),
        qvc_error(QVErrorNoSuchItem,
                  url.description() + ": it is accepted, but isn't here yet; look for it in a while"));
}

std::string SharedZones::waitForItem(const CKRecordID &root, bool isOwn) {
  const std::string container = SharedContainerOf(root.zoneID.ownerName);
  const auto end = std::chrono::steady_clock::now() + kLongestWait;
  auto pause = kFirstPause;
  bool isAsked = false;
  while (!stopping_->isCancelled() && std::chrono::steady_clock::now() < end) {
    const auto engine = isOwn ? drive_ : engineOf(container);
    if (!engine || !isAsked) {
      const Lock lock(mutex_);
      hasNews_ = true;
      wake_.notify_all();
    }
    if (engine && !std::exchange(isAsked, true)) engine->cloudChanged();
    const auto row = engine ? engine->store().byRecord(root.recordName) : std::nullopt;
    const auto item = row && row->item != 0 ? engine->files().item(row->item) : std::nullopt;
    if (item) return engine->files().pathOf(item->id);
    stopping_->waitUntil(std::chrono::steady_clock::now() + pause);
    pause = std::min(pause * 2, kLongestPause);
  }
  return "";
}

}  // namespace droxa::keld
