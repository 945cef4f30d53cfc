#include "keld/thumbnails/ThumbnailQueue.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <thread>
#include <unistd.h>
#include <utility>

#include "keld/TypeIdentifiers.h"
#include "keld/sync/DocumentRecord.h"
#include "platform/dispatch/dispatch.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

constexpr std::uint64_t kAtATime = 32;
constexpr std::size_t kSavedAtATime = 16;
constexpr std::chrono::seconds kCallTimeout{60};
constexpr unsigned kMostJobs = 4;

// Whatever is there, but never a wait for a writer, a link or a device.
constexpr int kOpening = O_RDONLY | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK | O_NOCTTY;

bool isFile(int descriptor, const LocalFile &expected) {
  const auto facts = ReadFolderFacts(descriptor, 0);  // of any open file
  return facts && facts->kind == NSFileProviderItemKind::document &&
         IsSameContents(LocalFileOf(*facts), expected);
}

}  // namespace

ThumbnailQueue::ThumbnailQueue(const SyncContext &context, std::shared_ptr<Thumbnailer> thumbnailer,
                               std::function<void()> wake)
    : context_(context),
      thumbnailer_(std::move(thumbnailer)),
      wake_(std::move(wake)),
      mostJobs_(std::clamp(std::thread::hardware_concurrency(), 1U, kMostJobs)) {}

bool ThumbnailQueue::isFor(const std::string &name) const {
  const std::string &type = TypeIdentifierForName(name);
  return type != kUnknownType && thumbnailer_->canMake(type);
}

std::vector<CKRecord> ThumbnailQueue::work(bool isPoll, const CKCallContext &call) {
  std::vector<CKRecord> newer = saveMade(call);
  if (!call.isCancelled()) startMore(isPoll);
  restIfIdle();
  return newer;
}

void ThumbnailQueue::stop() {
  stopping_->cancel();
  Lock lock(mutex_);
  stopped_ = true;
  ready_.clear();
  while (jobs_ > 0) idle_.wait(mutex_);
}

void ThumbnailQueue::lookAgain() {
  const Lock lock(mutex_);
  looksAgain_ = true;
}

// If the record has other contents by now, what is wanted of those was passed over while this was under way.
void ThumbnailQueue::forget(const WantedThumbnail &wanted) {
  const auto row = context_.store.byRecord(wanted.record);
  const Lock lock(mutex_);
  underWay_.erase(wanted.record);
  if (row && row->content.digest != wanted.digest) looksAgain_ = true;
}

// --- Saving. What can't be saved now waits here.

std::vector<CKRecord> ThumbnailQueue::saveMade(const CKCallContext &call) {
  {
    const Lock lock(mutex_);
    std::move(made_.begin(), made_.end(), std::back_inserter(unsaved_));
    made_.clear();
  }
  std::vector<CKRecord> newer;
  std::vector<Made> sent;
  CKModifyRequest request;
  request.isAtomic = false;
  for (Made &made : std::exchange(unsaved_, {})) {
    const auto row = context_.store.byRecord(made.wanted.record);
    if (!belongsTo(made, row)) {
      forget(made.wanted);
      continue;
    }
    request.recordsToSave.push_back(
        MakeRecordWithThumbnail(context_.scope.recordID(row->record), row->tag, made.asset));
    sent.push_back(std::move(made));
  }
  if (sent.empty()) return newer;
  CKCallContext own = call;
  own.deadline = CKCallContext::Clock::now() + kCallTimeout;
  const CKModifyReply reply = context_.cloud.modifyRecords(request, own);
  if (reply.saved.size() != sent.size()) {
    unsaved_ = std::move(sent);
    return newer;
  }
  context_.store.transaction([&] {
    for (std::size_t index = 0; index < sent.size(); ++index)
      if (!isSettled(sent[index], request.recordsToSave[index], reply.saved[index], &newer))
        unsaved_.push_back(std::move(sent[index]));
  });
  return newer;
}

