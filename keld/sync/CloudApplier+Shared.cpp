// What is particular to another account's zone: where its records hang, what may be done with them, and what
// becomes of them when they aren't shared any more.

#include <cerrno>
#include <cstdio>
#include <dirent.h>
#include <fcntl.h>
#include <unistd.h>

#include "keld/sync/CloudApplier.h"
#include "keld/sync/ConflictName.h"
#include "keld/sync/SharedAccess.h"
#include "platform/cloudkit/CKShare.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

constexpr unsigned kMostNumbers = 10000;
constexpr int kDeepest = 1000;

std::vector<std::string> namesIn(int folder) {
  std::vector<std::string> names;
  const int copy = ::openat(folder, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  DIR *stream = copy < 0 ? nullptr : ::fdopendir(copy);
  if (!stream) {
    if (copy >= 0) ::close(copy);
    return names;
  }
  while (const dirent *entry = ::readdir(stream)) {
    const std::string name = entry->d_name;
    if (name != "." && name != "..") names.push_back(name);
  }
  ::closedir(stream);
  return names;
}

// Takes out what has nothing of this device in it, and the marks of the others' records. Whether anything is
// left.
bool keepOwnAlone(const ContentsStorage &storage, int folder, const std::string &name, int depth) {
  const DocumentLook look = storage.classify(folder, name);
  if (look.kind == DocumentClass::missing) return false;
  if (look.kind == DocumentClass::dataless || look.kind == DocumentClass::evicting) {
    const bool isRemoved = look.isPromised ? storage.removePromise(folder, name).isDone()
                                           : ::unlinkat(folder, name.c_str(), 0) == 0;
    return !isRemoved;
  }
  const OwnedDescriptor file(::openat(folder, name.c_str(), O_RDONLY | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK));
  const auto facts = file ? ReadFolderFacts(file.get(), 0) : std::nullopt;
  if (!facts) return true;  // a link, or nothing that can be looked into
  if (facts->kind != NSFileProviderItemKind::folder) {
    RemoveMarker(file.get());
    return true;
  }
  bool isAnyLeft = depth >= kDeepest;
  if (!isAnyLeft)
    for (const std::string &child : namesIn(file.get()))
      isAnyLeft |= keepOwnAlone(storage, file.get(), child, depth + 1);
  if (!isAnyLeft) return ::unlinkat(folder, name.c_str(), AT_REMOVEDIR) != 0;
  RemoveMarker(file.get());
  return true;
}

}  // namespace

bool CloudApplier::place(DocumentRecord *document) {
  const SyncScope &scope = context_.scope;
  const auto container = ContainerOfRecord(document->parent);
  if (!scope.isShared()) return !container || scope.hasContainer(*container);
  // What people note on their documents is each one's own; and only the owner's trash has these.
  document->metadata.reset();
  document->putBack.reset();
  if (!container && context_.store.byRecord(document->parent)) {
    context_.store.dropTop(document->record);
    return true;
  }
  // An owner's container is never to be seen. What the other parents are, the rest of the feed tells.
  if (!container && !context_.store.isTop(document->record)) return true;
  context_.store.setTop(document->record, document->parent);
  document->parent = scope.top();
  return true;
}

// Whether the row says all that this state of the record does. In another's zone the place and the mode
// follow from other records, too.
bool CloudApplier::isAsApplied(const DocumentRecord &document, const SyncRow &row) const {
  if (!context_.scope.isShared()) return true;
  const bool isOfMode = document.kind != NSFileProviderItemKind::document ||
                        ((document.content.mode ^ row.content.mode) & 0222U) == 0;
  return document.parent == row.parent && isOfMode;
}

// --- What may be done.

void CloudApplier::noteAccesses(const CKZoneChanges &page) {
  if (!context_.scope.isShared()) return;
  for (const CKRecord &record : page.changedRecords)
    if (record.recordType == CKRecordTypeShare) followAccess(record);
  for (const CKDeletedRecord &deleted : page.deletedRecords) {
    if (deleted.recordType != CKRecordTypeShare) continue;
    const auto known = context_.store.accessByShare(deleted.recordID.recordName);
    context_.store.dropAccess(deleted.recordID.recordName);
    // What is below may be in an outer share, with another permission.
    if (known) applyAccessBelow(known->root);
  }
}

