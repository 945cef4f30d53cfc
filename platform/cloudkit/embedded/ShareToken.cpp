#include "platform/cloudkit/embedded/ShareToken.h"

#include <algorithm>
#include <openssl/crypto.h>
#include <openssl/evp.h>
#include <openssl/hmac.h>

#include "platform/cloudkit/embedded/RandomBytes.h"

namespace droxa::embedded {
namespace {

constexpr char kVersion = 1;
constexpr std::size_t kSealLength = 32;
constexpr std::size_t kNumbersLength = 2 + 16 + 8 + 8;  // before the names
constexpr std::size_t kLongestText = 2048;

std::string seal(const std::string &contents, const std::string &key) {
  unsigned char mac[EVP_MAX_MD_SIZE];
  unsigned int length = 0;
  HMAC(EVP_sha256(), key.data(), static_cast<int>(key.size()),
       reinterpret_cast<const unsigned char *>(contents.data()), contents.size(), mac, &length);
  return {reinterpret_cast<const char *>(mac), length};
}

void put(std::string &bytes, std::int64_t number) {
  for (int shift = 56; shift >= 0; shift -= 8) {
    bytes += static_cast<char>((static_cast<std::uint64_t>(number) >> shift) & 0xff);
  }
}

std::int64_t get(std::string_view bytes) {
  std::uint64_t number = 0;
  for (const char c : bytes.substr(0, 8)) number = number << 8 | static_cast<unsigned char>(c);
  return static_cast<std::int64_t>(number);
}

}  // namespace

std::string ShareToken::sealed(const std::string &key) const {
  std::string contents{kVersion, static_cast<char>(kind)};
  contents.append(reinterpret_cast<const char *>(cloud.bytes.data()), cloud.bytes.size());
  put(contents, zone);
  put(contents, account);
  contents += record + '\0' + share;  // names hold no NUL
  return HexOf(contents + seal(contents, key));
}

std::optional<ShareToken> ShareToken::open(const std::string &text, const std::string &key) {
  if (text.size() > kLongestText) return std::nullopt;
  const std::string bytes = BytesOfHex(text);
  if (bytes.size() < kNumbersLength + 1 + kSealLength) return std::nullopt;
  const std::string contents = bytes.substr(0, bytes.size() - kSealLength);
  const std::string expected = seal(contents, key);
  if (expected.size() != kSealLength ||
      CRYPTO_memcmp(expected.data(), bytes.data() + contents.size(), kSealLength) != 0) {
    return std::nullopt;
  }
  const std::size_t end = contents.find('\0', kNumbersLength);
  if (contents[0] != kVersion || end == std::string::npos) return std::nullopt;
  ShareToken token;
  token.kind = static_cast<CKShareTokenKind>(contents[1]);
  std::copy_n(contents.begin() + 2, 16, reinterpret_cast<char *>(token.cloud.bytes.data()));
  token.zone = get(std::string_view(contents).substr(18));
  token.account = get(std::string_view(contents).substr(26));
  token.record = contents.substr(kNumbersLength, end - kNumbersLength);
  token.share = contents.substr(end + 1);
  return token;
}

}  // namespace droxa::embedded
