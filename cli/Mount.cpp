#include <filesystem>

#include "cli/Commands.h"
#include "cli/ExitStatus.h"
#include "cli/Text.h"

namespace droxa {

int runMount(CommandContext &context, const std::string &path) {
  std::error_code ignored;
  const std::string folder =
      path.empty() ? path : std::filesystem::absolute(path, ignored).lexically_normal().native();
  const auto mounted = context.host->mount(folder);
  if (mounted.error) return reportError(context, path.empty() ? "the drive" : path, mounted.error);
  context.out << escapedText(mounted.value) << std::endl;
  return kExitSuccess;
}

int runUnmount(CommandContext &context) {
  if (const NSError error = context.host->unmount()) return reportError(context, "the mount", error);
  return kExitSuccess;
}

}  // namespace droxa
