#include "platform/foundation/FileCoordinationFile.h"

#include <cstdlib>
#include <sys/stat.h>
#include <unistd.h>

namespace droxa {
namespace {

// A folder, not a link to one, of this user and closed to all others.
bool IsPrivateFolder(const std::string &path) {
  struct stat status {};
  return lstat(path.c_str(), &status) == 0 && S_ISDIR(status.st_mode) && status.st_uid == geteuid() &&
         (status.st_mode & 077U) == 0;
}

}  // namespace

std::string FileCoordinationFile() {
  constexpr char kName[] = "/droxa-file-coordination";
  const char *const runtime = std::getenv("XDG_RUNTIME_DIR");  // NOLINT(concurrency-mt-unsafe)
  if (runtime && runtime[0] == '/' && IsPrivateFolder(runtime)) return runtime + std::string(kName);
  const std::string folder = "/tmp/droxa-" + std::to_string(geteuid());
  (void)mkdir(folder.c_str(), 0700);
  return IsPrivateFolder(folder) ? folder + kName : std::string();
}

}  // namespace droxa
