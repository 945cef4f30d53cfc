#include "cli/CommandContext.h"

#include "cli/ExitStatus.h"
#include "cli/Text.h"

namespace droxa {

int reportError(const CommandContext &context, const std::string &asked, const NSError &error) {
  context.out.flush();
  context.err << "droxa: " << (asked.empty() ? "" : escapedText(asked) + ": ") << explanationOfError(error)
              << std::endl;
  return exitStatusForError(error);
}

}  // namespace droxa
