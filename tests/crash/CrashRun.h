#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace droxa::crash {

struct CrashOptions {
  std::uint64_t seed = 0;
  std::uint64_t kills = 10;
  std::uint64_t checkEvery = 25;  // kills; and at the end
  bool isVerbose = false;
};

struct CrashReport {
  std::uint64_t kills = 0;
  std::vector<std::string> findings;  // what was promised and not kept; empty when all was
  std::string summary;                // for people: the seed, and how much of what was done
  std::string folder;                 // left behind when there is a finding, "" otherwise
};

// Two devices on one cloud in a temporary folder, a workload on both, and as many kills as asked for. After a
// check with a finding it ends. Thread contract: blocks; one at a time.
CrashReport RunCrashes(const CrashOptions &options);

}  // namespace droxa::crash
