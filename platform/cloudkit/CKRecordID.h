#pragma once

#include <compare>
#include <cstddef>
#include <functional>
#include <string>

namespace droxa {

// The owner name that means the account itself.
inline constexpr char CKCurrentUserDefaultName[] = "__defaultOwner__";

// Names a zone. Names are raw bytes, 1 to 255 of them, without NUL; a cloud refuses others with
// invalidArguments. Thread contract: a value.
struct CKRecordZoneID {
  std::string zoneName;
  std::string ownerName = CKCurrentUserDefaultName;

  std::string description() const;  // "zoneName:ownerName", bytes that don't print escaped

  bool operator==(const CKRecordZoneID &) const = default;
  auto operator<=>(const CKRecordZoneID &) const = default;
};

// Names a record within its zone; the rules for names are the zone's. Thread contract: a value.
struct CKRecordID {
  std::string recordName;
  CKRecordZoneID zoneID;

  std::string description() const;  // "recordName@zoneName:ownerName", bytes that don't print escaped

  bool operator==(const CKRecordID &) const = default;
  auto operator<=>(const CKRecordID &) const = default;
};

// Whether a cloud takes the name: 1 to 255 bytes, none of them NUL.
bool CKNameIsValid(const std::string &name);

}  // namespace droxa

template <>
struct std::hash<droxa::CKRecordZoneID> {
  std::size_t operator()(const droxa::CKRecordZoneID &zone) const noexcept;
};

template <>
struct std::hash<droxa::CKRecordID> {
  std::size_t operator()(const droxa::CKRecordID &record) const noexcept;
};
