#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "keld/ItemRecord.h"

namespace droxa::keld {

// Owns a file descriptor.
class OwnedDescriptor {
 public:
  explicit OwnedDescriptor(int descriptor = -1) : descriptor_(descriptor) {}
  ~OwnedDescriptor();
  OwnedDescriptor(OwnedDescriptor &&other) noexcept : descriptor_(other.release()) {}
  OwnedDescriptor &operator=(OwnedDescriptor &&other) noexcept;
  int get() const { return descriptor_; }
  int release();
  explicit operator bool() const { return descriptor_ >= 0; }

 private:
  int descriptor_;
};

// The names of a folder, one after the other in one piece of memory: a folder may hold a million of them.
class NameList {
 public:
  void add(std::string_view name);
  void sort();  // by byte order; each name once
  std::size_t size() const { return slices_.size(); }
  std::string_view operator[](std::size_t index) const {
    return std::string_view(bytes_).substr(slices_[index].offset, slices_[index].length);
  }

 private:
  struct Slice {
    std::uint32_t offset;
    std::uint32_t length;
  };
  std::string bytes_;
  std::vector<Slice> slices_;
};

// What the file system says of `name` in the open folder; links are never followed. nullopt when there is
// nothing of that name, or a socket, a pipe or a device. A link reads as symbolicLink, alias or not.
// `ownDevice` is the device number that reads as 0.
std::optional<FileFacts> ReadFileFacts(int folder, const std::string &name, std::uint64_t ownDevice);
// The same of the open folder itself.
std::optional<FileFacts> ReadFolderFacts(int folder, std::uint64_t ownDevice);

// The names in the folder, sorted, without "." and "..". The folder may be open as a path alone. 0 or an
// errno.
int ReadFolderNames(int folder, NameList *names);

// Opens a folder by its name in another, as a path alone and never through a link; -1 with errno set.
OwnedDescriptor OpenFolder(int parent, const std::string &name);

}  // namespace droxa::keld
