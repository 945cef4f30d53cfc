#pragma once

#include <memory>
#include <string>
#include <utility>

#include "platform/foundation/NSError.h"
#include "platform/foundation/NSURL.h"

namespace droxa {

// A folder of one operation's own, with a random name, on the file system of the item that it works on:
// what is prepared in it becomes visible by one rename, and what is moved into it has gone by one. It holds
// a lock as long as it lives, and is removed at its end with all that is in it. One that a dead process left
// is removed by FPRemoveAbandonedReplacements.
// Thread contract: belongs to one thread at a time.
class FPReplacement final {
 public:
  // For work on the item at `url`, which needn't be there; the folder that holds it must. Null, with `error`
  // set, when nothing can be made there.
  static std::unique_ptr<FPReplacement> make(const NSURL &url, NSError *error);
  // Makes the folder at `url` itself such a folder, which takes it out of sight beside where it was: for a
  // disk that has no room for one more.
  static std::unique_ptr<FPReplacement> makeOfFolderAtURL(const NSURL &url, NSError *error);
  ~FPReplacement();
  FPReplacement(const FPReplacement &) = delete;
  FPReplacement &operator=(const FPReplacement &) = delete;

  int folder() const { return folder_; }  // open for *at calls

 private:
  FPReplacement(int parent, std::string name, int folder)
      : parent_(parent), name_(std::move(name)), folder_(folder) {}
  static std::unique_ptr<FPReplacement> makeIn(const std::string &parentPath, int *error);

  // Open, since the folder above may be moved meanwhile.
  const int parent_;
  const std::string name_;
  const int folder_;
};

}  // namespace droxa
