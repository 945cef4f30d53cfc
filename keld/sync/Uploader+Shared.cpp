// What is particular to sending into another account's zone: what may not be sent is kept here, or undone.

#include <cerrno>
#include <cstdio>
#include <sys/stat.h>

#include "keld/ItemAttributes.h"
#include "keld/sync/SharedAccess.h"
#include "keld/sync/Uploader.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

bool isDocument(const ItemRecord &item) {
  return item.facts.kind == NSFileProviderItemKind::document;
}

}  // namespace

// What isn't changed here is left alone in the cloud: a shared root's place is the owner's to say, and where
// this account may only read, the mode here isn't the owner's.
CKRecord Uploader::recordOf(const Plan &plan) const {
  CKRecord record = plan.hasContent ? MakeRecordWithContent(plan.document) : MakeRecord(plan.document);
  if (!context_.scope.isShared()) return record;
  record.recordID = context_.scope.recordID(plan.document.record);
  if (plan.document.parent == context_.scope.top()) record.fields.erase(kRecordKeyParent);
  for (const char *key : {kRecordKeyPutBackParent, kRecordKeyPutBackName, kRecordKeyTrashed})
    record.fields.erase(key);
  const bool isNew = plan.row.tag.empty();
  if (!isNew && ((plan.row.content.mode ^ plan.document.content.mode) & 0777U) == 0)
    record.fields.erase(kRecordKeyMode);
  return record;
}

NSError Uploader::readOnlyError(const FileLocation &location) const {
  return qvc_error(QVErrorReadOnlyShare, context_.files.absolute(location.path) +
                                             ": you may only read this; what you changed is kept here only");
}

std::optional<Uploader::Prepared> Uploader::prepareShared(const FileLocation &location,
                                                          const std::string &parent, Plan *plan) {
  if (auto prepared = keepMetadataHere(location, plan)) return prepared;
  const SyncRow &row = plan->row;
  const bool isNew = row.tag.empty();
  const bool isAtTop = parent == context_.scope.top();
  if (isAtTop && isNew) {
    return refuse(*plan, qvc_error(QVErrorNotInSharedFolder,
                                   context_.files.absolute(location.path) +
                                       ": nobody shares this place; it is kept here only until you put it "
                                       "into a shared folder, or into your own drive"));
  }
  const bool isRoot = row.parent == context_.scope.top();
  if (!isNew && isAtTop != isRoot) return undoChange(location, *plan, "can't be moved there");
  const auto above = isAtTop ? std::nullopt : context_.store.byRecord(parent);
  if (above && above->tag.empty()) {
    // The cloud takes nothing into a folder that it doesn't have.
    const auto queued = context_.store.queued(above->item);
    if (queued && queued->isRefused) return refuse(*plan, queued->error);
    return laterWith(plan, NSError());
  }
  const SharedAccess access(context_.store, context_.scope);
  if (isNew && !access.isWritable(parent)) return refuse(*plan, readOnlyError(location));
  if (!isNew && !access.isWritable(row.record)) return undoChange(location, *plan, "may only be read");
  return std::nullopt;
}

// Tags, favourites and dates of use are each person's own: they stay on this device.
std::optional<Uploader::Prepared> Uploader::keepMetadataHere(const FileLocation &location, Plan *plan) {
  if (plan->row.tag.empty() || IsLink(location.item.facts.kind)) return std::nullopt;
  ItemMetadata metadata = location.item.metadata;
  ReadMetadataOfFile(location.folder.get(), location.name, &metadata);
  if (metadata == plan->row.metadata) return std::nullopt;
  plan->row.metadata = metadata;
  context_.store.put(plan->row);
  if (!examiner_.isClean(location.item, plan->row, context_.files.parentRecord(location.item)))
    return std::nullopt;
  plan->isDataless = plan->row.isDataless;
  plan->file = LocalFileOf(location.item.facts);
  return nothingToSend(*plan);
}

// --- What may not be sent.

Uploader::Prepared Uploader::refuse(const Plan &plan, const NSError &error) {
  os_log_error(qvc_default_log(), "[ERROR] isn't uploaded: %@", error);
  context_.store.uploadRefused(plan.entry, error);
  const Lock lock(mutex_);
  ++totals_.failed;
  return Prepared::nothing;
}

bool Uploader::isChangedInside(const FileLocation &location, const SyncRow &row) const {
  if (!isDocument(location.item)) return false;
  const DocumentLook look = context_.storage.classify(location.folder.get(), location.name);
  const bool isIntact = look.kind == DocumentClass::present || look.kind == DocumentClass::dataless ||
                        look.kind == DocumentClass::evicting;
  return !isIntact && !IsSameContents(LocalFileOf(look.facts), row.local);
}

