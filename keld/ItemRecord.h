#pragma once

#include <cstdint>
#include <string>

#include "platform/fileprovider/NSFileProviderItem.h"
#include "tessaly/QVFileObjectID.h"
#include "tessaly/QVItemMetadata.h"

namespace droxa::keld {

using ItemNumber = std::uint64_t;  // the number of a QVFileObjectID; 0 for none

// Parents that are no items.
inline constexpr ItemNumber kReplicaFolder = 0;  // its children are the containers
// Holds what was found missing until it is known whether it turned up elsewhere.
inline constexpr ItemNumber kLimboFolder = static_cast<ItemNumber>(-1);

// Where an item stands in the drive.
enum class Zone : std::uint8_t {
  shown = 0,
  trashed = 1,
  privateStorage = 2,  // in a container, outside its documents
  structure = 3,       // a container's folder, or its documents folder
};

inline constexpr std::uint32_t kZoneMask = 3;
inline constexpr std::uint32_t kExcludedFlag = 4;    // kept local, by its name or its parent's
inline constexpr std::uint32_t kUnreadableFlag = 8;  // a folder that the file system refused to show
inline constexpr std::uint32_t kDatalessFlag = 16;   // a document whose contents are in the cloud alone
inline constexpr std::uint32_t kUploadedFlag = 32;   // the cloud has it as it is
inline constexpr std::uint32_t kSharedFlag = 64;     // the root of a share; what is below it has no flag
inline constexpr std::uint32_t kOthersFlag = 128;    // in a container that shows what another shares
inline constexpr std::uint32_t kSyncFlags = kDatalessFlag | kUploadedFlag;
inline constexpr std::uint32_t kOwnFlags =
    kUnreadableFlag | kSharedFlag | kSyncFlags;  // not inherited from where it is

// What the file system says of a file.
struct FileFacts {
  NSFileProviderItemKind kind = NSFileProviderItemKind::document;
  std::uint32_t mode = 0;
  std::uint64_t inode = 0;
  std::uint64_t device = 0;  // 0: the replica's own, whose number may change from boot to boot
  std::uint64_t links = 1;   // not kept in the database
  bool isPromise = false;    // a promise stands for the document; not kept in the database
  std::uint64_t size = 0;
  std::int64_t birth = 0;  // nanoseconds since 1970; 0 where the file system doesn't tell
  std::int64_t modified = 0;
  std::int64_t changed = 0;

  // The same file, under whatever name.
  bool isSameFile(const FileFacts &other) const {
    return inode == other.inode && device == other.device && birth == other.birth && kind == other.kind;
  }
  // What clients are shown is the same.
  bool looksLike(const FileFacts &other) const {
    return kind == other.kind && (mode & 07777) == (other.mode & 07777) && birth == other.birth &&
           modified == other.modified && (kind == NSFileProviderItemKind::folder || size == other.size);
  }
};

using ItemMetadata = QVItemMetadata;

// A row of the item table.
struct ItemRecord {
  ItemNumber id = 0;
  ItemNumber parent = 0;
  std::string name;
  std::uint32_t flags = 0;
  std::uint64_t rank = 0;
  FileFacts facts;
  ItemMetadata metadata;

  Zone zone() const { return static_cast<Zone>(flags & kZoneMask); }
  bool isFolder() const { return facts.kind == NSFileProviderItemKind::folder; }
};

// A link on the disk; whether it is an alias depends on what is at its target.
inline bool IsLink(NSFileProviderItemKind kind) {
  return kind == NSFileProviderItemKind::symbolicLink || kind == NSFileProviderItemKind::alias;
}
inline bool IsSameKind(NSFileProviderItemKind a, NSFileProviderItemKind b) {
  return a == b || (IsLink(a) && IsLink(b));
}

inline QVFileObjectID FileObjectID(ItemNumber id, NSFileProviderItemKind kind) {
  const bool isDocument =
      kind == NSFileProviderItemKind::document || kind == NSFileProviderItemKind::symbolicLink;
  return isDocument ? QVFileObjectID::documentID(id) : QVFileObjectID::folderOrAliasID(id);
}

// One thing that happened to an item, as watchers are told of it.
struct ItemChange {
  ItemNumber id = 0;
  NSFileProviderItemKind kind = NSFileProviderItemKind::document;
  ItemNumber oldParent = 0;  // 0 for a new item
  ItemNumber newParent = 0;  // 0 for a dead one
  bool died = false;
};

}  // namespace droxa::keld
