#include "platform/fileprovider/operations/FPNames.h"

#include <algorithm>
#include <cerrno>

#include "platform/foundation/UTF8.h"

namespace droxa {
namespace {

constexpr std::size_t kLongestExtension = 64;

NSError Refusal(const std::string &name, int code, const std::string &reason) {
  return {NSCocoaErrorDomain,
          NSFileWriteInvalidFileNameError,
          {{NSLocalizedDescriptionKey, "an item can't be named \"" + name + "\": " + reason},
           {NSUnderlyingErrorKey, NSError::errorWithPOSIXCode(code)}}};
}

bool IsDigit(char c) {
  return c >= '0' && c <= '9';
}

// Where the extension of a document begins; the name's end when it has none.
std::size_t ExtensionOf(const std::string &name, bool isFolder) {
  const std::size_t dot = name.rfind('.');
  const bool hasNone = isFolder || name.front() == '.' || dot == std::string::npos || dot + 1 == name.size();
  return hasNone || name.size() - dot > kLongestExtension ? name.size() : dot;
}

}  // namespace

NSError FPCheckName(const std::string &name) {
  if (name.empty()) return Refusal(name, EINVAL, "it is empty");
  if (name == "." || name == "..") return Refusal(name, EINVAL, "that name is the system's own");
  if (name.find('/') != std::string::npos) return Refusal(name, EINVAL, "a name has no '/'");
  if (name.find('\0') != std::string::npos) {
    return Refusal(name.substr(0, name.find('\0')) + "\\0…", EINVAL, "a name has no zero byte");
  }
  if (name.size() > kFPLongestName) {
    return Refusal(name, ENAMETOOLONG,
                   "it has " + std::to_string(name.size()) + " bytes, and 255 is the most");
  }
  return {};
}

FPBouncedNames::FPBouncedNames(const std::string &name, bool isFolder) {
  const std::size_t dot = ExtensionOf(name, isFolder);
  stem_ = name.substr(0, dot);
  extension_ = name.substr(dot);
  std::size_t digits = 0;
  while (digits < stem_.size() && IsDigit(stem_[stem_.size() - 1 - digits])) ++digits;
  const std::size_t first = stem_.size() - digits;
  if (digits == 0 || digits > 3 || first < 2 || stem_[first - 1] != ' ' || stem_[first] == '0') return;
  const auto number = static_cast<std::size_t>(std::stoul(stem_.substr(first)));
  if (number < 2) return;
  number_ = number + 1;
  stem_.resize(first - 1);
}

std::string FPBouncedNames::next() {
  const std::string end = " " + std::to_string(number_++) + extension_;
  return std::string(UTF8Prefix(stem_, kFPLongestName - end.size())) + end;
}

}  // namespace droxa
