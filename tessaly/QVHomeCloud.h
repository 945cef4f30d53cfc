#pragma once

#include <optional>
#include <string>

#include "platform/foundation/NSError.h"
#include "platform/foundation/Paths.h"

namespace droxa {

// Which cloud a home's drive is in, and as whom: <configuration folder>/cloud.json.
// Thread contract: a value.
struct QVHomeCloud {
  std::string folder;   // "": the home's own
  std::string device;   // "": as the machine is called
  std::string account;  // "": as the user is called
  bool operator==(const QVHomeCloud &) const = default;
};

// What the home remembers; nullopt without error when it has nothing to remember, nullopt with `error` set,
// which names the file, when it can't be read. Any thread.
std::optional<QVHomeCloud> QVHomeCloudRead(const DroxaHome &home, NSError *error);

// The same with everything told.
QVHomeCloud QVHomeCloudWithDefaults(const DroxaHome &home, QVHomeCloud cloud);

// The name of who runs this process: the account in a cloud of its own.
std::string QVLocalUserName();
// What this machine is called as a device; another one for each home.
std::string QVDeviceName(const DroxaHome &home);

}  // namespace droxa
