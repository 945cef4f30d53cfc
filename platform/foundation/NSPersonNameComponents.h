#pragma once

#include <optional>
#include <string>

namespace droxa {

// The parts of a person's name; each may be nil. Thread contract: a value.
struct NSPersonNameComponents {
  std::optional<std::string> namePrefix;
  std::optional<std::string> givenName;
  std::optional<std::string> middleName;
  std::optional<std::string> familyName;
  std::optional<std::string> nameSuffix;
  std::optional<std::string> nickname;

  std::string description() const;  // "Dr. Vera M. Lind (Vee)": what there is, in this order
  bool operator==(const NSPersonNameComponents &) const = default;
};

}  // namespace droxa
