#include "platform/cloudkit/embedded/Chunker.h"

#include <algorithm>
#include <array>

namespace droxa::embedded {
namespace {

// A random number for each byte value, always the same ones (splitmix64).
constexpr std::array<std::uint64_t, 256> makeGear() {
  std::array<std::uint64_t, 256> gear{};
  std::uint64_t state = 0x64726f7861636b31U;
  for (std::uint64_t &value : gear) {
    state += 0x9e3779b97f4a7c15U;
    std::uint64_t z = state;
    z = (z ^ (z >> 30)) * 0xbf58476d1ce4e5b9U;
    z = (z ^ (z >> 27)) * 0x94d049bb133111ebU;
    value = z ^ (z >> 31);
  }
  return gear;
}
constexpr std::array<std::uint64_t, 256> kGear = makeGear();

// Cuts are rare before the average size and frequent after it, which keeps sizes near it. The high bits are
// those that all of the last 64 bytes have a part in.
constexpr std::uint64_t kRare = ~std::uint64_t{0} << (64 - 20);
constexpr std::uint64_t kFrequent = ~std::uint64_t{0} << (64 - 19);

}  // namespace

std::size_t ChunkLength(std::span<const std::uint8_t> bytes) {
  if (bytes.size() <= kSmallestChunk) return bytes.size();
  const std::size_t normal = std::min(bytes.size(), kAverageChunk);
  const std::size_t end = std::min(bytes.size(), kLargestChunk);
  std::uint64_t hash = 0;
  std::size_t i = kSmallestChunk - 64;
  for (; i < kSmallestChunk; ++i) hash = (hash << 1) + kGear[bytes[i]];
  for (; i < normal; ++i) {
    if ((hash & kRare) == 0) return i;
    hash = (hash << 1) + kGear[bytes[i]];
  }
  for (; i < end; ++i) {
    if ((hash & kFrequent) == 0) return i;
    hash = (hash << 1) + kGear[bytes[i]];
  }
  return end;
}

}  // namespace droxa::embedded
