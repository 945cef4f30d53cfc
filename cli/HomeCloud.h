#pragma once

#include <optional>
#include <string>
#include <vector>

#include "platform/foundation/Paths.h"

namespace droxa {

// Which cloud a home's drive is in, whose it is, and what its device is called there.
struct HomeCloud {
  std::string folder;        // "": the home's own
  std::string device;        // "": as the machine is
  std::string account = {};  // "": who runs it
  std::vector<std::string> keldOptions() const;
};

// What `droxa run` was asked for, else what the home remembers in its configuration folder. A drive stays in
// its cloud: nullopt with `problem` when another one is named, or one inside the documents themselves. It
// stays its account's, likewise.
std::optional<HomeCloud> resolveHomeCloud(const DroxaHome &home, const std::optional<std::string> &folder,
                                          const std::optional<std::string> &device,
                                          const std::optional<std::string> &account, std::string *problem);
bool rememberHomeCloud(const DroxaHome &home, const HomeCloud &cloud, std::string *problem);

// The account that the home's drive was made for by name; "" when nobody was named.
std::string rememberedAccount(const DroxaHome &home);

// Where it is on disk.
std::string cloudFolder(const DroxaHome &home, const HomeCloud &cloud);

}  // namespace droxa
