#include "platform/foundation/UUID.h"

#include <algorithm>
#include <cstring>
#include <uuid/uuid.h>

namespace droxa {

UUID UUID::generate() {
  UUID uuid;
  ::uuid_generate_random(uuid.bytes.data());
  return uuid;
}

int UUID::compare(const UUID &other) const {
  return std::memcmp(bytes.data(), other.bytes.data(), bytes.size());
}

bool UUID::isNull() const {
  return std::all_of(bytes.begin(), bytes.end(), [](std::uint8_t byte) { return byte == 0; });
}

std::string UUID::description() const {
  char text[UUID_STR_LEN];
  ::uuid_unparse_upper(bytes.data(), text);
  return text;
}

void uuid_generate(UUID &uuid) {
  uuid = UUID::generate();
}

int uuid_compare(const UUID &a, const UUID &b) {
  return a.compare(b);
}

}  // namespace droxa
