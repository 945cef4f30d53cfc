#include "keld/sync/Uploader.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <fcntl.h>
#include <unistd.h>

#include "keld/ItemAttributes.h"
#include "keld/sync/CloudErrors.h"
#include "keld/sync/PutBackNotes.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

constexpr std::uint64_t kRecordsAtATime = 100;
constexpr std::uint64_t kInlineSize = 4 << 20;    // larger contents are sent beside this thread
constexpr std::uint64_t kInlineBytes = 16 << 20;  // of one round
constexpr std::chrono::seconds kTransferTimeout{60};
constexpr std::int64_t kSoon = 300;  // milliseconds
constexpr std::int64_t kLongestPause = 300'000;
// No record has it. Without a tag the record would go in whatever state it is, and a save whose reply was
// lost may have been followed by another device's.
constexpr char kUnknownTag[] = "unknown";

std::int64_t nowMilliseconds() {
  return std::chrono::duration_cast<std::chrono::milliseconds>(
             std::chrono::system_clock::now().time_since_epoch())
      .count();
}

bool isSyncedItem(const ItemRecord &item) {
  const bool isPlaced = item.zone() == Zone::shown || item.zone() == Zone::trashed;
  return isPlaced && (item.flags & kExcludedFlag) == 0;
}

// A lease that an eviction holds, or a writer, for a moment.
bool isBusy(int code) {
  return code == EWOULDBLOCK || code == ETXTBSY;
}

// What the user notes on the item, where the cloud doesn't know it. The table may be a moment behind the
// file.
std::optional<ItemMetadata> changedMetadata(const FileLocation &location, const SyncRow &row) {
  if (IsLink(location.item.facts.kind)) return std::nullopt;
  ItemMetadata metadata = location.item.metadata;
  ReadMetadataOfFile(location.folder.get(), location.name, &metadata);
  if (metadata == row.metadata) return std::nullopt;
  return metadata;
}

OwnedDescriptor openFile(const FileLocation &location) {
  return OwnedDescriptor(::openat(location.folder.get(), location.name.c_str(),
                                  O_RDONLY | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK | O_NOCTTY));
}

}  // namespace

Uploader::Uploader(const SyncContext &context, AssetUploads &assets, ConflictCopies &conflicts,
                   LocalExaminer &examiner)
    : context_(context), assets_(assets), conflicts_(conflicts), examiner_(examiner) {}

Uploader::Totals Uploader::totals() const {
  const Lock lock(mutex_);
  return totals_;
}

Uploader::Round Uploader::sendDue(const CKCallContext &call) {
  Round round;
  inlineBytes_ = 0;
  cloudProblem_ = NSError();
  needsFetch_ = false;
  const auto due = context_.store.due(nowMilliseconds(), kRecordsAtATime);
  std::vector<Plan> saves, removals;
  for (const QueuedUpload &entry : due) {
    Plan plan;
    plan.entry = entry;
    const Prepared prepared = prepare(entry, &plan, call);
    if (prepared == Prepared::save)
      saves.push_back(std::move(plan));
    else if (prepared == Prepared::remove)
      removals.push_back(std::move(plan));
    if (cloudProblem_ || inlineBytes_ >= kInlineBytes || call.isCancelled()) break;
  }
  round.cloudProblem = cloudProblem_;
  round.needsFetch = needsFetch_;
  context_.states.flush();
  if (call.isCancelled() || (saves.empty() && removals.empty())) {
    round.moreIsDue = !cloudProblem_ && due.size() == kRecordsAtATime;
    return round;
  }
  CKModifyRequest request;
  request.isAtomic = false;
  for (const Plan &plan : saves) request.recordsToSave.push_back(recordOf(plan));
  for (const Plan &plan : removals) {
    const std::string tag = plan.row.tag.empty() ? kUnknownTag : plan.row.tag;
    const bool leaves = !plan.leaves.empty();
    request.recordsToDelete.push_back(
        {context_.scope.recordID(leaves ? plan.leaves : plan.row.record), leaves ? "" : tag});
  }
  noteSent(saves);
  CKCallContext own = call;
  own.deadline = CKCallContext::Clock::now() + kTransferTimeout;
  const CKModifyReply reply = context_.cloud.modifyRecords(request, own);
  if (reply.error && !CKErrorIs(reply.error, CKErrorCode::partialFailure)) {
    round.cloudProblem = reply.error;
    return round;
  }
  context_.store.transaction([&] {
    for (std::size_t index = 0; index < saves.size(); ++index) {
      const CKRecordResult &result = reply.saved[index];
      if (!result.error)
        saved(saves[index], result.record);
      else
        saveFailed(saves[index], result.error, &round);
      round.sent += result.error ? 0 : 1;
    }
    for (std::size_t index = 0; index < removals.size(); ++index) {
      const CKDeleteResult &result = reply.deleted[index];
      if (!result.error)
        removed(removals[index]);
      else
        removeFailed(removals[index], result.error, &round);
      round.sent += result.error ? 0 : 1;
    }
  });
  context_.states.flush();
  round.moreIsDue = !round.cloudProblem && !context_.store.due(nowMilliseconds(), 1).empty();
  return round;
}

