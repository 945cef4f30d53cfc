#include "fileproviderd/mount/HiddenNames.h"

namespace droxa {

bool isHiddenName(std::string_view name) {
  if (!name.starts_with('.')) return false;
  return name == ".droxa-private" || name.starts_with(".droxa-replacement-") || name.ends_with(".droxafault");
}

}  // namespace droxa
