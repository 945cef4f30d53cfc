#pragma once

#include <optional>
#include <ostream>
#include <string>

#include "platform/foundation/Paths.h"

namespace droxa {

struct RunOptions {
  std::optional<std::string> home;
  std::optional<std::string> folder;
};

// `droxa run`: serves a drive in the foreground until Ctrl-C. Gives the exit status.
int runRun(std::ostream &out, std::ostream &err, const RunOptions &options);

// The home that a folder's drive gets when none is named: one for each folder, beside the default home.
DroxaHome homeForFolder(const std::string &folder);

}  // namespace droxa