// The outcome of a call that is cut off isn't known: what this device itself has sent isn't a conflict. Nor
// is it known later on which contents the thumbnail is to be of.
void Uploader::noteSent(const std::vector<Plan> &saves) {
  context_.store.transaction([&] {
    for (const Plan &plan : saves) {
      if (!plan.hasContent) continue;
      const DocumentRecord &document = plan.document;
      context_.store.noteSent(document.record, document.content.digest);
      const bool isHere = !plan.isDataless && document.content.size > 0;
      if (isHere && wantsThumbnail_ && wantsThumbnail_(document.name))
        context_.store.wantThumbnail({document.record, document.content.digest, {}, {}});
    }
  });
}

// --- Working out what is to be sent.

Uploader::Prepared Uploader::prepare(const QueuedUpload &entry, Plan *plan, const CKCallContext &call) {
  if (auto row = context_.store.byItem(entry.item)) plan->row = std::move(*row);
  const auto item = context_.files.item(entry.item);
  if (!item || !isSyncedItem(*item)) return prepareDeletion(item, plan);
  return prepareSave(*item, plan, call);
}

Uploader::Prepared Uploader::prepareDeletion(const std::optional<ItemRecord> &item, Plan *plan) {
  // What was never seen to die is missing for another reason: the keeper hasn't told yet.
  if (!plan->entry.isDeletion && !plan->row.record.empty()) {
    if (item) examiner_.examineItem(item->id);  // it isn't missing: it left what is synced
    return laterWith(plan, NSError());
  }
  if (plan->row.record.empty()) {
    context_.store.uploaded(plan->entry);
    return Prepared::nothing;
  }
  if (context_.scope.isShared())
    if (const auto prepared = prepareSharedDeletion(plan)) return *prepared;
  // It may have left for another zone.
  const auto location = context_.files.locate(plan->entry.item, nullptr);
  if (location && location->item.facts.kind == NSFileProviderItemKind::document &&
      context_.storage.classify(location->folder.get(), location->name).kind == DocumentClass::dataless) {
    // It only leaves what is synced, and without the cloud's nobody would have its contents.
    if (needsContents_) needsContents_(location->item);
    return laterWith(plan, NSError());
  }
  // A folder leaves for another zone after what is in it, which may wait for its contents.
  if (location && !item && plan->leaves.empty() && hasChildrenThatLeave(plan->row))
    return laterWith(plan, NSError());
  assets_.forget(plan->entry.item);
  plan->isDeletion = true;
  return Prepared::remove;
}

