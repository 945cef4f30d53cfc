#include "platform/cloudkit/CKRecordID.h"

#include <cctype>

namespace droxa {
namespace {

constexpr std::size_t kLongestName = 255;

std::string printable(const std::string &bytes) {
  std::string text;
  for (const char c : bytes) {
    const auto byte = static_cast<unsigned char>(c);
    if (byte >= 0x20 && byte != 0x7f && byte != '\\') {
      text += c;
      continue;
    }
    text += "\\x";
    text += "0123456789abcdef"[byte >> 4];
    text += "0123456789abcdef"[byte & 15];
  }
  return text;
}

std::size_t mix(std::size_t a, std::size_t b) {
  return a ^ (b + 0x9e3779b97f4a7c15U + (a << 6) + (a >> 2));
}

}  // namespace

std::string CKRecordZoneID::description() const {
  return printable(zoneName) + ":" + printable(ownerName);
}

std::string CKRecordID::description() const {
  return printable(recordName) + "@" + zoneID.description();
}

bool CKNameIsValid(const std::string &name) {
  return !name.empty() && name.size() <= kLongestName && name.find('\0') == std::string::npos;
}

}  // namespace droxa

std::size_t std::hash<droxa::CKRecordZoneID>::operator()(const droxa::CKRecordZoneID &zone) const noexcept {
  const std::hash<std::string> text;
  return droxa::mix(text(zone.zoneName), text(zone.ownerName));
}

std::size_t std::hash<droxa::CKRecordID>::operator()(const droxa::CKRecordID &record) const noexcept {
  return droxa::mix(std::hash<std::string>()(record.recordName),
                    std::hash<droxa::CKRecordZoneID>()(record.zoneID));
}
