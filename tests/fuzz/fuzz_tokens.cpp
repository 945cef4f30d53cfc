// Page and change tokens come back from outside the process: any bytes must be read without harm, and every
// token that is made must read back.

#include <cstdint>
#include <cstdlib>
#include <cstring>

#include "additions/NSData+Additions.h"

namespace {

using namespace droxa;

void require(bool condition) {
  if (!condition) std::abort();
}

void readAnything(const NSData &token) {
  const UUID other = UUID::generate();
  const std::int64_t sortOrder = qv_pageTokenSortOrder(token);
  require(sortOrder >= 0 && sortOrder <= 255);
  (void)qv_pageTokenOffset(token);
  require(qv_changeTokenRankWithUUID(token, other) == -1);
}

void pageTokensReadBack(const NSData &token) {
  const std::uint64_t offset = qv_pageTokenOffset(token);
  const std::int64_t sortOrder = qv_pageTokenSortOrder(token);
  const NSData made = qv_pageTokenFromSortOrder(sortOrder, offset);
  require(static_cast<bool>(made) == (offset != 0));
  if (!made) return;
  require(made.length() == 16);
  require(qv_pageTokenOffset(made) == offset);
  require(qv_pageTokenSortOrder(made) == sortOrder);
}

void changeTokensReadBack(const NSData &token) {
  if (token.length() < 24) return;
  UUID issuer;
  std::memcpy(issuer.bytes.data(), token.bytes().data() + 8, issuer.bytes.size());
  const std::int64_t rank = qv_changeTokenRankWithUUID(token, issuer);
  const NSData made = qv_changeTokenFromRank(rank, issuer);
  require(made.length() == 24);
  require(std::memcmp(made.bytes().data(), token.bytes().data(), 24) == 0);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *bytes, std::size_t length) {
  const NSData token = NSData::dataWithBytes(bytes, length);
  readAnything(token);
  pageTokensReadBack(token);
  changeTokensReadBack(token);
  return 0;
}
