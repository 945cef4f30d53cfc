#pragma once

#include <optional>
#include <string>

#include "keld/sync/SyncStore.h"
#include "platform/cloudkit/CKRecord.h"

namespace droxa::keld {

// The zone that holds a drive's items.
CKRecordZoneID DriveZone();

// What a record of the cloud says of an item.
struct DocumentRecord {
  std::string record;
  std::string tag;
  std::string parent;  // a record's name, or ContainerRecord()
  std::string name;
  NSFileProviderItemKind kind = NSFileProviderItemKind::document;
  ContentVersion content;
  std::string target;  // of a symbolic link or an alias
  std::string device;  // that saved it last
};

// What stands for a container's documents folder as a parent; it has no record of its own.
std::string ContainerRecord(const std::string &containerID);
std::optional<std::string> ContainerOfRecord(const std::string &parent);

// Keys of an item's record.
inline constexpr char kRecordType[] = "item";
inline constexpr char kRecordKeyParent[] = "parent";
inline constexpr char kRecordKeyName[] = "name";
inline constexpr char kRecordKeyKind[] = "kind";
inline constexpr char kRecordKeySize[] = "size";
inline constexpr char kRecordKeyModified[] = "modified";
inline constexpr char kRecordKeyMode[] = "mode";
inline constexpr char kRecordKeyTarget[] = "target";
inline constexpr char kRecordKeyContent[] = "content";

CKRecordID RecordID(const std::string &record);
// The record without its contents: a save leaves those that the cloud has.
CKRecord MakeRecord(const DocumentRecord &document);
// The same with the contents, which the cloud must have already.
CKRecord MakeRecordWithContent(const DocumentRecord &document);
// nullopt for a record that no device of this kind wrote: hostile names, sizes and kinds among them.
std::optional<DocumentRecord> ReadRecord(const CKRecord &record);

std::string NewRecordName();

}  // namespace droxa::keld
