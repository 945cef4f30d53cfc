#pragma once

#include <memory>
#include <optional>
#include <string>

namespace droxa {

// Owns (or borrows) a file descriptor.
// Thread contract: immutable after construction; the descriptor is closed by the last reference.
class NSFileHandle {
 public:
  // Any descriptor is taken, a negative one too; null when the failure injection for tests asks for it.
  static std::shared_ptr<NSFileHandle> initWithFileDescriptor(int descriptor, bool closeOnDealloc);
  ~NSFileHandle();
  NSFileHandle(const NSFileHandle &) = delete;
  NSFileHandle &operator=(const NSFileHandle &) = delete;

  int fileDescriptor() const { return descriptor_; }

 private:
  NSFileHandle(int descriptor, bool closeOnDealloc);
  const int descriptor_;
  const bool closeOnDealloc_;
};

// The home directory: what NSSetHomeDirectory() set, else $HOME, else the password database's.
std::string NSHomeDirectory();
void NSSetHomeDirectory(std::optional<std::string> path);  // nullopt: back to the default

}  // namespace droxa
