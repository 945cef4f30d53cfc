#include "keld/sync/CloudApplier.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>
#include <fcntl.h>
#include <span>
#include <sys/stat.h>
#include <unistd.h>

#include "keld/sync/SharedAccess.h"
#include "platform/cloudkit/CKDigest.h"
#include "platform/cloudkit/CKShare.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

constexpr std::size_t kRecordsAtATime = 200;
constexpr char kToken[] = "changeToken";
constexpr char kFetchesAll[] = "fetchesAll";     // 1 until the last page of everything was applied
constexpr char kHasFetchedAll[] = "fetchedAll";  // 1 since the first time

}  // namespace

std::string DigestOfFile(int descriptor) {
  CKDigest digest;
  std::vector<std::uint8_t> buffer(1 << 18);
  off_t offset = 0;
  for (;;) {
    const ssize_t count = ::pread(descriptor, buffer.data(), buffer.size(), offset);
    if (count < 0) return "";
    if (count == 0) break;
    digest.update(std::span(buffer.data(), static_cast<std::size_t>(count)));
    offset += count;
  }
  return digest.hex();
}

CloudApplier::CloudApplier(const SyncContext &context, ConflictCopies &conflicts)
    : context_(context), conflicts_(conflicts), shares_(context.store, context.states) {}

NSError CloudApplier::fetchAndApply(const CKCallContext &call) {
  undoUnfinished();
  NSError problem = fetchPages(call);
  const bool isShared = context_.scope.isShared();
  if (!problem && isShared) context_.store.hangOrphans();
  if (!problem) problem = fetchAgain(call);
  if (!problem && !hasFetchedAll()) context_.store.setNumber(kHasFetchedAll, 1);
  return problem;
}

bool CloudApplier::hasFetchedAll() {
  return context_.store.number(kHasFetchedAll) != 0;
}

void CloudApplier::beginFetchOfAll() {
  fetchesAll_ = true;
  seen_.clear();
  seenShares_.clear();
  context_.store.setText(kToken, "");
  context_.store.setNumber(kFetchesAll, 1);
  context_.store.forgetAccesses();
}

NSError CloudApplier::fetchPages(const CKCallContext &call) {
  isZoneGone_ = false;
  for (;;) {
    CKServerChangeToken token;
    std::string kept = context_.store.text(kToken);
    // What was seen of everything is known to this process alone.
    const bool wasCutShort = !fetchesAll_ && context_.store.number(kFetchesAll) != 0;
    if ((kept.empty() && !fetchesAll_) || wasCutShort) {
      beginFetchOfAll();
      kept.clear();
    }
    if (!kept.empty()) token.data = NSData::dataWithString(kept);
    const CKZoneChanges page =
        context_.cloud.fetchZoneChanges(context_.scope.zone, token, std::nullopt, kRecordsAtATime, call);
    if (CKErrorIs(page.error, CKErrorCode::changeTokenExpired)) {
      if (isSameCloud_ && !isSameCloud_()) return page.error;
      beginFetchOfAll();
      continue;
    }
    if (CKErrorIs(page.error, CKErrorCode::zoneNotFound)) {
      if (isSameCloud_ && !isSameCloud_()) return page.error;
      const NSError problem = withoutZone(call);
      if (problem || isZoneGone_) return problem;
      continue;
    }
    if (page.error) return page.error;
    const NSError problem = applyPage(page, call);
    if (problem) return problem;
    if (!page.moreComing) return NSError();
  }
}

NSError CloudApplier::withoutZone(const CKCallContext &call) {
  if (!context_.scope.isShared()) return context_.cloud.saveZone(context_.scope.zone, call);
  emptyZone();
  isZoneGone_ = true;
  return NSError();
}

std::vector<DocumentRecord> CloudApplier::documentsOf(const std::vector<CKRecord> &records) {
  std::vector<DocumentRecord> documents;
  for (const CKRecord &record : records) {
    if (record.recordType == CKRecordTypeShare) continue;  // is no item: noteShares()
    // One that makes no sense isn't one that was deleted.
    if (fetchesAll_) seen_.insert(record.recordID.recordName);
    auto document = ReadRecord(record);
    if (!document || !place(&*document)) {
      os_log_error(qvc_default_log(), "[ERROR] the cloud's record %s makes no sense and is left alone",
                   record.recordID.recordName);
      continue;
    }
    documents.push_back(std::move(*document));
  }
  return documents;
}

