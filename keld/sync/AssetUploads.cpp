#include "keld/sync/AssetUploads.h"

#include <fcntl.h>
#include <unistd.h>

#include "keld/sync/ReplicaFiles.h"
#include "platform/dispatch/dispatch.h"

namespace droxa::keld {

AssetUploads::Finished SendContents(CKCloud &cloud, int descriptor, const LocalFile &file,
                                    const CKProgressHandler &progress, const CKCallContext &context) {
  const auto isUnchanged = [&] {
    const auto facts = ReadFolderFacts(descriptor, 0);  // of any open file
    return facts && IsSameContents(LocalFileOf(*facts), file);
  };
  const NSError changed = CKErrorMake(CKErrorCode::assetFileModified, "it changed while it was sent");
  if (!isUnchanged()) return {changed, {}};
  const CKUploadReply reply = cloud.uploadAsset(descriptor, file.size, progress, context);
  if (reply.error) return {reply.error, {}};
  if (!isUnchanged()) return {changed, {}};
  return {NSError(), reply.asset.reference().sha256};
}

AssetUploads::AssetUploads(std::shared_ptr<CKCloud> cloud, std::chrono::milliseconds stallTimeout,
                           std::function<void(ItemNumber)> ended)
    : cloud_(std::move(cloud)), stallTimeout_(stallTimeout), ended_(std::move(ended)) {}

void AssetUploads::forget(ItemNumber item) {
  const Lock lock(mutex_);
  const auto known = uploads_.find(item);
  if (known == uploads_.end()) return;
  known->second.cancellation->cancel();
  uploads_.erase(known);
}

std::optional<AssetUploads::Finished> AssetUploads::take(ItemNumber item, const LocalFile &file,
                                                         int descriptor) {
  const Lock lock(mutex_);
  const auto known = uploads_.find(item);
  if (known != uploads_.end()) {
    Upload &upload = known->second;
    const bool isOfThis = IsSameContents(upload.file, file);
    if (isOfThis && upload.finished) {
      Finished finished = std::move(*upload.finished);
      uploads_.erase(known);
      return finished;
    }
    if (isOfThis) return std::nullopt;
    upload.cancellation->cancel();
    uploads_.erase(known);
  }
  const int duplicate = stopped_ ? -1 : ::fcntl(descriptor, F_DUPFD_CLOEXEC, 0);
  if (duplicate < 0) return std::nullopt;
  ++running_;
  Upload upload;
  upload.file = file;
  upload.cancellation = std::make_shared<CKCancellation>();
  upload.number = ++lastNumber_;
  dispatch_async_global(
      [self = shared_from_this(), item, file, duplicate, number = upload.number,
       cancellation = upload.cancellation] { self->run(item, number, file, duplicate, cancellation); });
  uploads_.emplace(item, std::move(upload));
  return std::nullopt;
}

void AssetUploads::run(ItemNumber item, std::uint64_t number, const LocalFile &file, int descriptor,
                       const std::shared_ptr<CKCancellation> &cancellation) {
  const OwnedDescriptor owned(descriptor);
  CKCallContext context;
  context.cancellation = cancellation;
  context.qualityOfService = CKQualityOfService::utility;
  const auto deadline = std::make_shared<CKMovingDeadline>();
  deadline->moveTo(CKCallContext::Clock::now() + stallTimeout_);
  context.idleDeadline = deadline;
  const auto progress = [&](std::uint64_t done, std::uint64_t) {
    deadline->moveTo(CKCallContext::Clock::now() + stallTimeout_);
    const Lock lock(mutex_);
    const auto known = uploads_.find(item);
    if (known != uploads_.end() && known->second.number == number) known->second.done = done;
  };
  Finished finished = SendContents(*cloud_, descriptor, file, progress, context);
  {
    const Lock lock(mutex_);
    const auto known = uploads_.find(item);
    if (known != uploads_.end() && known->second.number == number)
      known->second.finished = std::move(finished);
  }
  ended_(item);
  const Lock lock(mutex_);
  --running_;
  idle_.notify_all();
}

void AssetUploads::stop() {
  Lock lock(mutex_);
  stopped_ = true;
  for (auto &[item, upload] : uploads_) upload.cancellation->cancel();
  while (running_ > 0) idle_.wait(mutex_);
}

std::vector<AssetUploads::Progress> AssetUploads::underWay() const {
  const Lock lock(mutex_);
  std::vector<Progress> list;
  for (const auto &[item, upload] : uploads_)
    if (!upload.finished) list.push_back({item, upload.done, upload.file.size});
  return list;
}

bool AssetUploads::isUnderWay(ItemNumber item) const {
  const Lock lock(mutex_);
  const auto known = uploads_.find(item);
  return known != uploads_.end() && !known->second.finished;
}

}  // namespace droxa::keld
