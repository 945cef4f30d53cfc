#pragma once

#include <string>
#include <vector>

namespace droxa {

// Where applications put what others find them by, the most important first: $XDG_DATA_HOME, what Flatpak
// exports for the user, $XDG_DATA_DIRS, and what it exports for everybody. Reads the environment at every
// call. Any thread.
std::vector<std::string> ApplicationDataFolders();

}  // namespace droxa
