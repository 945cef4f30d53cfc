#pragma once

#include <cstdint>

// How keld and the program that makes thumbnails talk: packets on one socket, which is the program's
// descriptor kMakerSocket. Both are of one build, so these are the bytes as they lie in memory.
//
// The program says hello. Then, one job at a time: keld sends a request with two descriptors, the contents
// (open for reading) and the end of a pipe that takes the thumbnail; the program has it made by a process of
// its own, and replies when that process is gone. Into the pipe goes one byte, kMadeMark or kRefusedMark, and
// then the PNG or the reason. Whatever comes out of the pipe is to be judged as what a stranger sent.
namespace droxa::keld {

inline constexpr int kMakerSocket = 3;
inline constexpr std::uint32_t kMakerVersion = 1;
inline constexpr char kMadeMark = 'T';
inline constexpr char kRefusedMark = 'E';
inline constexpr unsigned kThumbnailSide = 1024;  // pixels, at most

enum class MakerKind : std::uint32_t { image, drawing, page, external };

// What one thumbnail may cost.
struct MakerLimits {
  std::uint32_t cpuSeconds = 20;
  std::uint32_t wallMilliseconds = 20'000;
  std::uint64_t memoryBytes = 1536ULL << 20;  // of addresses
  std::uint64_t pixels = 300'000'000;         // by the header, before anything is decoded
  std::uint64_t outputBytes = 8ULL << 20;     // of the thumbnail
};

// Followed, for an external maker, by the command: its words, each ended by a zero byte.
struct MakerRequest {
  std::uint32_t version = kMakerVersion;
  MakerKind kind = MakerKind::image;
  MakerLimits limits;
};
inline constexpr std::uint32_t kLongestRequest = 32 << 10;

enum MakerProtection : std::uint32_t {
  kMakerSystemCalls = 1,  // those that a maker needs, and no others
  kMakerFiles = 2,        // fonts and libraries alone can be opened
};
struct MakerHello {
  std::uint32_t version = kMakerVersion;
  std::uint32_t protections = 0;
};

struct MakerReply {
  std::int32_t waitStatus = 0;  // of the maker's process, as waitpid(2) tells it
  std::uint32_t ranOutOfTime = 0;
};

}  // namespace droxa::keld