Uploader::Prepared Uploader::laterWith(Plan *plan, const NSError &error) {
  std::int64_t pause = kSoon;
  if (error && plan->entry.attempts == 0)
    os_log_error(qvc_default_log(), "[ERROR] can't upload %s: %@", context_.files.pathOf(plan->entry.item),
                 error);
  for (std::int64_t attempt = 0; error && attempt < plan->entry.attempts && pause < kLongestPause; ++attempt)
    pause *= 2;
  context_.store.uploadFailed(plan->entry, error, nowMilliseconds() + std::min(pause, kLongestPause));
  return Prepared::later;
}

Uploader::Prepared Uploader::prepareSave(const ItemRecord &item, Plan *plan, const CKCallContext &call) {
  NSError problem;
  const auto location = context_.files.locate(item.id, &problem);
  if (!location) {
    // A folder that isn't where it was has been moved; where to, the keeper is about to find out.
    const bool wasMoved = problem.is(NSPOSIXErrorDomain, ENOENT) || problem.is(NSPOSIXErrorDomain, ENOTDIR);
    return laterWith(plan, wasMoved ? NSError() : problem);
  }
  const std::string parent = context_.files.parentRecord(location->item);
  if (parent.empty()) {
    // The folder has to be known first.
    if (!context_.store.queued(item.parent)) context_.store.enqueue(item.parent, false, false);
    return laterWith(plan, NSError());
  }
  SyncRow &row = plan->row;
  if (!row.record.empty() && examiner_.isClean(location->item, row, parent)) {
    context_.store.uploaded(plan->entry);
    const bool hasFile = row.kind == NSFileProviderItemKind::document;
    context_.states.show({item.id, row.isDataless, true, LocalFileOf(location->item.facts), hasFile});
    return Prepared::nothing;
  }
  // Its folder may have been unknown when it was examined.
  if (row.record.empty() && examiner_.bind(location->item, parent)) {
    context_.store.uploaded(plan->entry);
    return Prepared::nothing;
  }
  if (auto bound = context_.store.byItem(item.id)) row = std::move(*bound);
  if (row.record.empty()) {
    // The applier is about to find out whether that may stay.
    auto marker = context_.storage.classify(location->folder.get(), location->name).marker;
    if (!marker) marker = ReadMarker(location->folder.get(), location->name);  // a folder's
    if (marker && context_.store.unfinished(marker->recordName)) return laterWith(plan, NSError());
    // Written down before it is sent, so that a lost reply doesn't make a second record.
    row.record = NewRecordName();
    row.item = item.id;
    row.parent = parent;
    row.name = item.name;
    row.kind = item.facts.kind;
    context_.store.put(row);
  }
  if (context_.scope.isShared())
    if (const auto prepared = prepareShared(*location, parent, plan)) return *prepared;
  DocumentRecord &document = plan->document;
  document.record = row.record;
  // Names and places of a newer version were followed when it came; only its contents are still on their way.
  document.tag = row.hasNewer() ? row.newerTag : row.tag;
  document.parent = parent;
  document.name = location->item.name;
  document.kind = location->item.facts.kind;
  document.content = row.content;
  document.content.mode = location->item.facts.mode & 07777;
  if (!context_.scope.isShared()) document.metadata = changedMetadata(*location, row);
  const bool isTrash = parent == ContainerRecord(QVUbiquitousTrashContainerID);
  if (isTrash && (row.tag.empty() || row.parent != parent))
    document.putBack = PutBackNotes(context_.files, context_.store).read(document.name, row);
  plan->isDataless = row.isDataless;
  plan->file = LocalFileOf(location->item.facts);
  if (document.kind == NSFileProviderItemKind::folder) {
    plan->changesMarker = row.tag.empty();
    return changesAnything(*plan) ? Prepared::save : nothingToSend(*plan);
  }
  if (document.kind != NSFileProviderItemKind::document) return prepareLink(*location, plan);
  return prepareDocument(*location, plan, call);
}

bool Uploader::changesAnything(const Plan &plan) {
  const SyncRow &row = plan.row;
  return row.tag.empty() || plan.changesTarget || row.parent != plan.document.parent ||
         row.name != plan.document.name || !IsSameKind(row.kind, plan.document.kind) ||
         (row.content.mode & 0777) != (plan.document.content.mode & 0777) ||
         plan.document.metadata.has_value();
}

