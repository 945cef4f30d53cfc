#pragma once

#include <map>
#include <string>
#include <sys/types.h>

namespace droxa {

// The locks that a coordinated access takes, by their offsets in the lock file: a reader's on every folder
// above the path, and the access's own on the path itself. Two locks of one offset are the stronger one.
// Thread contract: for one thread.
class FileLockPlan {
 public:
  struct Entry {
    bool isWriting = false;
    std::string path;
  };
  // `path` is absolute and normalised.
  void add(const std::string &path, bool isWriting);
  // Ascending: the order in which everybody takes them, so that nobody waits in a circle.
  const std::map<off_t, Entry> &entries() const { return entries_; }

 private:
  void add(off_t offset, bool isWriting, const std::string &path);
  std::map<off_t, Entry> entries_;
};

// One lock of an open file description on the byte at `offset`. Each gives 0, EAGAIN while another's lock
// is in the way, or the system's error.
int FileLockTry(int descriptor, off_t offset, bool isWriting);
// Whether nobody else holds any lock there.
int FileLockTestFree(int descriptor, off_t offset);
void FileLockRelease(int descriptor, off_t offset);

}  // namespace droxa
