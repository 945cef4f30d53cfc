#include "platform/cloudkit/CKDigest.h"

#include <array>
#include <new>
#include <openssl/evp.h>

namespace droxa {

struct CKDigest::State {
  State() : context(EVP_MD_CTX_new()) {
    if (!context || EVP_DigestInit_ex(context, EVP_sha256(), nullptr) != 1) throw std::bad_alloc();
  }
  State(const State &other) : context(EVP_MD_CTX_new()) {
    if (!context || EVP_MD_CTX_copy_ex(context, other.context) != 1) throw std::bad_alloc();
  }
  ~State() { EVP_MD_CTX_free(context); }
  State &operator=(const State &) = delete;

  EVP_MD_CTX *const context;
};

CKDigest::CKDigest() : state_(std::make_unique<State>()) {}
CKDigest::~CKDigest() = default;
CKDigest::CKDigest(const CKDigest &other)
    : state_(std::make_unique<State>(*other.state_)), size_(other.size_) {}
CKDigest::CKDigest(CKDigest &&) noexcept = default;
CKDigest &CKDigest::operator=(CKDigest &&) noexcept = default;

CKDigest &CKDigest::operator=(const CKDigest &other) {
  if (this != &other) *this = CKDigest(other);
  return *this;
}

void CKDigest::update(std::span<const std::uint8_t> bytes) {
  EVP_DigestUpdate(state_->context, bytes.data(), bytes.size());
  size_ += bytes.size();
}

std::string CKDigest::hex() const {
  const State copy(*state_);
  std::array<unsigned char, EVP_MAX_MD_SIZE> digest{};
  unsigned int length = 0;
  EVP_DigestFinal_ex(copy.context, digest.data(), &length);
  std::string text;
  for (unsigned int i = 0; i < length; ++i) {
    text += "0123456789abcdef"[digest[i] >> 4];
    text += "0123456789abcdef"[digest[i] & 15];
  }
  return text;
}

}  // namespace droxa
