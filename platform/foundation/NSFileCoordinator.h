#pragma once

#include <chrono>
#include <memory>
#include <string>
#include <vector>

#include "platform/foundation/NSError.h"
#include "platform/foundation/NSProgress.h"
#include "platform/foundation/NSURL.h"

namespace droxa {

// What somebody is about to do with the item at `url` and all below it.
struct NSFileAccessIntent {
  static NSFileAccessIntent readingIntent(const NSURL &url) { return {url, false}; }
  static NSFileAccessIntent writingIntent(const NSURL &url) { return {url, true}; }
  NSURL url;
  bool isWriting = false;
};

// Coordinated accesses that were granted; given back when it goes, or when the process ends, however it ends.
// Thread contract: belongs to one thread at a time.
class NSFileAccess final {
 public:
  ~NSFileAccess();
  NSFileAccess(const NSFileAccess &) = delete;
  NSFileAccess &operator=(const NSFileAccess &) = delete;

 private:
  friend class NSFileCoordinator;
  explicit NSFileAccess(int descriptor) : descriptor_(descriptor) {}
  const int descriptor_;
};

// Advisory coordination of those who work on files, over the threads and processes of one user. While one
// writes to a path, no other writes to it or reads it, or anything below it; and who writes waits for those
// who read or write the path and for those who are at work below it. Readers share, unrelated paths don't
// meet, and nobody is overtaken for ever. Folders are known by where they are, whichever symbolic links lead
// there. Whoever doesn't coordinate isn't kept out.
//
// One file a user holds byte-range locks of open file descriptions, at hashes of paths; paths whose hashes
// are alike wait for each other, which harms nobody.
// Thread contract: immutable; any thread. Granted accesses are held by no thread.
class NSFileCoordinator final {
 public:
  static constexpr std::chrono::milliseconds kPatience{60'000};

  // That of this user: its file is in $XDG_RUNTIME_DIR, else in a folder of the user's own in /tmp.
  static std::shared_ptr<const NSFileCoordinator> defaultCoordinator();
  // Null: the user's again.
  static void setDefaultForTesting(std::shared_ptr<const NSFileCoordinator> coordinator);

  explicit NSFileCoordinator(std::string lockFile, std::chrono::milliseconds patience = kPatience);

  // Waits until all of the accesses are free, and grants them together. Who needs several asks for them at
  // once, and asks for no more while it holds some: then nobody waits for each other in a circle. Null, with
  // `error` set, when `progress` (may be null) was cancelled (NSUserCancelledError), when the patience was at
  // its end or the lock file can't be used (NSFileWriteUnknownError, which names the path).
  std::unique_ptr<NSFileAccess> coordinateAccess(const std::vector<NSFileAccessIntent> &intents,
                                                 const std::shared_ptr<NSProgress> &progress,
                                                 NSError *error) const;

 private:
  const std::string lockFile_;
  const std::chrono::milliseconds patience_;
};

}  // namespace droxa
