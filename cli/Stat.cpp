#include "cli/Commands.h"
#include "cli/ExitStatus.h"
#include "cli/ItemArgument.h"
#include "cli/ItemText.h"
#include "platform/fileprovider/NSFileProviderError.h"

namespace droxa {

int runStat(CommandContext &context, const std::string &argument, bool json) {
  const auto found = resolveItem(*context.host, argument);
  if (!found.value) return reportError(context, argument, found.error);
  if (json) {
    context.out << itemJSON(found.value->fields()) << '\n';
  } else {
    context.out << propertyLines(found.value->fields());
  }
  context.out.flush();
  return kExitSuccess;
}

int runId(CommandContext &context, const std::string &path) {
  const auto found = context.host->itemAtPath(path.empty() ? "/" : path);
  if (!found.value) return reportError(context, path, found.error);
  context.out << found.value->itemIdentifier() << std::endl;
  return kExitSuccess;
}

int runUrl(CommandContext &context, const std::string &argument) {
  const auto container = resolveContainer(*context.host, argument);
  if (container.error) return reportError(context, argument, container.error);
  const std::string &identifier = container.value.identifier;
  const auto found = context.host->url(identifier);
  if (found.error) return reportError(context, argument, found.error);
  if (!found.value) {
    // The answer doesn't say why there is none; the item's does.
    const NSError reason = context.host->item(identifier).error;
    return reportError(context, argument,
                       reason ? reason : fileProviderErrorForNonExistentItemWithIdentifier(identifier));
  }
  context.out << found.value.absoluteString() << std::endl;
  return kExitSuccess;
}

}  // namespace droxa
