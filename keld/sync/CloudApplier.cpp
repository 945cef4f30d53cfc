#include "keld/sync/CloudApplier.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>
#include <fcntl.h>
#include <span>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/cloudkit/CKDigest.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

constexpr std::size_t kRecordsAtATime = 200;
constexpr char kToken[] = "changeToken";
constexpr int kMostTries = 40;  // of a page that something stood in the way of
constexpr std::chrono::milliseconds kPause{25};

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
    : context_(context), conflicts_(conflicts) {}

NSError CloudApplier::fetchAndApply(const CKCallContext &call) {
  for (int tries = 0;;) {
    parentsMade_ = context_.store.parentsOfOrphans();
    CKServerChangeToken token;
    const std::string kept = context_.store.text(kToken);
    if (!kept.empty()) token.data = NSData::dataWithString(kept);
    if (!token && !fetchesAll_) {
      fetchesAll_ = true;
      seen_.clear();
    }
    const CKZoneChanges page =
        context_.cloud.fetchZoneChanges(DriveZone(), token, std::nullopt, kRecordsAtATime, call);
    if (CKErrorIs(page.error, CKErrorCode::changeTokenExpired)) {
      context_.store.setText(kToken, "");
      fetchesAll_ = false;
      continue;
    }
    if (CKErrorIs(page.error, CKErrorCode::zoneNotFound)) {
      const NSError problem = context_.cloud.saveZone(DriveZone(), call);
      if (problem) return problem;
      continue;
    }
    if (page.error) return page.error;
    mayWait_ = tries < kMostTries && !call.isCancelled();
    applyPage(page, call);
    if (isIncomplete_) {
      ++tries;
      if (call.cancellation) call.cancellation->waitUntil(std::chrono::steady_clock::now() + kPause);
      continue;
    }
    tries = 0;
    if (!page.moreComing) return NSError();
  }
}

// What couldn't be found where the item table says is found once the keeper has looked again: a folder above
// it was moved a moment ago. The page is applied again then, which leaves alone what was done.
bool CloudApplier::putOff(ItemNumber item) {
  if (!mayWait_) return false;
  isIncomplete_ = true;
  const std::string path = item == 0 ? std::string() : context_.files.pathOf(item);
  if (!path.empty()) touch(path);
  return true;
}

