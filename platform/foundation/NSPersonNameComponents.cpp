#include "platform/foundation/NSPersonNameComponents.h"

namespace droxa {

std::string NSPersonNameComponents::description() const {
  std::string text;
  for (const auto *part : {&namePrefix, &givenName, &middleName, &familyName, &nameSuffix}) {
    if (!*part) continue;
    if (!text.empty()) text += ' ';
    text += **part;
  }
  if (nickname) text += (text.empty() ? "(" : " (") + *nickname + ")";
  return text;
}

}  // namespace droxa
