#include "cli/Commands.h"
#include "cli/ExitStatus.h"
#include "cli/ItemArgument.h"
#include "cli/ItemText.h"
#include "cli/PageReader.h"
#include "cli/Text.h"

namespace droxa {

namespace {

void printItem(const CommandContext &context, const LsOptions &options,
               const NSFileProviderItemFields &item) {
  if (options.json) {
    context.out << itemJSON(item) << '\n';
  } else if (options.nulls) {
    context.out << item.filename << '\0';
  } else {
    context.out << (options.isLong ? longLine(item) : escapedText(item.filename)) << '\n';
  }
}

// A page goes out before the next one is asked for. False when nobody reads any more.
bool printPage(const CommandContext &context, const LsOptions &options, const NSFileProviderItems &items) {
  for (const auto &item : items) printItem(context, options, item->fields());
  context.out.flush();
  return context.out.good();
}

int listPages(CommandContext &context, const LsOptions &options, const std::string &identifier) {
  const auto enumerator = context.host->enumerator(identifier);
  if (!enumerator.value) return reportError(context, options.argument, enumerator.error);
  PageReader reader(
      *context.host, enumerator.value,
      options.byDate ? NSFileProviderInitialPageSortedByDate() : NSFileProviderInitialPageSortedByName());
  while (!reader.isAtEnd()) {
    const auto page = reader.nextPage();
    if (page.error) return reportError(context, options.argument, page.error);
    if (!printPage(context, options, page.value)) return kExitFailure;
  }
  return kExitSuccess;
}

// The working set lists nothing; its items come as the changes since its start.
int listWorkingSet(CommandContext &context, const LsOptions &options) {
  const auto enumerator = context.host->enumerator(NSFileProviderWorkingSetContainerItemIdentifier);
  if (!enumerator.value) return reportError(context, "the working set", enumerator.error);
  NSData anchor = context.host->anchor(enumerator.value).value;
  bool moreComing = true;
  while (moreComing) {
    const auto changes = context.host->changes(enumerator.value, anchor);
    if (changes.error) return reportError(context, "the working set", changes.error);
    if (!printPage(context, options, changes.value.updated)) return kExitFailure;
    moreComing = changes.value.moreComing && changes.value.anchor != anchor;
    anchor = changes.value.anchor;
  }
  return kExitSuccess;
}

}  // namespace

int runLs(CommandContext &context, const LsOptions &options) {
  if (options.workingSet) return listWorkingSet(context, options);
  if (options.allFolders)
    return listPages(context, options, NSFileProviderAllDirectoriesContainerItemIdentifier);
  const auto container = resolveContainer(*context.host, options.argument);
  if (container.error) return reportError(context, options.argument, container.error);
  const auto &item = container.value.item;
  if (!item || item->fields().kind == NSFileProviderItemKind::folder)
    return listPages(context, options, container.value.identifier);
  printItem(context, options, item->fields());
  context.out.flush();
  return kExitSuccess;
}

}  // namespace droxa
