#include "cli/Commands.h"
#include "cli/ContentsArgument.h"
#include "cli/ContentsText.h"
#include "cli/ExitStatus.h"

namespace droxa {

int runItemStatus(CommandContext &context, const std::vector<std::string> &arguments, bool json) {
  return forEachContents(context, arguments, [&](const ContentsArgument &contents) {
    const auto status = contentsStatus(context, contents);
    if (status.error) return reportError(context, contents.argument, status.error);
    if (json) {
      context.out << contentsJSON(contents, status.value) << std::endl;
    } else {
      context.out << contentsLines(contents, status.value) << std::flush;
    }
    return kExitSuccess;
  });
}

}  // namespace droxa
