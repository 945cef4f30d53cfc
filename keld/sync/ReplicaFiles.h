#pragma once

#include <functional>
#include <optional>
#include <string>

#include "keld/FolderReading.h"
#include "keld/ItemQueries.h"
#include "keld/sync/SyncScope.h"
#include "keld/sync/SyncStore.h"

namespace droxa::keld {

// Where an item's file is: its folder, open, and its name in it.
struct FileLocation {
  OwnedDescriptor folder;
  std::string name;
  std::string path;  // below the replica
  ItemRecord item;   // as the item table has it

  explicit operator bool() const { return static_cast<bool>(folder); }
};

// Finds files and folders of the replica for those who aren't the keeper: by item, and by record where the
// keeper hasn't seen the file yet. Where records stand for items, an item of another scope is as good as
// gone. No link is ever followed. Thread contract: any thread.
class ReplicaFiles {
 public:
  using Read = std::function<NSError(const std::function<void(ItemQueries &queries)> &work)>;
  ReplicaFiles(std::string replicaPath, Read read, SyncStore &store, SyncScope scope = {});

  // nullopt when it is gone, or has left the scope.
  std::optional<ItemRecord> item(ItemNumber item) const;
  bool isInScope(const ItemRecord &item) const;
  // What the item table has at a path below the replica; false when there is nothing.
  bool itemAtPath(const std::string &path, ItemRecord *item) const;
  // Of whatever scope. nullopt when the item is gone, or its folder can't be opened (`error` says why; may be
  // null).
  std::optional<FileLocation> locate(ItemNumber item, NSError *error) const;
  // The path below the replica of the folder that stands for a parent record; nullopt when nothing does yet.
  std::optional<std::string> folderPath(const std::string &parentRecord) const;
  // The path below the replica where a record's file is, or would be.
  std::optional<std::string> path(const SyncRow &row) const;
  // The record that stands for the folder of the item; "" when that folder has none yet.
  std::string parentRecord(const ItemRecord &item) const;
  std::string pathOf(ItemNumber item) const;  // "" when it is gone

  // Opens a folder by its path below the replica; `error` is set to an errno.
  OwnedDescriptor openFolder(const std::string &path, int *error) const;
  const std::string &replicaPath() const { return replicaPath_; }
  std::string absolute(const std::string &path) const { return replicaPath_ + "/" + path; }

 private:
  bool isInScope(const ItemRecord &item, ItemQueries &queries) const;
  std::string pathInScope(ItemNumber item) const;

  const std::string replicaPath_;
  const Read read_;
  SyncStore &store_;
  const SyncScope scope_;
};

// The facts that decide whether a file is still the one that was synced.
LocalFile LocalFileOf(const FileFacts &facts);
bool IsSameContents(const LocalFile &a, const LocalFile &b);  // but for the date of the last status change

}  // namespace droxa::keld