void CloudApplier::applyPage(const CKZoneChanges &page, const CKCallContext &call) {
  isIncomplete_ = false;
  std::vector<DocumentRecord> documents;
  for (const CKRecord &record : page.changedRecords) {
    auto document = ReadRecord(record);
    if (!document) {
      os_log_error(qvc_default_log(), "[ERROR] the cloud's record %s makes no sense and is left alone",
                   record.recordID.recordName);
      continue;
    }
    if (fetchesAll_) seen_.insert(document->record);
    documents.push_back(std::move(*document));
  }
  context_.store.transaction([&] {
    applyAll(documents, call);
    for (const CKDeletedRecord &deleted : page.deletedRecords) remove(deleted.recordID.recordName);
    if (isIncomplete_) {
      foldersToRemove_.clear();
      return;
    }
    if (fetchesAll_ && !page.moreComing) {
      // What the cloud doesn't have any more was deleted while nobody could tell.
      fetchesAll_ = false;
      for (const std::string &record : context_.store.recordsInCloud())
        if (seen_.count(record) == 0) remove(record);
      seen_.clear();
    }
    if (!page.moreComing) removeFolders();
    const auto token = page.token.data.bytes();
    context_.store.setText(kToken, {reinterpret_cast<const char *>(token.data()), token.size()});
    if (!touched_.empty()) {
      // The token says that all of this was done, so it has to be on the disk first.
      const OwnedDescriptor replica(
          ::open(context_.files.replicaPath().c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
      if (replica) ::syncfs(replica.get());
    }
  });
  finishBatch();
}

void CloudApplier::applyRecords(const std::vector<CKRecord> &records, const CKCallContext &call) {
  std::vector<DocumentRecord> documents;
  for (const CKRecord &record : records)
    if (auto document = ReadRecord(record)) documents.push_back(std::move(*document));
  mayWait_ = false;
  context_.store.transaction([&] { applyAll(documents, call); });
  finishBatch();
}

void CloudApplier::finishBatch() {
  context_.states.flush();
  if (!touched_.empty()) context_.states.lookAt(std::exchange(touched_, {}));
}

void CloudApplier::applyAll(const std::vector<DocumentRecord> &documents, const CKCallContext &call) {
  for (const DocumentRecord &document : documents) apply(document);
  adoptOrphans(call);
}

// What came before its parent is asked for again once the parent is there.
void CloudApplier::adoptOrphans(const CKCallContext &call) {
  while (!parentsMade_.empty()) {
    std::vector<CKRecordID> wanted;
    for (const std::string &parent : std::exchange(parentsMade_, {}))
      for (const std::string &record : context_.store.takeOrphansOf(parent))
        wanted.push_back(RecordID(record));
    for (std::size_t at = 0; at < wanted.size(); at += kRecordsAtATime) {
      const auto begin = wanted.begin() + static_cast<std::ptrdiff_t>(at);
      const auto end =
          wanted.begin() + static_cast<std::ptrdiff_t>(std::min(at + kRecordsAtATime, wanted.size()));
      const CKFetchReply reply = context_.cloud.fetchRecords({begin, end}, std::nullopt, call);
      const bool failed = reply.error && !CKErrorIs(reply.error, CKErrorCode::partialFailure);
      if (failed) {
        // Everything is fetched anew, rather than one document never.
        context_.store.setText(kToken, "");
        return;
      }
      for (const CKRecordResult &result : reply.results) {
        if (result.error) continue;
        if (const auto document = ReadRecord(result.record)) apply(*document);
      }
    }
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
  ::mkdir((folder + "/" + kDocumentsName).c_str(), 0755);
  touch(*path);
  place->folder = context_.files.openFolder(*path, &code);
  return static_cast<bool>(place->folder);
}

void CloudApplier::apply(const DocumentRecord &document) {
  context_.store.dropOrphan(document.record);
  auto row = context_.store.byRecord(document.record);
  if (row && row->tag == document.tag) return;
  // A version that waits already; unless something was written here meanwhile, which it can't replace.
  if (row && row->newerTag == document.tag && !context_.store.queued(row->item)) return;
  Place place;
  if (!openPlace(document.parent, &place)) {
    context_.store.keepOrphan(document.record, document.parent);
    if (context_.store.byRecord(document.parent)) putOff(0);
    return;
  }
  ++applied_;
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
  if (document.kind == NSFileProviderItemKind::folder) parentsMade_.push_back(document.record);
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

// --- Deletions.

void CloudApplier::remove(const std::string &record) {
  context_.store.dropOrphan(record);
  const auto row = context_.store.byRecord(record);
  if (!row) return;
  ++applied_;
  const auto location = row->item != 0 ? context_.files.locate(row->item, nullptr) : std::nullopt;
  if (!location && row->item != 0 && context_.files.item(row->item) && putOff(row->item)) return;
  if (!location) {
    if (row->item != 0) context_.store.dropQueued(row->item);
    // Made a moment ago, and not seen by the keeper yet.
    const auto path = row->item == 0 ? context_.files.path(*row) : std::nullopt;
    int code = 0;
    if (path) {
      FileLocation there;
      there.path = *path;
      there.name = row->name;
      there.folder = context_.files.openFolder(path->substr(0, path->size() - row->name.size() - 1), &code);
      const auto marker = there ? ReadMarker(there.folder.get(), there.name) : std::nullopt;
      if (marker && marker->recordName == record) {
        if (row->kind == NSFileProviderItemKind::folder) {
          foldersToRemove_.push_back(record);
          return;
        }
        return removeDocument(*row, there);
      }
    }
    context_.store.erase(record);
    return;
  }
  if (row->kind == NSFileProviderItemKind::folder)
    foldersToRemove_.push_back(record);
  else
    removeDocument(*row, *location);
}

void CloudApplier::removeDocument(const SyncRow &row, const FileLocation &location) {
  bool isUnchanged = true;
  if (row.kind == NSFileProviderItemKind::document) {
    const DocumentLook look = context_.storage.classify(location.folder.get(), location.name);
    const bool isIntact = look.kind == DocumentClass::present || look.kind == DocumentClass::dataless ||
                          look.kind == DocumentClass::evicting;
    isUnchanged = (isIntact && look.marker && look.marker->recordName == row.record) ||
                  (look.kind == DocumentClass::plain && IsSameContents(LocalFileOf(look.facts), row.local));
  }
  context_.store.erase(row.record);
  if (!isUnchanged) {
    // Deleted elsewhere, and written here since: it lives, as a document of its own.
    if (row.item != 0) context_.store.enqueue(row.item, false, false);
    os_log(qvc_default_log(), "[WARNING] %s was deleted elsewhere, but changed here: it is kept",
           location.path);
    return;
  }
  ::unlinkat(location.folder.get(), location.name.c_str(), 0);
  touch(location.path);
}

// The deepest first. One that still holds something was given contents here meanwhile: it lives.
void CloudApplier::removeFolders() {
  struct Doomed {
    std::string record;
    std::string path;
  };
  std::vector<Doomed> doomed;
  for (const std::string &record : std::exchange(foldersToRemove_, {})) {
    const auto row = context_.store.byRecord(record);
    const auto path = row ? context_.files.path(*row) : std::nullopt;
    if (path)
      doomed.push_back({record, *path});
    else
      context_.store.erase(record);
  }
  std::sort(doomed.begin(), doomed.end(),
            [](const Doomed &a, const Doomed &b) { return a.path.size() > b.path.size(); });
  for (const Doomed &folder : doomed) {
    const auto row = context_.store.byRecord(folder.record);
    const int result = ::rmdir(context_.files.absolute(folder.path).c_str());
    const bool isGone = result == 0 || errno == ENOENT;
    context_.store.erase(folder.record);
    touch(folder.path);
    if (isGone) continue;
    // It gets another record, which what is in it has to be told to be in.
    if (row && row->item != 0) context_.store.enqueue(row->item, false, false);
    for (const SyncRow &child : context_.store.childrenOf(folder.record, UINT32_MAX))
      if (child.item != 0) context_.store.enqueue(child.item, false, false);
  }
}

void CloudApplier::bringBack(const SyncRow &row) {
  DocumentRecord document;
  document.record = row.record;
  document.tag = row.tag;
  document.parent = row.parent;
  document.name = row.name;
  document.kind = row.kind;
  document.content = row.content;
  Place place;
  if (!openPlace(row.parent, &place)) return;
  SyncRow fresh = row;
  fresh.item = 0;
  fresh.local = {};
  create(document, place, fresh);
  finishBatch();
}

}  // namespace droxa::keld