NSError CloudApplier::applyPage(const CKZoneChanges &page, const CKCallContext &call) {
  if (context_.scope.isShared() && account_.empty()) {
    const CKUserIdentityReply asked = context_.cloud.currentUserIdentity(call);
    if (asked.error) return asked.error;
    account_ = asked.identity.accountName;
  }
  const std::vector<DocumentRecord> documents = documentsOf(page.changedRecords);
  const bool endsAll = fetchesAll_ && !page.moreComing;
  // Another cloud that came into this one's place has none of the records.
  if (endsAll && isSameCloud_ && !isSameCloud_())
    return CKErrorMake(CKErrorCode::changeTokenExpired, "the cloud was replaced while it was read");
  beginUnfinished(documents);
  context_.store.transaction([&] {
    noteAccesses(page);
    applyAll(documents);
    noteShares(page);
    for (const CKDeletedRecord &deleted : page.deletedRecords)
      if (deleted.recordType != CKRecordTypeShare) remove(deleted.recordID.recordName);
    if (endsAll) {
      removeUnseen();
      shares_.forgetUnseen(context_.scope.zone, seenShares_);
      context_.store.setNumber(kFetchesAll, 0);
    }
    if (!page.moreComing) removeFolders();
    const auto token = page.token.data.bytes();
    context_.store.setText(kToken, {reinterpret_cast<const char *>(token.data()), token.size()});
    // The token says that all of this was done, so it has to be on the disk first.
    if (!touched_.empty()) syncReplica();
  });
  if (endsAll) {
    fetchesAll_ = false;
    seen_.clear();
    seenShares_.clear();
  }
  finishBatch();
  return NSError();
}

void CloudApplier::noteShares(const CKZoneChanges &page) {
  for (const CKRecord &record : page.changedRecords) {
    if (record.recordType != CKRecordTypeShare) continue;
    if (fetchesAll_) seenShares_.insert(record.recordID.recordName);
    if (const auto share = CKShare::shareWithRecord(record))
      shares_.note(*share);
    else
      os_log_error(qvc_default_log(), "[ERROR] the cloud's share %s makes no sense and is left alone",
                   record.recordID.recordName);
  }
  for (const CKDeletedRecord &deleted : page.deletedRecords)
    if (deleted.recordType == CKRecordTypeShare) shares_.forget(deleted.recordID);
}

// What the cloud doesn't have any more was deleted while nobody could tell. A cloud that has nothing at all
// any more was emptied, or put back to its beginning: nobody deletes a whole drive so, and what is here may
// be the last copy.
void CloudApplier::removeUnseen() {
  const std::vector<std::string> known = context_.store.recordsInCloud();
  if (seen_.empty() && !known.empty() && !context_.scope.isShared()) {
    os_log_error(qvc_default_log(),
                 "[ERROR] the cloud has lost all of the drive: what is here is sent to it again");
    for (const std::string &record : known) sendAgain(record);
    return;
  }
  for (const std::string &record : known)
    if (seen_.count(record) == 0) remove(record);
}

void CloudApplier::sendAgain(const std::string &record) {
  auto row = context_.store.byRecord(record);
  if (!row) return;
  if (row->item == 0 || !context_.files.item(row->item)) return context_.store.erase(record);
  row->tag.clear();
  row->newerTag.clear();
  row->newer = {};
  row->content.digest.clear();
  context_.store.put(*row);
  context_.store.enqueue(row->item, false, false);
}

void CloudApplier::applyRecords(const std::vector<CKRecord> &records, const CKCallContext &call) {
  std::vector<DocumentRecord> documents;
  for (const CKRecord &record : records)
    if (auto document = ReadRecord(record); document && place(&*document))
      documents.push_back(std::move(*document));
  beginUnfinished(documents);
  context_.store.transaction([&] { applyAll(documents); });
  finishBatch();
  (void)fetchAgain(call);  // what it can't have now comes with the next fetch
}

