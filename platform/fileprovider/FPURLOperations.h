#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "platform/foundation/NSError.h"
#include "platform/foundation/NSURL.h"

// The framework's operations on real files, each under file coordination, so that two of them, in whichever
// processes, never meet on one path or on a path and what is below it.
//
// Each is done in one step as others see it: it has happened, or it hasn't, also after a kill. None
// overwrites. Extended attributes, dates and identity are kept. Errors are in NSCocoaErrorDomain, with the
// POSIX error underneath: 4 NSFileNoSuchFileError, 513 NSFileWriteNoPermissionError, 514
// NSFileWriteInvalidFileNameError (an empty name, ".", "..", one with '/' or NUL, or one that is too long),
// 516 NSFileWriteFileExistsError with the colliding URL (fp_collidingURL), 640 NSFileWriteOutOfSpaceError,
// 642 NSFileWriteVolumeReadOnlyError, 3072 NSUserCancelledError, 512 NSFileWriteUnknownError. Long ones
// report bytes to the progress that is current where they begin, and stop when it is cancelled, leaving
// nothing behind.

namespace droxa {

// Called exactly once, on a thread of the pool, unless the operation says otherwise. The URL is where the
// item is now; nil with an error.
using FPURLCompletion = std::function<void(const NSURL &newURL, const NSError &error)>;
using FPErrorCompletion = std::function<void(const NSError &error)>;

class FPURLOperations {
 public:
  virtual ~FPURLOperations() = default;

  // Copies the document, link or folder at `source` under `folder`, under its own name, without the extended
  // attributes "user.droxa.…". 512 for what is none of these or has its contents elsewhere, somewhere in the
  // folder, and for a source that changed while it was read.
  virtual void importUnderFolder(const NSURL &source, const NSURL &folder, FPURLCompletion completion) = 0;
  virtual void createSubFolder(const NSURL &parent, const std::string &name, FPURLCompletion completion) = 0;
  virtual void renameWithNewName(const NSURL &url, const std::string &name, FPURLCompletion completion) = 0;
  // Moves it under `folder`, under `newName` if there is one.
  virtual void reparentUnderFolder_withNewName(const NSURL &url, const NSURL &folder,
                                               const std::optional<std::string> &newName,
                                               FPURLCompletion completion) = 0;
  // With bouncing, a name that is taken becomes the first free one of "name 2.ext", "name 3.ext", …
  virtual void reparentUnderFolder_allowBouncing(const NSURL &url, const NSURL &folder, bool allowBouncing,
                                                 FPURLCompletion completion) = 0;
  // Deletes the item with everything below it.
  virtual void deleteWithCompletionHandler(const NSURL &url, FPErrorCompletion completion) = 0;
  // Takes a coordinated write for deletion and calls the handler, before it returns, on the calling thread,
  // with the URL to act on.
  virtual void coordinatedDeleteWithHandler(const NSURL &url, const FPURLCompletion &handler) = 0;

  // Those of this process: the real ones, unless a test has put others in their place (null: the real ones
  // again).
  static std::shared_ptr<FPURLOperations> shared();
  static void setSharedForTesting(std::shared_ptr<FPURLOperations> operations);
};

// The real ones.
std::shared_ptr<FPURLOperations> FPMakeURLOperations();

void fp_importUnderFolder(const NSURL &source, const NSURL &folder, FPURLCompletion completion);
void fp_createSubFolder(const NSURL &parent, const std::string &name, FPURLCompletion completion);
void fp_renameWithNewName(const NSURL &url, const std::string &name, FPURLCompletion completion);
void fp_reparentUnderFolder_withNewName(const NSURL &url, const NSURL &folder,
                                        const std::optional<std::string> &newName,
                                        FPURLCompletion completion);
void fp_reparentUnderFolder_allowBouncing(const NSURL &url, const NSURL &folder, bool allowBouncing,
                                          FPURLCompletion completion);
void fp_deleteWithCompletionHandler(const NSURL &url, FPErrorCompletion completion);
void fp_coordinatedDeleteWithHandler(const NSURL &url, const FPURLCompletion &handler);

// A path as it may stand in a log: names are shortened to their first and last characters, with their length
// in bytes: "/h(4)e/r(10)t". A name of two bytes or less is its length alone.
std::string fp_obfuscatedPath(const std::string &path);

}  // namespace droxa