Uploader::Prepared Uploader::nothingToSend(const Plan &plan) {
  context_.store.uploaded(plan.entry);
  const bool hasFile = plan.row.kind == NSFileProviderItemKind::document;
  context_.states.show({plan.entry.item, plan.isDataless, true, plan.file, hasFile});
  return Prepared::nothing;
}

Uploader::Prepared Uploader::prepareLink(const FileLocation &location, Plan *plan) {
  char target[4096];
  const ssize_t length = ::readlinkat(location.folder.get(), location.name.c_str(), target, sizeof target);
  if (length <= 0) return laterWith(plan, NSError::errorWithPOSIXCode(errno, location.path));
  plan->document.target.assign(target, static_cast<std::size_t>(length));
  plan->changesTarget = plan->file.inode != plan->row.local.inode;  // a link's target never changes
  return changesAnything(*plan) ? Prepared::save : nothingToSend(*plan);
}

Uploader::Prepared Uploader::prepareDocument(const FileLocation &location, Plan *plan,
                                             const CKCallContext &call) {
  const DocumentLook look = context_.storage.classify(location.folder.get(), location.name);
  SyncRow &row = plan->row;
  plan->marker = look.marker;
  const bool isFile = look.kind != DocumentClass::missing && look.kind != DocumentClass::notADocument;
  if (isFile && !look.isPromised && look.facts.inode != location.item.facts.inode) {
    // Another file is at its place; whose that is the keeper finds out.
    context_.states.lookAt({location.path});
    return laterWith(plan, NSError());
  }
  switch (look.kind) {
    case DocumentClass::missing:
    case DocumentClass::notADocument:
      context_.states.lookAt({location.path});
      return laterWith(plan, NSError());
    case DocumentClass::unreadable:
      if (isBusy(look.error)) return laterWith(plan, NSError());
      return laterWith(plan, NSError::errorWithPOSIXCode(look.error, context_.files.absolute(location.path)));
    case DocumentClass::evicting:
      context_.storage.finishEviction(location.folder.get(), location.name);
      return laterWith(plan, NSError());
    case DocumentClass::partlyWritten:
      return restorePartlyWritten(location, look, plan);
    case DocumentClass::dataless:
      // Its contents are in the cloud, under this record's name or, for a copy of a placeholder, another's.
      plan->file = LocalFileOf(look.facts);
      plan->isDataless = true;
      plan->changesMarker = look.marker->recordName != row.record;
      plan->hasContent = row.content.digest != look.marker->digest;
      plan->document.content.size = look.marker->size;
      plan->document.content.digest = look.marker->digest;
      plan->document.content.modified = look.marker->modified;
      if (!plan->hasContent && !plan->changesMarker && !changesAnything(*plan)) return nothingToSend(*plan);
      return Prepared::save;
    case DocumentClass::plain:
    case DocumentClass::present:
    case DocumentClass::edited:
    case DocumentClass::overwritten:
      break;
  }
  plan->file = LocalFileOf(look.facts);
  plan->isDataless = false;
  const bool isKnown = !row.content.digest.empty() && !row.tag.empty();
  if (isKnown && !row.isDataless && IsSameContents(plan->file, row.local))
    return changesAnything(*plan) ? Prepared::save : nothingToSend(*plan);
  // Written here and elsewhere: the other version is on its way here, and then both are kept.
  // Whoever waits for this one is told why that doesn't come.
  if (row.hasNewer()) {
    const NSError problem = problemOfNewer_ ? problemOfNewer_(plan->entry.item) : NSError();
    context_.store.uploadFailed(plan->entry, problem, nowMilliseconds() + kSoon);
    return Prepared::later;
  }
  plan->hasContent = true;
  plan->changesMarker = true;
  plan->document.tag = row.tag;  // of the version that was written over: a newer one is a conflict
  return sendContents(location, plan, call);
}

