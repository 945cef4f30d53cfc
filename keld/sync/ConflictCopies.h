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
  NSError setAside(const FileLocation &location, std::string *newName);
  // Gives the file that name beside its own, so that something else can be put over its own at once. Fails
  // where the file system has no such links. nameAsideOver() ends it.
  NSError nameAside(const FileLocation &location, std::string *newName);
  // The file has that name alone now, and is a document of its own; or, when that wasn't to be, its own
  // again.
  void nameAsideOver(const FileLocation &location, const std::string &newName, bool hasHappened);
  // A process that ended between the two has left both names, which are one file: the new one goes. To be
  // asked when the sync begins, and once more, `isLast`, when the whole replica was seen.
  void undoNameAside(bool isLast);
  // Finds places for what interrupted exchanges left in the storage.
  void placeRescuedFiles();
  std::uint64_t made() const { return made_; }

 private:
  void becomeOwnDocument(const FileLocation &location, const std::string &newName);

  const SyncContext &context_;
  std::atomic<std::uint64_t> made_{0};
};

}  // namespace droxa::keld