void CloudApplier::followAccess(const CKRecord &record) {
  const auto share = CKShare::shareWithRecord(record);
  if (!share || !share->rootRecordID) return;
  const CKShareParticipant *own = share->participantWithAccountName(account_);
  ShareAccess access;
  access.share = record.recordID.recordName;
  access.root = share->rootRecordID->recordName;
  access.isWritable = own && own->permission == CKShareParticipantPermission::readWrite;
  if (context_.store.accessByShare(access.share) == access) return;
  context_.store.putAccess(access);
  applyAccessBelow(access.root);
}

// Documents that may, or may not, be written from now on are asked for again, for their modes; what was
// refused may be sent now.
void CloudApplier::applyAccessBelow(const std::string &root) {
  context_.store.retryRefused();
  const SharedAccess access(context_.store, context_.scope);
  std::vector<std::string> records{root};
  std::set<std::string> seen;
  while (!records.empty()) {
    const std::string record = std::move(records.back());
    records.pop_back();
    if (!seen.insert(record).second) continue;
    const auto row = context_.store.byRecord(record);
    if (!row) continue;
    for (const SyncRow &child : context_.store.childrenOf(record, UINT32_MAX))
      records.push_back(child.record);
    if (row->kind != NSFileProviderItemKind::document) continue;
    const bool looksWritable = (row->content.mode & 0222U) != 0;
    if (looksWritable != access.isWritable(record)) context_.store.fetchAgain(record);
  }
}

// --- What hangs at the top.

// The folder isn't to be seen any more; what is still shared of what is in it, is.
void CloudApplier::hangChildren(const std::string &folder, const std::set<std::string> &doomed) {
  for (SyncRow &child : context_.store.childrenOf(folder, UINT32_MAX)) {
    if (child.tag.empty() || doomed.count(child.record) != 0) continue;
    context_.store.setTop(child.record, folder);
    if (!hangAtTop(child)) bringBack(child);
  }
}

bool CloudApplier::hangAtTop(SyncRow row) {
  Place place;
  auto location = row.item != 0 ? context_.files.locate(row.item, nullptr) : std::nullopt;
  if (!location || !openPlace(context_.scope.top(), &place)) return false;
  DocumentRecord document;
  document.record = row.record;
  document.name = row.name;
  if (!move(document, place, &*location)) return false;
  row.parent = context_.scope.top();
  context_.store.put(row);
  return true;
}

// --- What isn't shared any more.

void CloudApplier::keepAside(const std::string &path) {
  const std::size_t slash = path.rfind('/');
  const std::string name = path.substr(slash + 1);
  int code = 0;
  const OwnedDescriptor folder = context_.files.openFolder(path.substr(0, slash), &code);
  touch(path);
  if (!folder || !keepOwnAlone(context_.storage, folder.get(), name, 0)) return;
  const std::string root = std::string(QVUbiquitousDefaultContainerID) + "/" +
                           QVDocumentsFolderName(QVUbiquitousDefaultContainerID);
  const OwnedDescriptor drive = context_.files.openFolder(root, &code);
  for (unsigned number = 1; drive && number < kMostNumbers; ++number) {
    const std::string kept = NoLongerSharedName(name, number);
    if (::renameat2(folder.get(), name.c_str(), drive.get(), kept.c_str(), RENAME_NOREPLACE) == 0) {
      touch(root + "/" + kept);
      os_log(qvc_default_log(), "[WARNING] %s isn't shared any more, but was changed here: it is kept as %s",
             path, root + "/" + kept);
      return;
    }
    if (errno != EEXIST) code = errno;
    if (errno != EEXIST) break;
  }
  os_log_error(qvc_default_log(), "[ERROR] can't move %s, which isn't shared any more, into the drive: %@",
               path, NSError::errorWithPOSIXCode(code));
}

// Nothing of the zone is shared any more, or the zone itself is gone.
void CloudApplier::emptyZone() {
  context_.store.transaction([&] {
    beginFetchOfAll();
    for (const std::string &record : context_.store.recordsInCloud()) remove(record);
    removeFolders();
    shares_.forgetUnseen(context_.scope.zone, {});
    if (!touched_.empty()) syncReplica();
  });
  fetchesAll_ = false;
  const auto documents = context_.files.folderPath(context_.scope.top());
  int code = 0;
  const OwnedDescriptor folder = context_.files.openFolder(*documents, &code);
  if (folder)
    for (const std::string &name : namesIn(folder.get())) keepAside(*documents + "/" + name);
  finishBatch();
}

}  // namespace droxa::keld
