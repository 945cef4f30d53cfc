#pragma once

#include <cstdint>
#include <ostream>
#include <string>
#include <vector>

namespace droxa {

struct FolderImportResult {
  enum class End { done, stopped, failed };
  End end = End::failed;
  std::uint64_t documents = 0, folders = 0, bytes = 0;
  std::uint64_t leftOut = 0;  // what couldn't be read
  std::string problem;        // of a failed one
};

// Runs the program that puts a folder's documents into the cloud, and shows what it says: how far it is, in
// one line when `out` is a terminal, and what it leaves out on `err`. Ctrl-C ends it; run again, it goes on.
// The supervisor's signals must be blocked (Supervisor.h). Thread contract: the main thread.
FolderImportResult runFolderImport(const std::vector<std::string> &command, bool isTerminal,
                                   std::ostream &out, std::ostream &err);

}  // namespace droxa
