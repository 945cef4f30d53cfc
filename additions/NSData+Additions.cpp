#include <algorithm>
#include <array>
#include <bit>
#include <cstring>

#include "additions/NSData+Additions.h"
#include "platform/fileprovider/NSFileProviderItem.h"

namespace droxa {
namespace {

static_assert(std::endian::native == std::endian::little, "the tokens' layout is little-endian");

struct PageToken {
  std::uint64_t offset = 0;
  std::uint8_t sortOrder = 0;
  std::array<std::uint8_t, 7> zero{};
};
static_assert(sizeof(PageToken) == 16);

struct ChangeToken {
  std::int64_t rank = 0;
  UUID uuid;
};
static_assert(sizeof(ChangeToken) == 24);

// The record in the token's first bytes, zero where the token is too short.
template <class Record>
Record ReadRecord(const NSData &token) {
  Record record{};
  const auto bytes = token.bytes();
  if (!bytes.empty()) std::memcpy(&record, bytes.data(), std::min(bytes.size(), sizeof record));
  return record;
}

}  // namespace

NSData qv_pageTokenFromSortOrder(std::int64_t sortOrder, std::uint64_t offset) {
  if (offset == 0) return {};
  PageToken record;
  record.offset = offset;
  record.sortOrder = static_cast<std::uint8_t>(sortOrder);
  return NSData::dataWithBytes(&record, sizeof record);
}

std::int64_t qv_pageTokenSortOrder(const NSData &token) {
  if (!token) return 0;
  if (token == NSFileProviderInitialPageSortedByDate()) return 1;
  if (token == NSFileProviderInitialPageSortedByName()) return 0;
  return ReadRecord<PageToken>(token).sortOrder;
}

std::uint64_t qv_pageTokenOffset(const NSData &token) {
  if (!token) return 0;
  if (token == NSFileProviderInitialPageSortedByDate() || token == NSFileProviderInitialPageSortedByName())
    return 0;
  return ReadRecord<PageToken>(token).offset;
}

NSData qv_changeTokenFromRank(std::int64_t rank, const UUID &uuid) {
  const ChangeToken record{rank, uuid};
  return NSData::dataWithBytes(&record, sizeof record);
}

std::int64_t qv_changeTokenRankWithUUID(const NSData &token, const UUID &uuid) {
  if (!token) return 0;
  const auto record = ReadRecord<ChangeToken>(token);
  return uuid_compare(record.uuid, uuid) == 0 ? record.rank : -1;
}

}  // namespace droxa
