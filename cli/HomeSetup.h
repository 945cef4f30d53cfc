#pragma once

#include <optional>
#include <ostream>
#include <string>

#include "platform/foundation/Paths.h"

namespace droxa {

struct HomeSetup {
  bool isNew = false;   // documents were put into it now
  std::string summary;  // one line about where its documents come from
};

// Makes the home, and fills it when it is new: with a copy of `folder`'s documents, else with the sample
// drive. A home whose filling was cut off counts as new. nullopt with `problem` when that isn't possible.
std::optional<HomeSetup> setUpHome(const DroxaHome &home, const std::optional<std::string> &folder,
                                   std::ostream &err, std::string *problem);

}  // namespace droxa
