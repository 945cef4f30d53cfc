#pragma once

#include <cstdint>

#include "platform/foundation/NSData.h"
#include "platform/foundation/UUID.h"

// The tokens that enumerators hand to the framework, which keeps them opaquely and hands them back verbatim:
// raw records of a fixed size without header, version or checksum, in the byte order of the (little-endian)
// host.
//
//   page token, 16 bytes    0: offset, 8 bytes   8: sort order, 1 byte   9: zero, 7 bytes
//   change token, 24 bytes  0: rank, 8 bytes     8: UUID of the enumerator that issued it, 16 bytes
//
// Whatever bytes come back can be read: what is missing counts as zero, what is too much is ignored. A nil
// receiver answers 0. Any thread; nothing blocks.

namespace droxa {

// nil for offset 0: the framework then starts from its initial page, and reads a nil next page as the end.
// Of the sort order the low byte alone is kept.
NSData qv_pageTokenFromSortOrder(std::int64_t sortOrder, std::uint64_t offset);

// Both also know the framework's initial pages: sort order 0 (by name) or 1 (by date), offset 0.
std::int64_t qv_pageTokenSortOrder(const NSData &token);
std::uint64_t qv_pageTokenOffset(const NSData &token);

NSData qv_changeTokenFromRank(std::int64_t rank, const UUID &uuid);

// The token's rank; -1 when another enumerator (or nobody) issued it.
std::int64_t qv_changeTokenRankWithUUID(const NSData &token, const UUID &uuid);

}  // namespace droxa
