#pragma once

#include <chrono>
#include <cstdint>
#include <deque>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "keld/ItemRecord.h"

namespace droxa::keld {

// Whether `name` is what editors call the backup of `original`: "notes.txt~", "notes.txt.bak", "#notes.txt#".
bool IsBackupName(std::string_view name, std::string_view original);

// Remembers, for a while, which files died and which documents became backups, so that an identity survives
// when the two halves of a move, or of an editor's save, are seen apart. Thread contract: the keeper's
// thread.
class RecentFiles {
 public:
  void died(const ItemRecord &record);
  // The number that the same file had when it died; it is forgotten by that.
  std::optional<ItemNumber> takeDead(const FileFacts &facts);

  void becameBackup(ItemNumber folder, const std::string &name, ItemNumber id);
  // The item that left this name lately to be its backup; it is forgotten by that.
  std::optional<ItemNumber> takeBackup(ItemNumber folder, const std::string &name);

 private:
  struct Dead {
    FileFacts facts;
    ItemNumber id;
  };
  struct Backup {
    ItemNumber id;
    std::chrono::steady_clock::time_point when;
  };
  std::multimap<std::uint64_t, Dead> deadByInode_;
  std::deque<std::pair<std::uint64_t, ItemNumber>> deadOrder_;
  std::map<std::pair<ItemNumber, std::string>, Backup> backups_;
};

}  // namespace droxa::keld
