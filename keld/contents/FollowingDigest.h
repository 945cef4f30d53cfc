#pragma once

#include <cstdint>
#include <memory>
#include <string>

namespace droxa::keld {

// The SHA-256 of a file that grows, computed from the file behind whoever writes it, on the pool, so that
// writing and computing take their time together. It holds no thread while it waits for more. Thread
// contract: its members on one thread; the file stays open, and isn't cut, as long as it lives.
class FollowingDigest final {
 public:
  explicit FollowingDigest(int file);
  ~FollowingDigest();  // waits for the piece that is being read
  FollowingDigest(const FollowingDigest &) = delete;
  FollowingDigest &operator=(const FollowingDigest &) = delete;

  // The file's first `length` bytes are written.
  void grewTo(std::uint64_t length);
  // The digest of what was written; an errno value. Nothing may be called any more.
  int finish(std::string *digest);

 private:
  struct State;
  const std::shared_ptr<State> state_;
};

}  // namespace droxa::keld