Uploader::Prepared Uploader::sendContents(const FileLocation &location, Plan *plan,
                                          const CKCallContext &call) {
  const OwnedDescriptor file = openFile(location);
  if (!file) {
    const int code = errno;
    if (isBusy(code)) return laterWith(plan, NSError());
    return laterWith(plan, NSError::errorWithPOSIXCode(code, context_.files.absolute(location.path)));
  }
  AssetUploads::Finished finished;
  if (plan->file.size <= kInlineSize) {
    CKCallContext own = call;
    own.deadline = CKCallContext::Clock::now() + kTransferTimeout;
    finished = SendContents(context_.cloud, file.get(), plan->file, nullptr, own);
    inlineBytes_ += plan->file.size;
  } else {
    auto taken = assets_.take(plan->entry.item, plan->file, file.get());
    if (!taken) return laterWith(plan, NSError());
    finished = std::move(*taken);
  }
  if (finished.error) {
    if (CKErrorIsTransient(finished.error)) {
      cloudProblem_ = finished.error;
      return laterWith(plan, NSError());
    }
    const bool changed = CKErrorIs(finished.error, CKErrorCode::assetFileModified);
    if (!changed) failed(*plan, finished.error);
    if (changed) laterWith(plan, NSError());
    return Prepared::later;
  }
  plan->document.content.size = plan->file.size;
  plan->document.content.modified = plan->file.modified;
  plan->document.content.digest = finished.digest;
  const Lock lock(mutex_);
  totals_.bytes += plan->file.size;
  return Prepared::save;
}

// Somebody wrote into a document whose other parts aren't here: what was written is kept beside it, and the
// document stays what it is in the cloud.
Uploader::Prepared Uploader::restorePartlyWritten(const FileLocation &location, const DocumentLook &look,
                                                  Plan *plan) {
  SyncRow row = plan->row;
  std::string copy;
  const NSError problem = conflicts_.setAside(location, &copy);
  if (problem) return laterWith(plan, problem);
  context_.store.uploaded(plan->entry);
  DocumentMarker marker = *look.marker;
  marker.state = MarkerState::dataless;
  PreparedResult prepared =
      context_.storage.preparePlaceholder(marker, row.content.mode | 0600, {marker.birth, marker.modified});
  if (prepared.result.isDone())
    context_.storage.publishNew(prepared.file, location.folder.get(), location.name);
  const std::string folder = location.path.substr(0, location.path.size() - location.name.size());
  context_.states.lookAt({location.path, folder + copy});
  return Prepared::nothing;
}

// --- What became of it.

void Uploader::saved(const Plan &plan, const CKRecord &record) {
  SyncRow row = plan.row;
  row.item = plan.entry.item;
  row.tag = record.recordChangeTag;
  row.parent = plan.document.parent;
  row.name = plan.document.name;
  row.kind = plan.document.kind;
  row.content = plan.document.content;
  if (plan.document.metadata) row.metadata = *plan.document.metadata;
  row.local = plan.file;
  row.isDataless = plan.isDataless;
  if (plan.hasContent) {
    row.newerTag.clear();
    row.newer = {};
    context_.store.forgetSent(row.record);
  } else if (row.hasNewer()) {
    // What is written over the contents here is still a conflict with the newer ones.
    row.tag = plan.row.tag;
    row.newerTag = record.recordChangeTag;
  }
  if (plan.changesMarker) markFile(plan, &row);
  context_.store.put(row);
  // What is in a new folder waited for it.
  if (context_.scope.isShared() && plan.row.tag.empty()) context_.store.retryRefused();
  context_.store.uploaded(plan.entry);
  const bool hasFile = row.kind == NSFileProviderItemKind::document;
  context_.states.show({row.item, row.isDataless, true, row.local, hasFile});
  const Lock lock(mutex_);
  ++totals_.documents;
}

