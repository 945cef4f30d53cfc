#include <nlohmann/json.hpp>
#include <sysexits.h>

#include "cli/Commands.h"
#include "cli/DaemonClient.h"
#include "cli/ExitStatus.h"
#include "cli/Text.h"

namespace droxa {

namespace {

using namespace std::chrono_literals;
using Json = nlohmann::ordered_json;
using Clock = std::chrono::steady_clock;

constexpr char kAnswers[] =
    "`droxa deletions carry-out` deletes them in the cloud too, `droxa deletions restore` brings them back";

int show(CommandContext &context, std::uint64_t held, bool json) {
  if (json)
    context.out << Json{{"held", held}}.dump() << std::endl;
  else if (held == 0)
    context.out << "no deletions are held" << std::endl;
  else
    context.out << countText(held, "deletion") << " held, since so many at once may be an accident; "
                << kAnswers << std::endl;
  return kExitSuccess;
}

// The daemon's answer comes before it has done it. nullopt: not in time, and it goes on.
std::optional<NSError> waitUntilNoneIsHeld(CommandContext &context, DaemonClient &daemon) {
  for (const auto until = Clock::now() + context.timeout; Clock::now() < until;) {
    const auto status = daemon.transferStatus();
    if (status.error || status.value.heldDeletions == 0) return status.error;
    if (context.waitForStop(50ms)) return std::nullopt;
  }
  return std::nullopt;
}

}  // namespace

int runDeletions(CommandContext &context, DeletionsAnswer answer, bool json) {
  DaemonClient daemon(context.daemon, context.timeout);
  const auto before = daemon.transferStatus();
  if (before.error) return reportError(context, "the held deletions", before.error);
  const std::uint64_t held = before.value.heldDeletions;
  if (answer == DeletionsAnswer::none || held == 0) return show(context, held, json);
  const bool carriesOut = answer == DeletionsAnswer::carryOut;
  if (const NSError error = daemon.confirmDeletions(carriesOut))
    return reportError(context, "the held deletions", error);
  const auto end = waitUntilNoneIsHeld(context, daemon);
  if (end && *end) return reportError(context, "the held deletions", *end);
  if (json) {
    const Json object{
        {"answered", held}, {"answer", carriesOut ? "carry-out" : "restore"}, {"done", end.has_value()}};
    context.out << object.dump() << std::endl;
  } else {
    context.out << countText(held, "deletion")
                << (carriesOut ? " carried out in the cloud"
                               : " taken back: what was deleted comes back, "
                                 "its contents in the cloud alone")
                << std::endl;
  }
  if (end) return kExitSuccess;
  context.err << "droxa: it isn't done yet; keld goes on, `droxa deletions` shows how many are left"
              << std::endl;
  return EX_TEMPFAIL;
}

}  // namespace droxa
