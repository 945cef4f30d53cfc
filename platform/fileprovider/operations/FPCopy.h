#pragma once

#include <string>

#include "platform/fileprovider/operations/FPOperations.h"
#include "platform/foundation/NSError.h"

namespace droxa {

// What a copy is for.
enum class FPCopyPurpose {
  import,  // a new item: without the marks that say what the source was in a drive
  move,    // the same item elsewhere: with every attribute, its owner where that may be given, and durable
};

// Copies the document, link or folder at `source` into the open folder, under `name`: contents with their
// holes, extended attributes, mode and dates. A folder's own mode gets the owner's right to write, without
// which it couldn't be moved; FPFinishCopiedMode() takes that back. What is none of the three, what changed
// or vanished while it was read, and a document whose contents are elsewhere are errors that name it. The
// caller removes what a failure leaves in the folder. Reports bytes to the progress.
NSError FPCopyItem(const NSURL &source, int folder, const std::string &name, FPCopyPurpose purpose,
                   const FPProgress &progress);
void FPFinishCopiedMode(const NSURL &source, const NSURL &copy);

// The parts. Each gives 0 or the system's error.

// ECANCELED where the progress was cancelled.
class FPCopyMeter {
 public:
  explicit FPCopyMeter(FPProgress progress) : progress_(std::move(progress)) {}
  bool isCancelled() const { return progress_ && progress_->isCancelled(); }
  // Moves the count to `bytes` of the file that began at the last finishFile().
  void report(std::int64_t bytes) const {
    if (progress_) progress_->setCompletedUnitCount(finished_ + bytes);
  }
  void finishFile(std::int64_t bytes) {
    finished_ += bytes;
    report(0);
  }

 private:
  const FPProgress progress_;
  std::int64_t finished_ = 0;
};

// The first `size` bytes, with their holes; ESTALE when there are less.
int FPCopyContents(int source, int destination, std::int64_t size, const FPCopyMeter &meter);
// The extended attributes of an open file or folder. `attribute` is set to the one that failed.
int FPCopyAttributes(int source, int destination, FPCopyPurpose purpose, std::string *attribute);

}  // namespace droxa
