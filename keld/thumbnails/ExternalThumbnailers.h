#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace droxa::keld {

// Installed thumbnailers need a file system, and map more memory than they use.
inline constexpr std::uint64_t kExternalMemory = 4ULL << 30;

// The command that runs the installed thumbnailer of a type (platform/quicklook/) where it sees nothing but
// programs, libraries, and the contents that are descriptor 3 of the process that runs it; it prints the
// picture, marked as a thumbnail is. `program` is droxa-thumbnailer. Empty: there is none, or nothing here
// can confine it, which is logged once. Any thread.
std::vector<std::string> ConfinedThumbnailerCommand(const std::string &mimeType, const std::string &program);

// Whether installed thumbnailers can be confined here; found out once, by trying.
bool CanConfineThumbnailers();

}  // namespace droxa::keld
