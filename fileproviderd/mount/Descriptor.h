#pragma once

#include <memory>
#include <unistd.h>
#include <utility>

namespace droxa {

// Owns an open file descriptor. Thread contract: immutable but for moving; sharers may use it on any thread.
class Descriptor {
 public:
  Descriptor() = default;
  explicit Descriptor(int number) : number_(number) {}
  ~Descriptor() {
    if (number_ >= 0) ::close(number_);
  }
  Descriptor(Descriptor &&other) noexcept : number_(std::exchange(other.number_, -1)) {}
  Descriptor &operator=(Descriptor &&other) noexcept {
    std::swap(number_, other.number_);
    return *this;
  }

  explicit operator bool() const { return number_ >= 0; }
  int get() const { return number_; }

 private:
  int number_ = -1;
};

using SharedDescriptor = std::shared_ptr<const Descriptor>;

}  // namespace droxa
