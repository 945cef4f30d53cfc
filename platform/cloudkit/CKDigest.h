#pragma once

#include <cstdint>
#include <memory>
#include <span>
#include <string>

namespace droxa {

// A running SHA-256. Copying copies the state, so that a transfer can be taken up where it stood.
// Thread contract: a value; one thread at a time.
class CKDigest {
 public:
  CKDigest();
  ~CKDigest();
  CKDigest(const CKDigest &other);
  CKDigest &operator=(const CKDigest &other);
  CKDigest(CKDigest &&) noexcept;
  CKDigest &operator=(CKDigest &&) noexcept;

  void update(std::span<const std::uint8_t> bytes);
  std::uint64_t size() const { return size_; }  // bytes so far
  std::string hex() const;  // of the bytes so far: 64 lower-case digits; may go on after it

 private:
  struct State;
  std::unique_ptr<State> state_;
  std::uint64_t size_ = 0;
};

}  // namespace droxa
