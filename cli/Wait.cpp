#include <nlohmann/json.hpp>
#include <sysexits.h>

#include "cli/Commands.h"
#include "cli/ContentsArgument.h"
#include "cli/DaemonClient.h"
#include "cli/ExitStatus.h"
#include "cli/Text.h"
#include "tessaly/QVErrors.h"

namespace droxa {

namespace {

using namespace std::chrono_literals;
using Json = nlohmann::ordered_json;
using Clock = std::chrono::steady_clock;

constexpr auto kLook = 100ms;
constexpr auto kBetweenQuestions = 2s;
constexpr auto kQuestionPatience = 1s;

// One thing that is waited for.
struct Awaited {
  std::string name;
  std::shared_ptr<AnswerSlot<bool>> slot;
};

// Says, once for each reason, why it takes longer.
// Thread contract: one thread.
class Hindrance {
 public:
  explicit Hindrance(CommandContext &context) : context_(context) {}

  void tell() {
    if (Clock::now() < nextQuestion_) return;
    nextQuestion_ = Clock::now() + kBetweenQuestions;
    const auto status = DaemonClient(context_.daemon, kQuestionPatience).transferStatus();
    if (status.error || status.value.cloudProblem == told_) return;
    told_ = status.value.cloudProblem;
    if (!told_.empty())
      context_.err << "droxa: waiting: the cloud can't be reached: " << escapedText(told_) << std::endl;
  }

 private:
  CommandContext &context_;
  std::string told_;
  Clock::time_point nextQuestion_ = Clock::now() + kBetweenQuestions;
};

void printEnd(CommandContext &context, const WaitOptions &options, const Awaited &awaited,
              const NSError &error) {
  if (options.json) {
    const Json json{{"path", awaited.name.empty() ? Json(nullptr) : Json(awaited.name)},
                    {"inCloud", !error},
                    {"error", error ? Json(explanationOfError(error)) : Json(nullptr)}};
    context.out << json.dump(-1, ' ', false, Json::error_handler_t::replace) << std::endl;
  } else if (!error) {
    context.out << (awaited.name.empty() ? "everything" : escapedText(awaited.name)) << " is in the cloud"
                << std::endl;
  }
}

// Elsewhere the advice for what isn't sent is to wait; here the daemon's words say what can't be.
int reportUnsent(CommandContext &context, const Awaited &awaited, const NSError &error) {
  const std::string asked = awaited.name.empty() ? "not everything is in the cloud" : awaited.name;
  if (!error.is(QVTessalyErrorDomain, QVErrorUnsentChanges)) return reportError(context, asked, error);
  context.err << "droxa: " << escapedText(asked) << ": " << escapedText(error.localizedDescription())
              << std::endl;
  return kExitFailure;
}

int await(CommandContext &context, const WaitOptions &options, const Awaited &awaited,
          const std::optional<Clock::time_point> &until, Hindrance &hindrance) {
  for (;;) {
    if (const auto answer = awaited.slot->waitFor(kLook)) {
      printEnd(context, options, awaited, answer->error);
      return answer->error ? reportUnsent(context, awaited, answer->error) : kExitSuccess;
    }
    if (context.waitForStop(0ms)) {
      context.err << "droxa: not everything is in the cloud yet; keld goes on sending" << std::endl;
      return kExitInterrupted;
    }
    if (until && Clock::now() >= *until) {
      context.err << "droxa: " << (awaited.name.empty() ? "" : escapedText(awaited.name) + ": ")
                  << "not everything is in the cloud in time; `droxa status` shows what is on its way"
                  << std::endl;
      return EX_TEMPFAIL;
    }
    hindrance.tell();
  }
}

}  // namespace

int runWait(CommandContext &context, const WaitOptions &options) {
  std::optional<Clock::time_point> until;
  if (options.timeout) until = Clock::now() + *options.timeout;
  DaemonClient daemon(context.daemon, context.timeout);
  std::vector<Awaited> all;
  int status = kExitSuccess;
  if (options.arguments.empty()) all.push_back({"", daemon.waitForUpload(NSURL())});
  if (!options.arguments.empty())
    status = forEachContents(context, options.arguments, [&](const ContentsArgument &contents) {
      for (const NSURL &url : contents.urls) all.push_back({contents.argument, daemon.waitForUpload(url)});
      return kExitSuccess;
    });
  Hindrance hindrance(context);
  for (const Awaited &awaited : all) {
    const int one = await(context, options, awaited, until, hindrance);
    if (one == kExitInterrupted) return one;
    if (status == kExitSuccess) status = one;
  }
  return status;
}

}  // namespace droxa