// Name, place and mode become the cloud's again; contents that were changed are kept, here alone.
Uploader::Prepared Uploader::undoChange(const FileLocation &location, const Plan &plan,
                                        const std::string &why) {
  const SyncRow &row = plan.row;
  const bool isKept = isChangedInside(location, row);
  const bool isElsewhere =
      row.name != location.name || row.parent != context_.files.parentRecord(location.item);
  if (isElsewhere && !putBack(location, row)) return refuse(plan, readOnlyError(location));
  if (isElsewhere) os_log(qvc_default_log(), "[NOTICE] %s %s: it is %s again", location.path, why, row.name);
  if (isKept) return refuse(plan, readOnlyError(location));
  const bool isOtherMode = ((row.content.mode ^ location.item.facts.mode) & 0777U) != 0;
  if (isOtherMode && !isElsewhere && !IsLink(location.item.facts.kind)) {
    ::fchmodat(location.folder.get(), location.name.c_str(), row.content.mode & 0777U, 0);
    context_.states.lookAt({location.path});
  }
  context_.store.uploaded(plan.entry);
  return Prepared::nothing;
}

bool Uploader::putBack(const FileLocation &location, const SyncRow &row) {
  const auto folderPath = context_.files.folderPath(row.parent);
  int code = 0;
  const OwnedDescriptor folder =
      folderPath ? context_.files.openFolder(*folderPath, &code) : OwnedDescriptor();
  if (!folder || ::renameat2(location.folder.get(), location.name.c_str(), folder.get(), row.name.c_str(),
                             RENAME_NOREPLACE) != 0)
    return false;
  context_.states.lookAt({location.path, *folderPath + "/" + row.name});
  return true;
}

bool Uploader::saveRefused(const Plan &plan, const NSError &error, Round *round) {
  const bool isGone =
      CKErrorIs(error, CKErrorCode::unknownItem) || CKErrorIs(error, CKErrorCode::zoneNotFound);
  if (isGone) {
    // The feed tells whether it was deleted, or isn't shared any more.
    Plan again = plan;
    laterWith(&again, NSError());
    round->needsFetch = true;
    return true;
  }
  if (!CKErrorIs(error, CKErrorCode::permissionFailure)) return false;
  const auto location = context_.files.locate(plan.entry.item, nullptr);
  if (!location) {
    Plan again = plan;
    laterWith(&again, NSError());
  } else if (plan.row.tag.empty()) {
    refuse(plan, readOnlyError(*location));
  } else {
    undoChange(*location, plan, "may only be read");
  }
  return true;
}

// --- Deletions.

std::optional<Uploader::Prepared> Uploader::prepareSharedDeletion(Plan *plan) {
  const SyncRow &row = plan->row;
  const SharedAccess access(context_.store, context_.scope);
  if (row.tag.empty()) return std::nullopt;
  if (row.parent == context_.scope.top()) {
    const auto share = context_.store.accessByRoot(row.record);
    if (!share) return undoDeletion(*plan);
    if (hasDatalessElsewhere(row)) return laterWith(plan, NSError());
    plan->leaves = share->share;
    return std::nullopt;
  }
  // What goes with its shared root isn't deleted, but left: the feed takes it away when that is done.
  const auto top = access.topOf(row);
  const std::int64_t now = std::chrono::duration_cast<std::chrono::milliseconds>(
                               std::chrono::system_clock::now().time_since_epoch())
                               .count();
  const bool goesWithTop = !top || (top->item != 0 && (!context_.files.item(top->item) ||
                                                       context_.store.isDeletionAllowed(top->item, now)));
  if (goesWithTop) return laterWith(plan, NSError());
  if (!access.isWritable(row.record)) return undoDeletion(*plan);
  return std::nullopt;
}

// Whether something of it was moved out of the zone without its contents, which are fetched then: nobody
// would have them.
bool Uploader::hasDatalessElsewhere(const SyncRow &row) {
  bool found = false;
  std::vector<SyncRow> rows{row};
  for (std::size_t at = 0; at < rows.size(); ++at) {
    for (SyncRow &child : context_.store.childrenOf(rows[at].record, UINT32_MAX))
      rows.push_back(std::move(child));
    const auto location = rows[at].item != 0 ? context_.files.locate(rows[at].item, nullptr) : std::nullopt;
    if (!location || !isDocument(location->item)) continue;
    const DocumentLook look = context_.storage.classify(location->folder.get(), location->name);
    if (look.kind != DocumentClass::dataless) continue;
    if (needsContents_) needsContents_(location->item);
    found = true;
  }
  return found;
}

bool Uploader::hasChildrenThatLeave(const SyncRow &row) {
  if (row.kind != NSFileProviderItemKind::folder) return false;
  for (const SyncRow &child : context_.store.childrenOf(row.record, UINT32_MAX))
    if (child.item != 0 && !context_.files.item(child.item) && context_.store.queued(child.item)) return true;
  return false;
}

Uploader::Prepared Uploader::undoDeletion(const Plan &plan) {
  os_log(qvc_default_log(), "[NOTICE] %s may only be read: its deletion is undone", plan.row.name);
  context_.store.transaction([&] {
    context_.store.forgetAllowedDeletion(plan.entry.item);
    context_.store.dropQueued(plan.entry.item);
    if (bringBack_) bringBack_(plan.row);
  });
  needsFetch_ = true;
  return Prepared::nothing;
}

}  // namespace droxa::keld