// The contents may have been changed here or elsewhere since.
bool ThumbnailQueue::belongsTo(const Made &made, const std::optional<SyncRow> &row) const {
  return row && !row->tag.empty() && !row->hasNewer() && row->content.digest == made.wanted.digest;
}

// Whether nothing is left to be done about it.
bool ThumbnailQueue::isSettled(const Made &made, const CKRecord &sent, const CKRecordResult &result,
                               std::vector<CKRecord> *newer) {
  const std::string &record = made.wanted.record;
  if (!result.error) {
    saved(made, sent.recordChangeTag, result.record);
    return true;
  }
  if (const auto server = CKErrorServerRecord(result.error)) {
    if (CKServerRecordIsOwnSave(sent, *server, context_.cloud.deviceName())) {
      const auto document = ReadRecord(*server);
      if (document && document->content.digest == made.wanted.digest) {
        saved(made, sent.recordChangeTag, *server);
        return true;
      }
    }
    newer->push_back(*server);
    return false;  // whether it is still of these contents is seen when that was applied
  }
  if (CKErrorIsTransient(result.error)) return false;
  const bool isGone = CKErrorIs(result.error, CKErrorCode::unknownItem);
  // Collected before it was saved: it is made again.
  const bool isCollected = CKErrorIs(result.error, CKErrorCode::assetFileNotFound);
  if (!isCollected) context_.store.thumbnailSettled(record, made.wanted.digest);
  if (!isGone && !isCollected)
    os_log_error(qvc_default_log(), "[ERROR] can't save the thumbnail of the record %s: %@", record,
                 result.error);
  forget(made.wanted);
  return true;
}

void ThumbnailQueue::saved(const Made &made, const std::string &sentTag, const CKRecord &record) {
  auto row = context_.store.byRecord(made.wanted.record);
  if (row && row->tag == sentTag) {
    row->tag = record.recordChangeTag;
    context_.store.put(*row);
  }
  context_.store.thumbnailSettled(made.wanted.record, made.wanted.digest);
  forget(made.wanted);
}

// --- Making.

void ThumbnailQueue::startMore(bool isPoll) {
  const std::uint64_t news = context_.store.thumbnailNews();
  std::size_t known = 0;
  {
    const Lock lock(mutex_);
    if (news == wantsSeen_ && !isPoll && !std::exchange(looksAgain_, false)) return;
    if (stopped_ || isUnavailable_ || ready_.size() >= kAtATime / 2) return;
    known = underWay_.size();
  }
  if (isPoll) context_.store.dropStaleThumbnails();
  const auto due = context_.store.dueThumbnails(known + kAtATime);
  // With all that there was taken, only news are a reason to look again.
  wantsSeen_ = due.size() < known + kAtATime ? news : UINT64_MAX;
  const Lock lock(mutex_);
  for (const WantedThumbnail &wanted : due)
    if (underWay_.insert(wanted.record).second) ready_.push_back(wanted);
  while (workers_ < mostJobs_ && workers_ < ready_.size()) {
    ++workers_;
    ++jobs_;
    dispatch_async_global([self = shared_from_this()] { self->runJobs(); });
  }
}

std::optional<WantedThumbnail> ThumbnailQueue::next(bool *isMuchMade) {
  const Lock lock(mutex_);
  *isMuchMade = made_.size() >= kSavedAtATime;
  if (ready_.empty()) {
    --workers_;
    return std::nullopt;
  }
  WantedThumbnail wanted = std::move(ready_.front());
  ready_.pop_front();
  return wanted;
}

void ThumbnailQueue::runJobs() {
  for (bool isMuchMade = false;;) {
    const auto wanted = next(&isMuchMade);
    if (!wanted || isMuchMade) wake_();
    if (!wanted) break;
    runJob(*wanted);
  }
  const Lock lock(mutex_);
  --jobs_;
  idle_.notify_all();
}

