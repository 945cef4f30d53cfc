#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>

#include "cli/FolderImport.h"
#include "platform/foundation/Paths.h"

namespace droxa {

struct HomeSetup {
  bool isNew = false;          // documents were put into it, or its cloud, now
  bool isStopped = false;      // by Ctrl-C, in the middle
  std::uint64_t imported = 0;  // documents that were put into the cloud
  std::string summary;         // one line about where its documents come from
};

struct HomeSetupRequest {
  std::optional<std::string> folder;  // whose documents go into the cloud
  bool hasCloudOfOthers = false;      // the cloud has documents already: no sample drive then
  std::function<FolderImportResult(const std::string &folder)> import;
};

// Makes the home, and when it is new gives it something to show: the folder's documents, else what the cloud
// has, else the sample drive. A home whose filling was cut off counts as new. nullopt with `problem` when
// that isn't possible.
std::optional<HomeSetup> setUpHome(const DroxaHome &home, const HomeSetupRequest &request,
                                   std::string *problem);

}  // namespace droxa
