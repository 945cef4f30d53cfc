#pragma once

#include <string>

namespace droxa {

// The file on which this user's coordination of files rests: in $XDG_RUNTIME_DIR where that is a folder of
// the user's own, else in /tmp/droxa-<user>, which is made. "" when somebody else has taken that name.
std::string FileCoordinationFile();

}  // namespace droxa
