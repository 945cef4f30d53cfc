#pragma once

#include <string>
#include <vector>

namespace droxa {

// The names in an open folder; empty with `error` set to the system's error when it can't be read.
std::vector<std::string> FPNamesInFolder(int folder, int *error);

// Removes everything in the open folder, which stays, at any depth, also from folders that their owner may
// not write in. Goes on past what can't be removed, and gives the first such error, or 0.
int FPRemoveAllIn(int folder);

}  // namespace droxa
