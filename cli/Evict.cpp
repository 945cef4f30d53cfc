#include <nlohmann/json.hpp>

#include "cli/Commands.h"
#include "cli/ContentsText.h"
#include "cli/DaemonClient.h"
#include "cli/ExitStatus.h"
#include "cli/Text.h"

namespace droxa {

namespace {

using namespace std::chrono_literals;
using Json = nlohmann::ordered_json;

struct Eviction {
  QVContentsResult result;
  NSError error;
  bool wasStopped = false;
};

// All URLs of the argument, one after the other, as long as it takes.
Eviction evict(CommandContext &context, const ContentsArgument &contents) {
  DaemonClient daemon(context.daemon, context.timeout);
  Eviction sum;
  for (const NSURL &url : contents.urls) {
    const auto slot = daemon.evict(url);
    auto answer = slot->waitFor(100ms);
    for (; !answer; answer = slot->waitFor(100ms)) {
      if (!context.waitForStop(0ms)) continue;
      sum.wasStopped = true;
      return sum;
    }
    const QVContentsResult &part = answer->value;
    sum.result.documents += part.documents;
    sum.result.bytes += part.bytes;
    sum.result.refused += part.refused;
    sum.result.failures.insert(sum.result.failures.end(), part.failures.begin(), part.failures.end());
    if (!sum.error) sum.error = answer->error;
  }
  return sum;
}

void printJSON(CommandContext &context, const ContentsArgument &contents, const Eviction &eviction) {
  Json json{{"path", contents.argument},
            {"evicted", eviction.result.documents},
            {"bytes", eviction.result.bytes},
            {"refused", eviction.result.refused},
            {"error", eviction.error ? Json(explanationOfError(eviction.error)) : Json(nullptr)}};
  json["refusals"] = Json::array();
  for (const QVContentsFailure &failure : eviction.result.failures)
    json["refusals"].push_back({{"file", failure.path},
                                {"code", failure.error.code()},
                                {"reason", explanationOfError(failure.error)}});
  context.out << json.dump(-1, ' ', false, Json::error_handler_t::replace) << std::endl;
}

void printRefusals(CommandContext &context, const QVContentsResult &result) {
  for (const QVContentsFailure &failure : result.failures)
    (void)reportError(context, failure.path, failure.error);
  if (result.refused > result.failures.size())
    context.err << "droxa: and " << result.refused - result.failures.size() << " more" << std::endl;
}

int evictItem(CommandContext &context, const ContentsArgument &contents, bool json) {
  const Eviction eviction = evict(context, contents);
  if (eviction.wasStopped) {
    context.err << "droxa: " << escapedText(contents.argument) << ": keld goes on with it by itself"
                << std::endl;
    return kExitInterrupted;
  }
  const QVContentsResult &result = eviction.result;
  if (json)
    printJSON(context, contents, eviction);
  else if (result.documents > 0)
    context.out << escapedText(contents.argument) << ": let go of " << countText(result.documents, "document")
                << ", " << bytesText(result.bytes) << std::endl;
  else if (result.refused == 0 && !eviction.error)
    context.out << escapedText(contents.argument) << ": nothing to let go of" << std::endl;
  if (eviction.error) return reportError(context, contents.argument, eviction.error);
  if (result.refused == 0) return kExitSuccess;
  printRefusals(context, result);
  return kExitFailure;
}

}  // namespace

int runEvict(CommandContext &context, const std::vector<std::string> &arguments, bool json) {
  return forEachContents(context, arguments, [&](const ContentsArgument &contents) {
    return evictItem(context, contents, json);
  });
}

}  // namespace droxa
