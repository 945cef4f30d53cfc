#pragma once

#include <array>
#include <cstdint>
#include <string>

namespace droxa {

// A universally unique identifier, in the order in which its bytes are written and compared.
// Thread contract: a value.
struct UUID {
  std::array<std::uint8_t, 16> bytes{};  // all zero: null

  static UUID generate();                // a random one (version 4)
  int compare(const UUID &other) const;  // negative, 0 or positive, by unsigned bytes from the first
  bool isNull() const;
  std::string description() const;  // "6B29FC40-CA47-1067-B31D-00DD010662DA"

  bool operator==(const UUID &) const = default;
};

void uuid_generate(UUID &uuid);
int uuid_compare(const UUID &a, const UUID &b);

}  // namespace droxa
