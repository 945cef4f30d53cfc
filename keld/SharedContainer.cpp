#include "keld/SharedContainer.h"

#include <cstdint>
#include <span>

#include "platform/cloudkit/CKDigest.h"

namespace droxa::keld {

namespace {

constexpr std::string_view kPrefix = "com.quorva.Tessaly.shared.";
constexpr std::size_t kLongestOwner = 120;
constexpr std::size_t kLongestTitle = 120;

bool isPlain(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '-';
}

std::string escaped(std::string_view owner) {
  constexpr char kDigits[] = "0123456789abcdef";
  std::string text;
  for (const char c : owner) {
    if (isPlain(c)) {
      text += c;
      continue;
    }
    const auto byte = static_cast<unsigned char>(c);
    text += '_';
    text += kDigits[byte >> 4];
    text += kDigits[byte & 15U];
  }
  return text;
}

std::string digestOf(std::string_view text) {
  CKDigest digest;
  digest.update(std::span(reinterpret_cast<const std::uint8_t *>(text.data()), text.size()));
  return digest.hex().substr(0, 32);
}

}  // namespace

std::string SharedContainerOf(std::string_view ownerName) {
  std::string name = escaped(ownerName);
  // "__" is nothing that an escape begins with, so that no other owner's name comes out the same.
  if (name.size() > kLongestOwner) name = name.substr(0, 60) + "__" + digestOf(ownerName);
  return std::string(kPrefix) + name;
}

bool IsSharedContainer(std::string_view containerID) {
  return containerID.size() > kPrefix.size() && containerID.compare(0, kPrefix.size(), kPrefix) == 0;
}

std::string SharedContainerTitle(std::string_view owner) {
  std::string name;
  for (const char c : owner) {
    const auto byte = static_cast<unsigned char>(c);
    name += c == '/' || byte < 0x20 || byte == 0x7f ? '_' : c;
  }
  if (name.size() > kLongestTitle) {
    std::size_t length = kLongestTitle;
    while (length > 0 && (static_cast<unsigned char>(name[length]) & 0xC0U) == 0x80U) --length;
    name.resize(length);
  }
  return "Shared by " + name;
}

}  // namespace droxa::keld
