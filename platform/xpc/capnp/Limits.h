#pragma once

#include <cstddef>
#include <cstdint>

// What one connection may cost this process. A peer that goes beyond loses its connection.

namespace droxa {

inline constexpr std::uint64_t XPCMaximumMessageWords = 4U << 20;   // 32 MiB
inline constexpr std::size_t XPCMaximumQueuedBytes = 64U << 20;     // written here, not read by the peer
inline constexpr std::size_t XPCMaximumUnansweredWords = 8U << 20;  // of calls; above, nothing more is read
inline constexpr std::size_t XPCMaximumUnansweredCalls = 16384;
inline constexpr std::size_t XPCMaximumConcurrentCalls = 64;  // running at once; the others wait
inline constexpr unsigned XPCMaximumDescriptorsInMessage = 2;
inline constexpr std::size_t XPCMaximumDescriptorsOfPeer = 64;  // unasked for, in a connection's whole life

}  // namespace droxa
