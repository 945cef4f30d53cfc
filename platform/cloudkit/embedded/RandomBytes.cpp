#include "platform/cloudkit/embedded/RandomBytes.h"

#include <cerrno>
#include <sys/random.h>

#include "platform/cloudkit/embedded/Home.h"

namespace droxa::embedded {
namespace {

int digit(char c) {
  if (c >= '0' && c <= '9') return c - '0';
  return c >= 'a' && c <= 'f' ? c - 'a' + 10 : -1;
}

}  // namespace

std::string RandomBytes(std::size_t count) {
  std::string bytes(count, '\0');
  for (std::size_t done = 0; done < count;) {
    const ssize_t got = getrandom(bytes.data() + done, count - done, 0);
    if (got < 0 && errno != EINTR) Fail(CKErrorCode::internalError, "The system gives no random bytes");
    if (got > 0) done += static_cast<std::size_t>(got);
  }
  return bytes;
}

std::string HexOf(std::string_view bytes) {
  std::string text;
  for (const char c : bytes) {
    const auto byte = static_cast<unsigned char>(c);
    text += "0123456789abcdef"[byte >> 4];
    text += "0123456789abcdef"[byte & 15];
  }
  return text;
}

std::string BytesOfHex(std::string_view hex) {
  if (hex.size() % 2 != 0) return {};
  std::string bytes;
  for (std::size_t i = 0; i < hex.size(); i += 2) {
    const int high = digit(hex[i]);
    const int low = digit(hex[i + 1]);
    if (high < 0 || low < 0) return {};
    bytes += static_cast<char>(high << 4 | low);
  }
  return bytes;
}

}  // namespace droxa::embedded