// Once each: what still can't be made waits for the next fetch.
NSError CloudApplier::fetchAgain(const CKCallContext &call) {
  std::set<std::string> asked;
  for (;;) {
    std::vector<CKRecordID> wanted;
    for (const std::string &record : context_.store.toFetch(asked.size() + kRecordsAtATime))
      if (asked.insert(record).second) wanted.push_back(context_.scope.recordID(record));
    if (wanted.empty()) return NSError();
    const CKFetchReply reply = context_.cloud.fetchRecords(wanted, std::nullopt, call);
    if (reply.error && !CKErrorIs(reply.error, CKErrorCode::partialFailure)) return reply.error;
    applyFetched(reply.results);
    finishBatch();
  }
}

void CloudApplier::applyFetched(const std::vector<CKRecordResult> &results) {
  std::vector<DocumentRecord> documents;
  std::vector<std::string> answered, gone;
  for (const CKRecordResult &result : results) {
    const bool isGone = CKErrorIs(result.error, CKErrorCode::unknownItem);
    if (result.error && !isGone) continue;
    answered.push_back(result.recordID.recordName);
    if (isGone) gone.push_back(result.recordID.recordName);
    auto document = isGone ? std::nullopt : ReadRecord(result.record);
    if (document && place(&*document)) documents.push_back(std::move(*document));
  }
  beginUnfinished(documents);
  context_.store.transaction([&] {
    for (const std::string &record : answered) context_.store.fetched(record);
    for (const std::string &record : gone) remove(record);
    applyAll(documents);
    removeFolders();
  });
}

