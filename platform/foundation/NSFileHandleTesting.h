#pragma once

namespace droxa {

// For tests: while one of these lives, NSFileHandle::initWithFileDescriptor answers null and leaves the
// descriptor to its caller. Thread contract: any thread; affects the whole process.
class NSFileHandleInitFailure {
 public:
  NSFileHandleInitFailure();
  ~NSFileHandleInitFailure();
  NSFileHandleInitFailure(const NSFileHandleInitFailure &) = delete;
  NSFileHandleInitFailure &operator=(const NSFileHandleInitFailure &) = delete;

  static bool isActive();
};

}  // namespace droxa
