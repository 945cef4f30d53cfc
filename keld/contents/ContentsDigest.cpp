#include "keld/contents/ContentsDigest.h"

#include <array>
#include <openssl/evp.h>
#include <stdexcept>

namespace droxa::keld {

struct ContentsDigest::Context {
  EVP_MD_CTX *handle = EVP_MD_CTX_new();
  ~Context() { EVP_MD_CTX_free(handle); }
};

// A digest that can't be computed would let wrong contents pass: it throws, as an allocation would.
ContentsDigest::ContentsDigest() : context_(std::make_unique<Context>()) {
  if (!context_->handle || EVP_DigestInit_ex(context_->handle, EVP_sha256(), nullptr) != 1)
    throw std::runtime_error("SHA-256 isn't available");
}

ContentsDigest::~ContentsDigest() = default;

void ContentsDigest::add(std::string_view bytes) {
  if (EVP_DigestUpdate(context_->handle, bytes.data(), bytes.size()) != 1)
    throw std::runtime_error("SHA-256 failed");
}

std::string ContentsDigest::finish() {
  std::array<unsigned char, EVP_MAX_MD_SIZE> bytes;
  unsigned int length = 0;
  if (EVP_DigestFinal_ex(context_->handle, bytes.data(), &length) != 1)
    throw std::runtime_error("SHA-256 failed");
  static constexpr char kDigits[] = "0123456789abcdef";
  std::string text;
  for (unsigned int i = 0; i < length; ++i) {
    text += kDigits[bytes[i] >> 4];
    text += kDigits[bytes[i] & 15];
  }
  return text;
}

std::string ContentsDigest::of(std::string_view bytes) {
  ContentsDigest digest;
  digest.add(bytes);
  return digest.finish();
}

}  // namespace droxa::keld
