#pragma once

#include <optional>
#include <ostream>
#include <string>

#include "platform/foundation/Paths.h"

namespace droxa {

struct RunOptions {
  std::optional<std::string> home;
  std::optional<std::string> folder;  // whose documents go into the cloud
  std::optional<std::string> cloud;   // the folder that the drive's cloud is in
  std::optional<std::string> device;
  std::optional<std::string> account;  // that the drive belongs to
  std::optional<std::string> mount;    // the folder that shows the drive, else the home's default one
  bool isMounted = true;
};

// `droxa run`: serves a drive in the foreground until Ctrl-C. Gives the exit status.
int runRun(std::ostream &out, std::ostream &err, const RunOptions &options);

// The home that a folder's drive gets when none is named: one for each folder, beside the default home.
DroxaHome homeForFolder(const std::string &folder);

}  // namespace droxa
