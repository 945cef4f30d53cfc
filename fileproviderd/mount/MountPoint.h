#pragma once

#include <optional>
#include <string>

namespace droxa {

// Why this machine can't mount, "" if it can: no /dev/fuse, or no fusermount3 for who isn't root.
std::string whyMountingIsImpossible();

// A folder that a drive is mounted on. Thread contract: one thread.
class MountPoint {
 public:
  // `source`: what the mount is known by in the system's table; a home has one of its own.
  MountPoint(std::string path, std::string source) : path_(std::move(path)), source_(std::move(source)) {}

  const std::string &path() const { return path_; }
  const std::string &source() const { return source_; }
  // Makes the folder, and removes what a killed host left mounted there. "" or why it can't be used.
  std::string prepare() const;
  // The number of the connection of what is mounted; 0: nothing of ours.
  unsigned connection() const;
  // Takes whatever of this source is mounted there off, also when nobody serves it any more, and ends the
  // requests that wait for it. `only`: unless it has another connection than this; 0: whatever it has.
  void takeOff(unsigned only = 0) const;

 private:
  struct Mounted {
    unsigned device = 0;  // the connection's number
    bool isOurs = false;
  };
  std::optional<Mounted> mounted() const;

  const std::string path_;
  const std::string source_;
};

}  // namespace droxa
