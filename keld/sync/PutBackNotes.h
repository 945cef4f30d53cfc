#pragma once

#include <optional>
#include <string>

#include "keld/sync/DocumentRecord.h"
#include "keld/sync/ReplicaFiles.h"

namespace droxa::keld {

// Carries what is noted of the trash's items (tessaly/QVTrashInfo.h) between this device, where a path and an
// item's number tell the folder, and the cloud, where its record does. Notes of what has left the trash are
// the keeper's to remove. Thread contract: the sync's thread.
class PutBackNotes {
 public:
  PutBackNotes(ReplicaFiles &files, SyncStore &store) : files_(files), store_(store) {}

  // Where the item of that name in the trash was; what the cloud last knew of it (`row`) tells where the note
  // doesn't. nullopt when nobody knows.
  std::optional<PutBack> read(const std::string &name, const SyncRow &row) const;
  // For the item of that name, which is in the trash by now.
  void write(const std::string &name, const PutBack &putBack) const;

 private:
  std::string recordOfFolder(const std::string &path, std::uint64_t number, std::uint64_t inode) const;

  ReplicaFiles &files_;
  SyncStore &store_;
};

}  // namespace droxa::keld