void ThumbnailQueue::runJob(const WantedThumbnail &wanted) {
  Made made;
  End end = End::later;
  try {
    if (!stopping_->isCancelled()) end = make(wanted, &made);
    if (end == End::never) context_.store.thumbnailSettled(wanted.record, wanted.digest);
    if (end != End::made) forget(wanted);
  } catch (const SqlError &error) {
    os_log_error(qvc_default_log(), "[ERROR] the sync's database failed: %s", error.what());
    end = End::later;
  }
  const Lock lock(mutex_);
  if (end == End::made) made_.push_back(std::move(made));
}

void ThumbnailQueue::restIfIdle() {
  {
    const Lock lock(mutex_);
    if (workers_ > 0 || !ready_.empty()) return;
  }
  thumbnailer_->rest();
}

// The item's own file, or the source; none when neither has these contents any more.
OwnedDescriptor ThumbnailQueue::open(const WantedThumbnail &wanted, const SyncRow &row, LocalFile *file,
                                     std::string *name) {
  const auto location = context_.files.locate(row.item, nullptr);
  if (location) *name = location->path;
  const auto look =
      location ? context_.storage.classify(location->folder.get(), location->name) : DocumentLook();
  const bool isHere = location && !row.isDataless && !look.isPromised &&
                      (look.kind == DocumentClass::present || look.kind == DocumentClass::plain);
  if (isHere) {
    OwnedDescriptor own(::openat(location->folder.get(), location->name.c_str(), kOpening));
    *file = row.local;
    if (own && isFile(own.get(), row.local)) return own;
  }
  *file = wanted.sourceFile;
  return openSource(wanted, file);
}

OwnedDescriptor ThumbnailQueue::openSource(const WantedThumbnail &wanted, LocalFile *file) const {
  if (wanted.source.empty()) return OwnedDescriptor();
  OwnedDescriptor source(::open(wanted.source.c_str(), kOpening));
  if (source && !isFile(source.get(), *file)) source = OwnedDescriptor();
  return source;
}

ThumbnailQueue::End ThumbnailQueue::make(const WantedThumbnail &wanted, Made *made) {
  const auto row = context_.store.byRecord(wanted.record);
  if (!row || row->content.digest != wanted.digest) return End::later;
  LocalFile file;
  std::string name = row->name;
  const OwnedDescriptor contents = open(wanted, *row, &file, &name);
  if (!contents) {
    // Written to, moved or evicted a moment ago. What was written is sent, and wanted anew, by that.
    const bool mayComeBack = !row->isDataless && context_.files.item(row->item);
    return mayComeBack ? End::later : End::never;
  }
  ThumbnailResult result = thumbnailer_->make(contents.get(), TypeIdentifierForName(row->name), *stopping_);
  if (result.outcome == ThumbnailResult::Outcome::cancelled || !isFile(contents.get(), file))
    return End::later;
  if (result.outcome == ThumbnailResult::Outcome::unavailable) {
    const Lock lock(mutex_);
    if (!std::exchange(isUnavailable_, true))
      os_log_error(qvc_default_log(), "[ERROR] thumbnails can't be made until the next start: %s",
                   result.why);
    return End::later;
  }
  if (result.outcome == ThumbnailResult::Outcome::refused) {
    os_log_error(qvc_default_log(), "[ERROR] %s has no thumbnail: %s", name, result.why);
    return End::never;
  }
  CKCallContext call = CKCallContext::withTimeout(kCallTimeout);
  call.cancellation = stopping_;
  call.qualityOfService = CKQualityOfService::utility;
  const CKUploadReply reply = context_.cloud.uploadAsset(result.png.get(), result.size, nullptr, call);
  if (reply.error && !CKErrorIsTransient(reply.error) && !stopping_->isCancelled())
    os_log_error(qvc_default_log(), "[ERROR] can't send the thumbnail of %s: %@", name, reply.error);
  if (reply.error) return End::later;
  *made = {wanted, reply.asset.reference()};
  return End::made;
}

}  // namespace droxa::keld
