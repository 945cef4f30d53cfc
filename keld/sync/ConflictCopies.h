#pragma once

#include <atomic>
#include <string>

#include "keld/sync/SyncContext.h"

namespace droxa::keld {

// Keeps what was written here when another version takes the document's name: the file gets a name of its own
// beside it, and is a new document from then on. Thread contract: the sync's thread; made() any.
class ConflictCopies {
 public:
  explicit ConflictCopies(const SyncContext &context) : context_(context) {}

  // Moves the file aside in its folder. nil and `newName`, or what the file system refused. The row that the
  // file stood for has no item then.
  NSError setAside(const FileLocation &location, const LocalFile &file, std::string *newName);
  // Finds places for what interrupted exchanges left in the storage.
  void placeRescuedFiles();
  std::uint64_t made() const { return made_; }

 private:
  const SyncContext &context_;
  std::atomic<std::uint64_t> made_{0};
};

}  // namespace droxa::keld
