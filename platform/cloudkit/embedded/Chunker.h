#pragma once

#include <cstddef>
#include <cstdint>
#include <span>

namespace droxa::embedded {

inline constexpr std::size_t kSmallestChunk = 256 * 1024;
inline constexpr std::size_t kAverageChunk = 1024 * 1024;
inline constexpr std::size_t kLargestChunk = 4 * 1024 * 1024;

// Where the chunk that begins with `bytes` ends: a place that depends on the 64 bytes before it alone, so
// that bytes put in or taken out change the chunks around them and no others. `bytes` are kLargestChunk
// bytes, or all that is left. The last chunk may be smaller than kSmallestChunk. The places are part of
// nothing that is stored: only sharing would suffer from another rule. Thread contract: a pure function.
std::size_t ChunkLength(std::span<const std::uint8_t> bytes);

}  // namespace droxa::embedded
