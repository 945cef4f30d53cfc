#pragma once

#include <string>
#include <sys/mount.h>

namespace droxa {

// A file system of a kind of its own on a folder, which it hides for as long as this lives; false where the
// process may not mount any. Thread contract: the test's thread.
class MountedFolder final {
 public:
  MountedFolder(std::string path, const char *type, const char *options = "mode=0700")
      : path_(std::move(path)), isMounted_(::mount("none", path_.c_str(), type, 0, options) == 0) {}
  ~MountedFolder() {
    if (isMounted_) ::umount2(path_.c_str(), MNT_DETACH);
  }
  MountedFolder(const MountedFolder &) = delete;
  MountedFolder &operator=(const MountedFolder &) = delete;
  explicit operator bool() const { return isMounted_; }

 private:
  const std::string path_;
  const bool isMounted_;
};

}  // namespace droxa
