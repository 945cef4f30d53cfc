// One transfer, from the cloud into the document.

#include <cerrno>

#include "keld/sync/CloudErrors.h"
#include "keld/sync/Downloads.h"
#include "platform/dispatch/dispatch.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

constexpr int kMostTries = 200;
constexpr std::chrono::milliseconds kPause{50};

NSError posixError(const ContentsResult &result, const std::string &path) {
  const int code = result.error != 0                               ? result.error
                   : result.outcome == ContentsOutcome::noSpace    ? ENOSPC
                   : result.outcome == ContentsOutcome::gone       ? ENOENT
                   : result.outcome == ContentsOutcome::folderGone ? ENOENT
                                                                   : EBUSY;
  return NSError::errorWithPOSIXCode(code, path);
}

}  // namespace

void Downloads::run(std::uint64_t number, ItemNumber item,
                    const std::shared_ptr<CKCancellation> &cancellation) {
  NSError error;
  for (int tries = 0;;) {
    if (cancellation->isCancelled()) {
      error = qvc_error(QVErrorCancelled, "nobody wants it any more");
      break;
    }
    error = NSError();
    const Try outcome = attempt(number, item, cancellation, &error);
    if (outcome == Try::ended) break;
    // However long another one takes for the same contents: it ends, or fails for not moving.
    if (outcome != Try::waitForOther && ++tries > kMostTries) {
      if (!error) error = NSError::errorWithPOSIXCode(EBUSY, files_.pathOf(item));
      break;
    }
    if (outcome != Try::again) cancellation->waitUntil(std::chrono::steady_clock::now() + kPause);
  }
  // What the daemon's end makes impossible was given up, and didn't fail.
  if (error.is(QVTessalyErrorDomain, QVErrorShuttingDown))
    error = qvc_error(QVErrorCancelled, "the daemon is shutting down");
  if (error && !error.is(QVTessalyErrorDomain, QVErrorCancelled))
    os_log_error(qvc_default_log(), "[ERROR] can't download %s: %@", files_.pathOf(item), error);
  // Told when whoever lists the document sees it as it is now.
  states_.flush([self = shared_from_this(), number, error] { self->end(number, error); });
}

Downloads::Try Downloads::attempt(std::uint64_t number, ItemNumber item,
                                  const std::shared_ptr<CKCancellation> &cancellation, NSError *error) {
  const auto location = files_.locate(item, error);
  if (!location) {
    if (!*error) *error = nothingThere(item, number);
    return Try::ended;
  }
  {
    const Lock lock(mutex_);
    const auto transfer = transfers_.find(number);
    if (transfer != transfers_.end()) transfer->second.path = location->path;
  }
  const std::string &name = location->name;
  const int folder = location->folder.get();
  const DocumentLook look = storage_.classify(folder, name);
  const auto row = store_.byItem(item);
  const bool isFile = look.kind != DocumentClass::missing && look.kind != DocumentClass::notADocument;
  if (isFile && !look.isPromised && look.facts.inode != location->item.facts.inode) {
    // Another file is at its place; whose that is the keeper finds out.
    states_.lookAt({location->path});
    *error = qvc_error(QVErrorDocumentInUse, files_.absolute(location->path) + ": it is being replaced");
    return Try::wait;
  }
  switch (look.kind) {
    case DocumentClass::missing:
    case DocumentClass::notADocument:
      states_.lookAt({location->path});
      return Try::wait;
    case DocumentClass::unreadable:
      if (look.error == EWOULDBLOCK) return Try::wait;  // it is being evicted just now
      *error = NSError::errorWithPOSIXCode(look.error, files_.absolute(location->path));
      return Try::ended;
    case DocumentClass::evicting:
      storage_.finishEviction(folder, name);
      return Try::again;
    case DocumentClass::partlyWritten:
      // It is moved aside before long, and the document is what it was.
      store_.enqueue(item, false, false);
      return Try::wait;
    case DocumentClass::edited:
    case DocumentClass::overwritten:
    case DocumentClass::plain:
    case DocumentClass::present:
      if (!row || !row->hasNewer()) return Try::ended;
      break;
    case DocumentClass::dataless:
      break;
  }
  DocumentMarker wanted = look.marker ? *look.marker : DocumentMarker();
  std::uint32_t mode = look.facts.mode & 07777U;
  const bool isNewer = row && row->hasNewer();
  if (isNewer) {
    wanted.recordName = row->record;
    wanted.digest = row->newer.digest;
    wanted.size = row->newer.size;
    wanted.modified = row->newer.modified;
    mode = row->newer.mode;
  }
  wanted.state = MarkerState::present;
  if (wanted.recordName.empty() || !wanted.isValid()) {
    *error = qvc_error(QVErrorDatabase, location->path + ": nothing says which contents it has");
    return Try::ended;
  }
  const bool isThere = isNewer && look.kind == DocumentClass::present &&
                       look.marker->recordName == row->record && look.marker->digest == row->newer.digest;
  if (isThere) {
    // It was put in place already, and the process ended before that was written down.
    becameNewer(row->newerTag);
    states_.show({item, false, true, LocalFileOf(look.facts), true});
    return Try::ended;
  }
  const bool isDataless = look.kind == DocumentClass::dataless;
  const bool isConflict = isNewer && !isDataless && !IsSameContents(LocalFileOf(look.facts), row->local) &&
                          look.kind != DocumentClass::present;
  const auto publish = [&](PartFile &part, PartUse use) {
    if (isDataless && !isNewer)
      return storage_.materialise(folder, name, part, use, wanted, mode, look.facts);
    PreparedResult prepared = storage_.prepareContents(part, use, wanted, mode);
    if (!prepared.result.isDone()) return prepared.result;
    if (isConflict) return keepBoth_(*location, prepared.file);
    return storage_.replaceContents(folder, name, prepared.file, look.facts);
  };
  const Try outcome = fill(number, *location, wanted, publish, cancellation, error);
  if (outcome == Try::ended && !*error && isNewer) becameNewer(row->newerTag);
  return outcome;
}

