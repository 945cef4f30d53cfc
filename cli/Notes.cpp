// What a user notes about an item: its rank among the favourites, and when it was last used.

#include "cli/Acting.h"
#include "cli/ActionArgument.h"
#include "cli/Actions.h"
#include "cli/DateArgument.h"
#include "cli/ExitStatus.h"
#include "cli/Text.h"

namespace droxa {

int runFavorite(CommandContext &context, const std::string &argument, std::optional<std::uint64_t> rank,
                bool json) {
  int exitStatus = kExitSuccess;
  const auto item = resolveForAction(context, argument, &exitStatus);
  if (!item) return exitStatus;
  FPDActionRequest request;
  request.kind = FPDActionRequest::Kind::setFavoriteRank;
  request.identifier = item->itemIdentifier();
  request.favoriteRank = rank;
  return actAndReport(context, argument, request, json);
}

int runUsed(CommandContext &context, const UsedOptions &options) {
  FPDActionRequest request;
  request.kind = FPDActionRequest::Kind::setLastUsedDate;
  if (!options.never) request.date = options.date.empty() ? NSDate::now() : dateFromText(options.date);
  if (!options.never && !request.date) {
    context.err << "droxa: " << escapedText(options.date)
                << ": it is no date such as 2026-01-31, 2026-01-31T12:00 or 2026-01-31T12:00:00Z"
                << std::endl;
    return kExitUsage;
  }
  int exitStatus = kExitSuccess;
  const auto item = resolveForAction(context, options.argument, &exitStatus);
  if (!item) return exitStatus;
  request.identifier = item->itemIdentifier();
  return actAndReport(context, options.argument, request, options.json);
}

}  // namespace droxa
