#include "platform/cloudkit/embedded/ChangeToken.h"

#include <algorithm>
#include <array>

namespace droxa::embedded {
namespace {

constexpr std::uint8_t kVersion = 1;
constexpr std::size_t kLength = 1 + 16 + 8 + 8;

void put(std::span<std::uint8_t> to, std::int64_t number) {
  for (std::size_t i = 0; i < 8; ++i) {
    to[i] = static_cast<std::uint8_t>((static_cast<std::uint64_t>(number) >> (56 - 8 * i)) & 0xff);
  }
}

std::int64_t get(std::span<const std::uint8_t> from) {
  std::uint64_t number = 0;
  for (std::size_t i = 0; i < 8; ++i) number = number << 8 | from[i];
  return static_cast<std::int64_t>(number);
}

}  // namespace

CKServerChangeToken ChangeToken::encoded() const {
  std::array<std::uint8_t, kLength> bytes{kVersion};
  std::copy(cloud.bytes.begin(), cloud.bytes.end(), bytes.begin() + 1);
  put(std::span(bytes).subspan(17), zone);
  put(std::span(bytes).subspan(25), seq);
  return {NSData::dataWithBytes(bytes)};
}

std::optional<ChangeToken> ChangeToken::decode(const CKServerChangeToken &token) {
  const auto bytes = token.data.bytes();
  if (bytes.size() != kLength || bytes[0] != kVersion) return std::nullopt;
  ChangeToken decoded;
  std::copy(bytes.begin() + 1, bytes.begin() + 17, decoded.cloud.bytes.begin());
  decoded.zone = get(bytes.subspan(17));
  decoded.seq = get(bytes.subspan(25));
  return decoded;
}

}  // namespace droxa::embedded