// What it was replaced by is what the cloud has.
void Downloads::becameNewer(const std::string &tag) {
  store_.transaction([&] {
    auto row = store_.byNewerTag(tag);
    if (!row) return;
    row->tag = row->newerTag;
    row->content = row->newer;
    row->newerTag.clear();
    row->newer = {};
    row->isDataless = false;
    row->local = {};  // found out of the file when it is looked at
    store_.put(*row);
  });
}

Downloads::Try Downloads::fill(std::uint64_t number, const FileLocation &location,
                               const DocumentMarker &wanted,
                               const std::function<ContentsResult(PartFile &, PartUse)> &publish,
                               const std::shared_ptr<CKCancellation> &cancellation, NSError *error) {
  const std::string path = files_.absolute(location.path);
  {
    const Lock lock(mutex_);
    ++digests_[wanted.digest];
    const auto transfer = transfers_.find(number);
    if (transfer != transfers_.end()) transfer->second.total = wanted.size;
  }
  struct Leave {
    std::function<void()> leave;
    ~Leave() { leave(); }
  } leave{[&] {
    const Lock lock(mutex_);
    if (--digests_[wanted.digest] == 0) digests_.erase(wanted.digest);
  }};
  PartResult opened = storage_.openPart(wanted.digest, wanted.size);
  if (opened.result.outcome == ContentsOutcome::busy) return Try::waitForOther;
  if (!opened.part) {
    *error = posixError(opened.result, path);
    return Try::ended;
  }
  *error = receive(number, {wanted.size, wanted.digest}, *opened.part, cancellation);
  if (*error) {
    *error = ErrorForClients(*error, path);
    return Try::ended;
  }
  const ContentsResult whole = opened.part->finish();
  if (whole.outcome == ContentsOutcome::wrongContents) {
    *error = qvc_error(QVErrorChecksumMismatch,
                       path + ": what the cloud sent isn't what it promised; nothing was changed");
    return Try::ended;
  }
  if (!whole.isDone()) {
    *error = posixError(whole, path);
    return Try::ended;
  }
  bool isShared = false;
  {
    const Lock lock(mutex_);
    isShared = digests_[wanted.digest] > 1;
  }
  const ContentsResult result = publish(*opened.part, isShared ? PartUse::keep : PartUse::consume);
  switch (result.outcome) {
    case ContentsOutcome::done:
      published(location.item.id, wanted.digest, result);
      return Try::ended;
    case ContentsOutcome::gone:
    case ContentsOutcome::folderGone:
      states_.lookAt({location.path});
      *error = posixError(result, path);
      return Try::wait;
    case ContentsOutcome::changedMeanwhile:
    case ContentsOutcome::inUse:
      *error = qvc_error(QVErrorDocumentInUse, path + ": another program is writing to it");
      return Try::wait;
    default:
      *error = posixError(result, path);
      return Try::ended;
  }
}

NSError Downloads::receive(std::uint64_t number, const CKAssetReference &asset, PartFile &part,
                           const std::shared_ptr<CKCancellation> &cancellation) {
  const auto note = [&](std::uint64_t arrived) {
    const Lock lock(mutex_);
    const auto transfer = transfers_.find(number);
    if (transfer != transfers_.end()) transfer->second.done = part.length();
    rate_.add(arrived);
  };
  note(0);
  if (part.isFinished() || part.length() == asset.size) return NSError();
  // A transfer that moves may take as long as it needs; one that doesn't is given up, and continues later.
  for (;;) {
    CKCallContext call;
    call.cancellation = cancellation;
    call.qualityOfService = CKQualityOfService::userInitiated;
    call.deadline = CKCallContext::Clock::now() + options_.stallTimeout;
    const std::uint64_t before = part.length();
    const auto sink = [&](std::span<const std::uint8_t> bytes) {
      const ContentsResult result = part.append({reinterpret_cast<const char *>(bytes.data()), bytes.size()});
      if (result.outcome == ContentsOutcome::noSpace)
        return NSError::errorWithPOSIXCode(ENOSPC, "the disk is full");
      if (result.outcome == ContentsOutcome::wrongContents)
        return qvc_error(QVErrorChecksumMismatch, "more came than the cloud promised");
      if (!result.isDone()) return NSError::errorWithPOSIXCode(result.error);
      note(bytes.size());
      return NSError();
    };
    const NSError error = cloud_->readAsset(asset, before, sink, nullptr, call);
    if (!error) return error;
    const bool moved = part.length() > before;
    if (!CKErrorIsTimeout(error) || !moved) return error;
  }
}

void Downloads::published(ItemNumber item, const std::string &digest, const ContentsResult &result) {
  // Known at once, so that it can be let go of again at once.
  store_.transaction([&] {
    auto row = store_.byItem(item);
    if (!row || (row->content.digest != digest && row->newer.digest != digest)) return;
    row->local = LocalFileOf(result.facts);
    row->isDataless = false;
    store_.put(*row);
  });
  states_.show({item, false, true, LocalFileOf(result.facts), true});
}

NSError Downloads::nothingThere(ItemNumber item, std::uint64_t number) const {
  const Lock lock(mutex_);
  const auto transfer = transfers_.find(number);
  const bool isKnown = transfer != transfers_.end() && !transfer->second.path.empty();
  return qvc_errorNoSuchItem(isKnown ? files_.absolute(transfer->second.path)
                                     : QVFileObjectID::documentID(item).asString());
}

}  // namespace droxa::keld
