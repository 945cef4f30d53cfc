#include "keld/RecentFiles.h"

namespace droxa::keld {

namespace {
constexpr std::size_t kMostDead = 4096;
constexpr std::size_t kMostBackups = 1024;
constexpr std::chrono::seconds kBackupMemory{5};
}  // namespace

bool IsBackupName(std::string_view name, std::string_view original) {
  for (const std::string_view suffix : {"~", ".bak", ".BAK", ".old", ".orig", ".backup", ".bck"}) {
    if (name.size() == original.size() + suffix.size() && name.substr(0, original.size()) == original &&
        name.substr(original.size()) == suffix)
      return true;
  }
  return name.size() == original.size() + 2 && name.front() == '#' && name.back() == '#' &&
         name.substr(1, original.size()) == original;
}

void RecentFiles::died(const ItemRecord &record) {
  deadByInode_.emplace(record.facts.inode, Dead{record.facts, record.id});
  deadOrder_.emplace_back(record.facts.inode, record.id);
  if (deadOrder_.size() <= kMostDead) return;
  const auto [inode, id] = deadOrder_.front();
  deadOrder_.pop_front();
  auto range = deadByInode_.equal_range(inode);
  for (auto dead = range.first; dead != range.second; ++dead) {
    if (dead->second.id != id) continue;
    deadByInode_.erase(dead);
    return;
  }
}

std::optional<ItemNumber> RecentFiles::takeDead(const FileFacts &facts) {
  auto range = deadByInode_.equal_range(facts.inode);
  for (auto dead = range.first; dead != range.second; ++dead) {
    if (!dead->second.facts.isSameFile(facts)) continue;
    const ItemNumber id = dead->second.id;
    deadByInode_.erase(dead);
    return id;
  }
  return std::nullopt;
}

void RecentFiles::becameBackup(ItemNumber folder, const std::string &name, ItemNumber id) {
  if (backups_.size() >= kMostBackups) backups_.clear();
  backups_[{folder, name}] = {id, std::chrono::steady_clock::now()};
}

std::optional<ItemNumber> RecentFiles::takeBackup(ItemNumber folder, const std::string &name) {
  const auto found = backups_.find({folder, name});
  if (found == backups_.end()) return std::nullopt;
  const Backup backup = found->second;
  backups_.erase(found);
  if (std::chrono::steady_clock::now() - backup.when > kBackupMemory) return std::nullopt;
  return backup.id;
}

}  // namespace droxa::keld
