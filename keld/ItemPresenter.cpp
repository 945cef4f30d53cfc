#include "keld/ItemPresenter.h"

#include <vector>

#include "keld/TypeIdentifiers.h"

namespace droxa::keld {

namespace {

std::string typeIdentifier(const ItemRecord &record) {
  switch (record.facts.kind) {
    case NSFileProviderItemKind::folder:
      return "inode/directory";
    case NSFileProviderItemKind::alias:
    case NSFileProviderItemKind::symbolicLink:
      return "inode/symlink";
    case NSFileProviderItemKind::document:
      break;
  }
  return TypeIdentifierForName(record.name);
}

}  // namespace

std::string ItemPresenter::parentIdentifier(const ItemRecord &record) const {
  if (record.zone() == Zone::structure || record.parent == containers_->root())
    return NSFileProviderRootContainerItemIdentifier;
  return QVFileObjectID::folderOrAliasID(record.parent).asString();
}

const std::string &ItemPresenter::shownName(const ItemRecord &record) const {
  if (record.zone() != Zone::structure) return record.name;
  const ContainerEntry *entry = containers_->byDocuments(record.id);
  return entry ? entry->shownName : record.name;
}

bool ItemPresenter::isInShared(ItemNumber folder) const {
  std::vector<ItemNumber> asked;
  bool isShared = false;
  while (folder != kReplicaFolder && folder != kLimboFolder && !isShared) {
    const auto known = shared_.find(folder);
    if (known != shared_.end()) {
      isShared = known->second;
      break;
    }
    asked.push_back(folder);
    const auto record = queries_.byID(folder);
    if (!record) break;
    isShared = (record->flags & kSharedFlag) != 0;
    folder = record->parent;
  }
  for (const ItemNumber each : asked) shared_[each] = isShared;
  return isShared;
}

std::shared_ptr<const QVQueryItem> ItemPresenter::item(const ItemRecord &record) const {
  const QVFileObjectID fileObjectID = FileObjectID(record.id, record.facts.kind);
  NSFileProviderItemFields fields;
  fields.itemIdentifier = fileObjectID.asString();
  fields.parentItemIdentifier = parentIdentifier(record);
  fields.filename = shownName(record);
  fields.typeIdentifier = typeIdentifier(record);
  fields.kind = record.facts.kind;
  fields.documentSize = record.isFolder() ? 0 : record.facts.size;
  if (record.facts.birth != 0) fields.creationDate = NSDate::dateWithNanosecondsSince1970(record.facts.birth);
  fields.contentModificationDate = NSDate::dateWithNanosecondsSince1970(record.facts.modified);
  fields.permissions = record.facts.mode & 07777;
  fields.changeRank = record.rank;
  fields.isTrashed = record.zone() == Zone::trashed;
  fields.isExcludedFromSync = (record.flags & kExcludedFlag) != 0;
  fields.isDownloaded = (record.flags & kDatalessFlag) == 0;
  fields.isUploaded = (record.flags & kUploadedFlag) != 0;
  fields.isShared = (record.flags & kSharedFlag) != 0 || isInShared(record.parent);
  if (record.metadata.lastUsed != 0)
    fields.lastUsedDate = NSDate::dateWithNanosecondsSince1970(record.metadata.lastUsed);
  if (!record.metadata.tags.empty()) fields.tagData = QVTagDataOfNames(record.metadata.tags);
  fields.favoriteRank = record.metadata.favoriteRank;
  return std::make_shared<const QVQueryItem>(fileObjectID, std::move(fields));
}

std::shared_ptr<const QVQueryItem> ItemPresenter::deadItem(ItemNumber id, NSFileProviderItemKind kind) {
  const QVFileObjectID fileObjectID = FileObjectID(id, kind);
  NSFileProviderItemFields fields;
  fields.itemIdentifier = fileObjectID.asString();
  fields.kind = kind;
  return std::make_shared<const QVQueryItem>(fileObjectID, std::move(fields), true);
}

}  // namespace droxa::keld
