#pragma once

#include <set>
#include <string>
#include <vector>

namespace droxa::keld {

// The notes beside the trash's items (tessaly/QVTrashInfo.h), which the trash operation writes: the note of
// an item that has left the trash is removed, by whoever it was taken out. Who moves something into the trash
// holds a shared lock of the folder of notes; while anybody does, nothing is removed.
// Thread contract: the keeper's thread.
class TrashNotes {
 public:
  explicit TrashNotes(const std::string &replicaPath);

  // These names in the trash are free, or were for a moment.
  void itemsLeft(const std::vector<std::string> &names);
  // Removes the notes of those that left.
  void removeThose();
  // Removes what is certainly nobody's note: older than a day, and no item of its name.
  void removeOrphans() const;

 private:
  bool isInTrash(int files, const std::string &name) const;

  const std::string folder_;
  std::set<std::string> left_;
};

// Moves the items of a trash that was laid out with "Documents" to where they are kept now. "", or what is
// wrong.
std::string MoveTrashOfOldLayout(const std::string &replicaPath);

}  // namespace droxa::keld
