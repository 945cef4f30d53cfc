#pragma once

#include <unistd.h>

namespace droxa {

// Owns an open descriptor. Thread contract: immutable.
class FPDescriptor final {
 public:
  explicit FPDescriptor(int descriptor) : descriptor_(descriptor) {}
  ~FPDescriptor() {
    if (descriptor_ >= 0) close(descriptor_);
  }
  FPDescriptor(const FPDescriptor &) = delete;
  FPDescriptor &operator=(const FPDescriptor &) = delete;
  int get() const { return descriptor_; }  // -1: none

 private:
  const int descriptor_;
};

}  // namespace droxa
