#include "tests/crash/DocumentText.h"

#include <array>
#include <cstdio>
#include <openssl/evp.h>

namespace droxa::crash {

namespace {

// splitmix64: each version has bytes of its own, which nothing compresses or repeats.
std::uint64_t nextRandom(std::uint64_t &state) {
  state += 0x9e3779b97f4a7c15U;
  std::uint64_t value = state;
  value = (value ^ (value >> 30U)) * 0xbf58476d1ce4e5b9U;
  value = (value ^ (value >> 27U)) * 0x94d049bb133111ebU;
  return value ^ (value >> 31U);
}

}  // namespace

std::string VersionName::description() const {
  return "document " + std::to_string(document) + " version " + std::to_string(version);
}

std::string DocumentText(const VersionName &name, std::uint64_t length) {
  std::string text = name.description() + " length " + std::to_string(length) + "\n";
  const std::size_t whole = text.size() + length;
  text.reserve(whole + 8);
  std::uint64_t state = (name.document << 20U) ^ name.version;
  while (text.size() < whole) {
    const std::uint64_t value = nextRandom(state);
    for (unsigned shift = 0; shift < 64; shift += 8) text += static_cast<char>((value >> shift) & 0xffU);
  }
  text.resize(whole);
  return text;
}

std::optional<VersionName> ReadDocumentText(const std::string &text) {
  unsigned long long document = 0, version = 0, length = 0;
  const std::string line = text.substr(0, text.substr(0, 200).find('\n'));
  if (std::sscanf(line.c_str(), "document %llu version %llu length %llu", &document, &version, &length) != 3)
    return std::nullopt;
  const VersionName name{document, version};
  if (length > text.size() || DocumentText(name, length) != text) return std::nullopt;
  return name;
}

std::string TextDigest(const std::string &text) {
  std::array<unsigned char, 32> digest{};
  unsigned size = 0;
  EVP_Digest(text.data(), text.size(), digest.data(), &size, EVP_sha256(), nullptr);
  std::string hex;
  for (const unsigned char byte : digest) {
    constexpr char kDigits[] = "0123456789abcdef";
    hex += kDigits[byte >> 4U];
    hex += kDigits[byte & 15U];
  }
  return hex;
}

}  // namespace droxa::crash
