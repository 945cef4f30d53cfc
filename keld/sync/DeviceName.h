#pragma once

#include <string>

#include "platform/foundation/Paths.h"

namespace droxa::keld {

// What this device is called where people see it: the machine's name, and the home's folder where the home
// isn't the usual one, since several devices may then be on one machine.
std::string DeviceName(const DroxaHome &home);

}  // namespace droxa::keld
