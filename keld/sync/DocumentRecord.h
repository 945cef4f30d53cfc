#pragma once

#include <optional>
#include <string>

#include "keld/sync/SyncStore.h"
#include "platform/cloudkit/CKRecord.h"
#include "tessaly/QVRecordKeys.h"

namespace droxa::keld {

// The zone that holds a drive's items.
CKRecordZoneID DriveZone();

// Where an item of the trash was, and since when it isn't there any more.
struct PutBack {
  std::string parent;  // as DocumentRecord's
  std::string name;
  std::int64_t trashed = 0;  // nanoseconds since 1970
  bool operator==(const PutBack &) const = default;
};

// What a record of the cloud says of an item.
struct DocumentRecord {
  std::string record;
  std::string tag;
  std::string parent;  // a record's name, or ContainerRecord()
  std::string name;
  NSFileProviderItemKind kind = NSFileProviderItemKind::document;
  ContentVersion content;
  // Saved without these, a record keeps what the cloud has.
  std::optional<ItemMetadata> metadata;
  std::optional<PutBack> putBack;  // of what lies in the trash itself; elsewhere there is none
  std::string target;              // of a symbolic link or an alias
  std::string device;              // that saved it last
};

// What stands for a container's documents folder as a parent; it has no record of its own.
std::string ContainerRecord(const std::string &containerID);
std::optional<std::string> ContainerOfRecord(const std::string &parent);

// Keys of an item's record, beside those that others name (QVRecordKeys.h).
inline constexpr char kRecordType[] = "item";
inline constexpr char kRecordKeyParent[] = "parent";
inline constexpr char kRecordKeyName[] = "name";
inline constexpr char kRecordKeyKind[] = "kind";
inline constexpr char kRecordKeyModified[] = "modified";
inline constexpr char kRecordKeyMode[] = "mode";
inline constexpr char kRecordKeyTarget[] = "target";
inline constexpr char kRecordKeyContent[] = "content";
// What users note; a record without them has none.
inline constexpr char kRecordKeyTags[] = "tags";  // as QVEncodeTagNames writes them
inline constexpr char kRecordKeyLastUsed[] = "lastUsed";
inline constexpr char kRecordKeyFavoriteRank[] = "favoriteRank";
// Of what lies in the trash: the folder that it was in (as a parent), its name there, and when that was.
inline constexpr char kRecordKeyPutBackParent[] = "putBackParent";
inline constexpr char kRecordKeyPutBackName[] = "putBackName";
inline constexpr char kRecordKeyTrashed[] = "trashed";

CKRecordID RecordID(const std::string &record);
// The record without its contents: a save leaves those that the cloud has.
CKRecord MakeRecord(const DocumentRecord &document);
// The same with the contents, which the cloud must have already. A thumbnail of others goes with that save.
CKRecord MakeRecordWithContent(const DocumentRecord &document);
// Adds a thumbnail to a document in that state, and changes nothing else.
CKRecord MakeRecordWithThumbnail(const CKRecordID &record, const std::string &tag,
                                 const CKAssetReference &thumbnail);
// nullopt for a record that no device of this kind wrote: hostile names, sizes and kinds among them.
std::optional<DocumentRecord> ReadRecord(const CKRecord &record);

std::string NewRecordName();

}  // namespace droxa::keld
