#include "keld/sync/DocumentRecord.h"

#include <uuid/uuid.h>

#include "keld/Placement.h"
#include "tessaly/QVContainer.h"

namespace droxa::keld {

namespace {

constexpr char kContainerPrefix[] = "container:";
constexpr std::int64_t kMostSize = std::int64_t{1} << 60;
constexpr std::size_t kLongestTarget = 4095;

// Whether a file may have that name, in a folder of somebody's drive.
bool isFileName(const std::string &name) {
  return !name.empty() && name.size() <= 255 && name != "." && name != ".." &&
         name.find('/') == std::string::npos && name.find('\0') == std::string::npos;
}

std::int64_t integer(const CKRecord &record, const char *key, std::int64_t otherwise) {
  const std::int64_t *value = record.get<std::int64_t>(key);
  return value ? *value : otherwise;
}

std::string bytes(const CKRecord &record, const char *key) {
  const std::string *value = record.get<std::string>(key);
  return value ? *value : std::string();
}

CKRecordValue textOrNone(std::string text) {
  if (text.empty()) return std::monostate();
  return text;
}

CKRecordValue integerOrNone(std::int64_t value) {
  if (value == 0) return std::monostate();
  return value;
}

void setMetadata(const ItemMetadata &metadata, CKRecord *record) {
  record->fields[kRecordKeyTags] = textOrNone(QVEncodeTagNames(metadata.tags));
  record->fields[kRecordKeyLastUsed] = integerOrNone(metadata.lastUsed);
  record->fields[kRecordKeyFavoriteRank] = integerOrNone(static_cast<std::int64_t>(metadata.favoriteRank));
}

bool isInTrashItself(const DocumentRecord &document) {
  return document.parent == ContainerRecord(QVUbiquitousTrashContainerID);
}

void setPutBack(const DocumentRecord &document, CKRecord *record) {
  if (isInTrashItself(document) && !document.putBack) return;
  const PutBack putBack = isInTrashItself(document) ? *document.putBack : PutBack();
  record->fields[kRecordKeyPutBackParent] = textOrNone(putBack.parent);
  record->fields[kRecordKeyPutBackName] = textOrNone(putBack.name);
  record->fields[kRecordKeyTrashed] = integerOrNone(putBack.trashed);
}

}  // namespace

CKRecordZoneID DriveZone() {
  return CKRecordZoneID{"drive", CKCurrentUserDefaultName};
}

std::string ContainerRecord(const std::string &containerID) {
  return kContainerPrefix + containerID;
}

std::optional<std::string> ContainerOfRecord(const std::string &parent) {
  const std::string prefix = kContainerPrefix;
  if (parent.compare(0, prefix.size(), prefix) != 0) return std::nullopt;
  std::string container = parent.substr(prefix.size());
  if (!isFileName(container) || !IsContainerName(container)) return std::nullopt;
  return container;
}

CKRecordID RecordID(const std::string &record) {
  return CKRecordID{record, DriveZone()};
}

CKRecord MakeRecord(const DocumentRecord &document) {
  CKRecord record;
  record.recordType = kRecordType;
  record.recordID = RecordID(document.record);
  record.recordChangeTag = document.tag;
  record.fields[kRecordKeyParent] = document.parent;
  record.fields[kRecordKeyName] = document.name;
  record.fields[kRecordKeyKind] = static_cast<std::int64_t>(document.kind);
  record.fields[kRecordKeyMode] = static_cast<std::int64_t>(document.content.mode & 07777);
  if (document.target.empty())
    record.fields[kRecordKeyTarget] = std::monostate();
  else
    record.fields[kRecordKeyTarget] = document.target;
  if (document.metadata) setMetadata(*document.metadata, &record);
  setPutBack(document, &record);
  return record;
}

CKRecord MakeRecordWithContent(const DocumentRecord &document) {
  CKRecord record = MakeRecord(document);
  record.fields[kQVRecordKeySize] = static_cast<std::int64_t>(document.content.size);
  record.fields[kRecordKeyModified] = document.content.modified;
  record.fields[kRecordKeyContent] =
      CKAsset::assetWithReference({document.content.size, document.content.digest});
  record.fields[kQVRecordKeyThumbnail1024x1024] = std::monostate();
  return record;
}

CKRecord MakeRecordWithThumbnail(const CKRecordID &record, const std::string &tag,
                                 const CKAssetReference &thumbnail) {
  CKRecord made;
  made.recordType = kRecordType;
  made.recordID = record;
  made.recordChangeTag = tag;
  made.fields[kQVRecordKeyThumbnail1024x1024] = CKAsset::assetWithReference(thumbnail);
  return made;
}

std::optional<DocumentRecord> ReadRecord(const CKRecord &record) {
  if (record.recordType != kRecordType) return std::nullopt;
  DocumentRecord document;
  document.record = record.recordID.recordName;
  document.tag = record.recordChangeTag;
  document.parent = bytes(record, kRecordKeyParent);
  document.name = bytes(record, kRecordKeyName);
  document.target = bytes(record, kRecordKeyTarget);
  document.device = record.modifiedByDevice;
  const std::int64_t rank = integer(record, kRecordKeyFavoriteRank, 0);
  document.metadata =
      ItemMetadata{QVDecodeTagNames(bytes(record, kRecordKeyTags)), integer(record, kRecordKeyLastUsed, 0),
                   rank < 0 ? 0 : static_cast<std::uint64_t>(rank)};
  PutBack putBack{bytes(record, kRecordKeyPutBackParent), bytes(record, kRecordKeyPutBackName),
                  integer(record, kRecordKeyTrashed, 0)};
  if (isInTrashItself(document) && !putBack.parent.empty() && isFileName(putBack.name))
    document.putBack = std::move(putBack);
  const std::int64_t kind = integer(record, kRecordKeyKind, -1);
  const std::int64_t size = integer(record, kQVRecordKeySize, 0);
  if (kind < 0 || kind > 3 || size < 0 || size > kMostSize) return std::nullopt;
  document.kind = static_cast<NSFileProviderItemKind>(kind);
  document.content.modified = integer(record, kRecordKeyModified, 0);
  document.content.mode = static_cast<std::uint32_t>(integer(record, kRecordKeyMode, 0644)) & 07777U;
  if (document.kind == NSFileProviderItemKind::document) {
    const CKAsset *asset = record.get<CKAsset>(kRecordKeyContent);
    if (!asset || !asset->isReference() || !asset->reference().isWellFormed()) return std::nullopt;
    if (asset->reference().size != static_cast<std::uint64_t>(size)) return std::nullopt;
    document.content.size = asset->reference().size;
    document.content.digest = asset->reference().sha256;
  }
  const bool isLink =
      document.kind == NSFileProviderItemKind::symbolicLink || document.kind == NSFileProviderItemKind::alias;
  if (isLink && (document.target.empty() || document.target.size() > kLongestTarget ||
                 document.target.find('\0') != std::string::npos))
    return std::nullopt;
  if (!isFileName(document.name) || document.parent.empty() || document.parent == document.record)
    return std::nullopt;
  return document;
}

std::string NewRecordName() {
  uuid_t uuid;
  uuid_generate(uuid);
  char text[37];
  uuid_unparse_lower(uuid, text);
  return text;
}

}  // namespace droxa::keld