void CloudApplier::syncReplica() const {
  const OwnedDescriptor replica(
      ::open(context_.files.replicaPath().c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (replica) ::syncfs(replica.get());
}

void CloudApplier::finishBatch() {
  noteTrashAgain();
  context_.states.flush();
  if (!touched_.empty()) context_.states.lookAt(std::exchange(touched_, {}));
}

void CloudApplier::applyAll(const std::vector<DocumentRecord> &documents) {
  for (const DocumentRecord &document : documents) {
    if (context_.scope.isShared())
      apply(AsItMayBeUsed(document, context_));
    else
      apply(document);
    context_.store.finished(document.record);
  }
}

bool CloudApplier::openPlace(const std::string &parentRecord, Place *place) {
  const auto path = context_.files.folderPath(parentRecord);
  if (!path) return false;
  int code = 0;
  place->folderPath = *path;
  place->folder = context_.files.openFolder(*path, &code);
  if (place->folder) return true;
  const auto container = ContainerOfRecord(parentRecord);
  if (!container) return false;
  // A container that another device has made.
  const std::string folder = context_.files.absolute(*container);
  ::mkdir(folder.c_str(), 0700);
  ::mkdir((folder + "/" + QVDocumentsFolderName(*container)).c_str(), 0755);
  touch(*path);
  place->folder = context_.files.openFolder(*path, &code);
  return static_cast<bool>(place->folder);
}

// A link bears no marker: the one that was made here a moment ago is found by its name.
void CloudApplier::findLink(SyncRow *row) {
  const auto path = context_.files.path(*row);
  ItemRecord there;
  if (!path || !context_.files.itemAtPath(*path, &there) || context_.store.byItem(there.id)) return;
  const bool isLink = IsLink(there.facts.kind);
  if (!isLink) return;
  row->item = there.id;
  row->local.inode = there.facts.inode;
}

void CloudApplier::waitForPlace(const DocumentRecord &document) {
  const auto parent = context_.store.byRecord(document.parent);
  const bool wasDeleted = parent && parent->item != 0 && !context_.files.item(parent->item);
  // A folder that is there can't be opened only for a while: it was moved a moment ago, as a rule.
  if (ContainerOfRecord(document.parent) || (parent && !wasDeleted))
    return context_.store.fetchAgain(document.record);
  context_.store.keepOrphan(document.record, document.parent);
  if (!wasDeleted) return;
  // Deleted here, and given something new elsewhere, a folder lives.
  context_.store.dropQueued(parent->item);
  bringBack(*parent);
}

void CloudApplier::apply(const DocumentRecord &document) {
  context_.store.dropOrphan(document.record);
  auto row = context_.store.byRecord(document.record);
  if (row && row->tag == document.tag && isAsApplied(document, *row)) return;
  // Its contents are on their way; unless something was written here meanwhile.
  if (row && row->hasNewer() && row->newerTag == document.tag && isAsApplied(document, *row) &&
      context_.files.item(row->item) && !context_.store.queued(row->item))
    return;
  if (row && (isOwnSaveOfDead(document, *row) || isKnownOfDead(document, *row)))
    return followOwnSave(document, std::move(*row));
  Place place;
  if (!openPlace(document.parent, &place)) {
    waitForPlace(document);
    return;
  }
  ++applied_;
  if (row && row->item == 0 && !row->tag.empty() && !document.target.empty()) findLink(&*row);
  const auto item = row && row->item != 0 ? context_.files.item(row->item) : std::nullopt;
  if (item) {
    change(document, place, *row, *item);
  } else {
    SyncRow made = row ? *row : SyncRow();
    if (made.item != 0) context_.store.dropQueued(made.item);  // deleted here: it comes back
    made.record = document.record;
    made.item = 0;
    made.local = {};
    made.newerTag.clear();
    create(document, place, std::move(made));
  }
  if (document.kind != NSFileProviderItemKind::folder) return;
  context_.store.fetchOrphansOf(document.record);
  if (context_.scope.isShared()) context_.store.fetchTopsOf(document.record);
}

// Whether this device has saved that itself and lost the reply, and what it saved was deleted here since.
// Devices may have the same name: contents that this one has never had aren't its own.
bool CloudApplier::isOwnSaveOfDead(const DocumentRecord &document, const SyncRow &row) {
  if (row.item == 0 || document.device != context_.cloud.deviceName() || context_.files.item(row.item))
    return false;
  return document.content.digest == row.content.digest ||
         context_.store.wasSent(document.record, document.content.digest);
}

// Whether the record says no more of an item that is gone here than was known when it was deleted: it was
// given a thumbnail.
bool CloudApplier::isKnownOfDead(const DocumentRecord &document, const SyncRow &row) {
  return row.item != 0 && !row.tag.empty() && !row.hasNewer() &&
         document.kind == NSFileProviderItemKind::document && document.parent == row.parent &&
         document.name == row.name && document.content == row.content && document.metadata == row.metadata &&
         !context_.files.item(row.item);
}

// Nobody has changed it elsewhere, so that the deletion is newer and is to be sent. It isn't brought back.
void CloudApplier::followOwnSave(const DocumentRecord &document, SyncRow row) {
  const auto queued = context_.store.queued(row.item);
  // The keeper is about to tell whether it was deleted or is only on its way elsewhere.
  if (!queued || !queued->isDeletion) return context_.store.fetchAgain(document.record);
  row.tag = document.tag;
  row.parent = document.parent;
  row.name = document.name;
  row.content = document.content;
  row.newerTag.clear();
  row.newer = {};
  context_.store.put(row);
}

DocumentMarker CloudApplier::markerOf(const DocumentRecord &document) const {
  if (document.kind == NSFileProviderItemKind::folder) return DocumentMarker::ofFolder(document.record);
  DocumentMarker marker;
  marker.state = MarkerState::dataless;
  marker.recordName = document.record;
  marker.digest = document.content.digest;
  marker.size = document.content.size;
  marker.modified = document.content.modified;
  return marker;
}

// --- What is missing here.

void CloudApplier::bringBack(const SyncRow &row) {
  SyncRow fresh = row;
  fresh.item = 0;
  fresh.local = {};
  fresh.tag.clear();
  fresh.newerTag.clear();
  fresh.newer = {};
  context_.store.put(fresh);
  context_.store.fetchAgain(row.record);
}

void CloudApplier::bringBackWhatIsMissing() {
  context_.store.transaction([&] {
    for (const std::string &record : context_.store.unboundInCloud())
      if (const auto row = context_.store.byRecord(record)) bringBack(*row);
  });
}

void CloudApplier::replicaWasSeen() {
  isReplicaSeen_ = true;
  undoUnfinished();
  bringBackWhatIsMissing();
}

}  // namespace droxa::keld
