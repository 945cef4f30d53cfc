#pragma once

#include <optional>

#include "keld/FolderReading.h"

namespace droxa::keld {

// Makes sure that nobody else has a file open, and that nobody opens it unnoticed: a lease of the kernel's,
// which holds up whoever opens the file until it is released. Without leases it only looks at the open files
// of the processes that may be looked at, each time it is asked. Never for longer than an operation lasts:
// the kernel breaks a lease after 45 seconds. Thread contract: used by one thread at a time; outlived by the
// descriptor.
class FileLease {
 public:
  enum class Against {
    writers,  // the descriptor must be open for reading alone
    openers,  // anybody; the descriptor itself is the only one
  };

  // nullopt when somebody has the file open.
  static std::optional<FileLease> take(int descriptor, Against against, bool useLeases);
  ~FileLease() { release(); }
  FileLease(FileLease &&other) noexcept;
  FileLease &operator=(FileLease &&) = delete;

  // Whether nobody has opened it since. With a lease, an opener waits: it hasn't done anything yet.
  bool isUnbroken() const;
  void release();

 private:
  FileLease(int descriptor, Against against, bool isKernels)
      : descriptor_(descriptor), against_(against), isKernels_(isKernels) {}
  int descriptor_;
  Against against_;
  bool isKernels_;
};

// Whether a process that may be looked at (this one included) has the file open through another descriptor,
// or, unless `writersOnly` is set, at all.
bool IsOpenElsewhere(int descriptor, bool writersOnly);

}  // namespace droxa::keld
