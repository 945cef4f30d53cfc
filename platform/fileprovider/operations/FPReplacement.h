#pragma once

#include <memory>
#include <string>

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
  const std::string &path() const { return path_; }

 private:
  FPReplacement(std::string path, int folder) : path_(std::move(path)), folder_(folder) {}
  static std::unique_ptr<FPReplacement> makeIn(const std::string &parent, int *error);

  const std::string path_;
  const int folder_;
};

}  // namespace droxa