// The mark lets the item be found again without any database.
void Uploader::markFile(const Plan &plan, SyncRow *row) {
  if (!context_.storage.capabilities().extendedAttributes) return;
  const auto location = context_.files.locate(plan.entry.item, nullptr);
  const OwnedDescriptor file = location ? openFile(*location) : OwnedDescriptor();
  if (!file) {
    // Its folder was moved a moment ago, or somebody has a lease on it. With an older mark, what the cloud
    // has would be taken for a change of this device's, so it is sent again.
    row->local = {};
    context_.store.enqueue(plan.entry.item, false, false);
    return;
  }
  if (row->kind == NSFileProviderItemKind::folder) {
    WriteMarker(file.get(), DocumentMarker::ofFolder(row->record));
    return;
  }
  const auto facts = ReadFolderFacts(file.get(), 0);
  if (!facts || !IsSameContents(LocalFileOf(*facts), plan.file)) return;
  if (ReadMarker(file.get()) != plan.marker) {
    // A tool that copies a document writes its contents first and its attributes then: those say what it is.
    context_.store.enqueue(plan.entry.item, false, false);
    return;
  }
  DocumentMarker marker;
  marker.state = row->isDataless ? MarkerState::dataless : MarkerState::present;
  marker.recordName = row->record;
  marker.digest = row->content.digest;
  marker.size = row->content.size;
  marker.modified = row->content.modified;
  if (WriteMarker(file.get(), marker) != 0) return;
  if (const auto marked = ReadFolderFacts(file.get(), 0)) row->local.changed = marked->changed;
}

void Uploader::removed(const Plan &plan) {
  context_.store.forgetAllowedDeletion(plan.entry.item);
  context_.store.erase(plan.row.record);
  context_.store.forgetSent(plan.row.record);
  context_.store.uploaded(plan.entry);
  const Lock lock(mutex_);
  ++totals_.documents;
}

void Uploader::saveFailed(const Plan &plan, const NSError &error, Round *round) {
  if (const auto server = CKErrorServerRecord(error)) {
    if (CKServerRecordIsOwnSave(recordOf(plan), *server, context_.cloud.deviceName()))
      return saved(plan, *server);
    round->newerRecords.push_back(*server);
    context_.store.uploadFailed(plan.entry, NSError(), nowMilliseconds() + kSoon);
    return;
  }
  if (context_.scope.isShared() && saveRefused(plan, error, round)) return;
  if (CKErrorIs(error, CKErrorCode::unknownItem)) {
    // Deleted in the cloud, and changed here: what was changed here lives.
    SyncRow row = plan.row;
    row.tag.clear();
    row.content = {};
    row.newerTag.clear();
    row.newer = {};
    context_.store.put(row);
    context_.store.enqueue(plan.entry.item, false, false);
    return;
  }
  if (CKErrorIs(error, CKErrorCode::assetFileNotFound)) {
    // The contents were collected before the record named them: they are sent again.
    SyncRow row = plan.row;
    row.content.digest.clear();
    context_.store.put(row);
  }
  failed(plan, error);
}

void Uploader::removeFailed(const Plan &plan, const NSError &error, Round *round) {
  if (CKErrorIs(error, CKErrorCode::unknownItem)) return removed(plan);
  if (const auto server = CKErrorServerRecord(error)) {
    round->newerRecords.push_back(*server);
    return;
  }
  if (context_.scope.isShared() && CKErrorIs(error, CKErrorCode::zoneNotFound)) return removed(plan);
  if (context_.scope.isShared() && CKErrorIs(error, CKErrorCode::permissionFailure)) {
    undoDeletion(plan);
    round->needsFetch = true;
    return;
  }
  failed(plan, error);
}

void Uploader::failed(const Plan &plan, const NSError &error) {
  const NSError told =
      ErrorForClients(error, context_.files.absolute(context_.files.pathOf(plan.entry.item)));
  Plan again = plan;
  laterWith(&again, told);
  const Lock lock(mutex_);
  ++totals_.failed;
}

}  // namespace droxa::keld
