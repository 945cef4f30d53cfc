#pragma once

#include <atomic>
#include <cstdint>
#include <cstring>

#include "platform/foundation/UUID.h"

namespace droxa {

// A UUID that is stored under its owner's lock and may be read without it. A reader never waits for that
// lock, never sees half of one UUID and half of another, and starts over only when a store overlaps its read.
// Thread contract: load() on any thread; store() by one thread at a time, which the owner's lock sees to.
class AtomicUUID {
 public:
  static_assert(sizeof(UUID::bytes) == 2 * sizeof(std::uint64_t));

  UUID load() const {
    for (;;) {
      const std::uint64_t before = version_.load();
      const std::uint64_t words[2] = {first_.load(), second_.load()};
      if (before % 2 == 0 && version_.load() == before) {
        UUID uuid;
        std::memcpy(uuid.bytes.data(), words, sizeof words);
        return uuid;
      }
    }
  }

  // An odd version marks a store under way. Everything is sequentially consistent: a reader that saw either
  // new word sees a version other than the one before the store.
  void store(const UUID &uuid) {
    std::uint64_t words[2];
    std::memcpy(words, uuid.bytes.data(), sizeof words);
    version_.fetch_add(1);
    first_.store(words[0]);
    second_.store(words[1]);
    version_.fetch_add(1);
  }

 private:
  std::atomic<std::uint64_t> version_{0};
  std::atomic<std::uint64_t> first_{0};
  std::atomic<std::uint64_t> second_{0};
};

}  // namespace droxa
