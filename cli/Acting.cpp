#include "cli/Acting.h"

#include <algorithm>
#include <chrono>

#include "cli/ContentsText.h"
#include "cli/ExitStatus.h"
#include "cli/ItemText.h"
#include "cli/ProgressLine.h"
#include "cli/Text.h"
#include "cli/Waiting.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/xpc/NSXPCProxyCreating.h"

namespace droxa {

namespace {

using namespace std::chrono_literals;
using Clock = std::chrono::steady_clock;
using Kind = FPDActionRequest::Kind;

constexpr auto kLook = 50ms;
constexpr auto kBetweenQuestions = 200ms;
constexpr auto kQuestionPatience = 1s;
constexpr auto kCancelPatience = 10s;

struct Progress {
  std::int64_t completed = 0;
  std::int64_t total = -1;
};

// One action under way.
class Action {
 public:
  Action(CommandContext &context, const std::string &asked, std::shared_ptr<FPDAction> action)
      : context_(context), line_(context, asked), action_(std::move(action)) {
    NSXPCProxyWithErrorHandler<FPDAction>(action_, [slot = ended_](const NSError &error) {
      slot->put({nullptr, error});
    })->waitWithReply([slot = ended_](const ControlClient::Item &item, const NSError &error) {
      slot->put({item, error});
    });
  }

  // One that isn't answered in time is cancelled with its release.
  ActionEnd wait(ActionPatience patience) {
    if (patience == ActionPatience::timeout) {
      const auto end = ended_->wait(context_.timeout);
      return {end.value, end.error, false};
    }
    for (;;) {
      if (const auto end = ended_->waitFor(kLook)) {
        line_.clear();
        return {end->value, end->error, false};
      }
      if (context_.waitForStop(0ms)) return cancel();
      if (patience == ActionPatience::showingProgress) showProgress();
    }
  }

 private:
  // What the action has done by then, only its end tells.
  ActionEnd cancel() {
    line_.clear();
    NSXPCProxyWithErrorHandler<FPDAction>(action_, [](const NSError &) {})->cancel();
    const auto end = ended_->waitFor(kCancelPatience);
    if (end) return {end->value, end->error, true};
    return {nullptr, NSError(NSCocoaErrorDomain, NSXPCConnectionReplyInvalid), true};
  }

  void showProgress() {
    if (Clock::now() < nextQuestion_) return;
    const auto slot = std::make_shared<AnswerSlot<Progress>>();
    NSXPCProxyWithErrorHandler<FPDAction>(action_, [slot](const NSError &error) {
      slot->put({{}, error});
    })->getProgress([slot](std::int64_t completed, std::int64_t total) {
      slot->put({{completed, total}, NSError()});
    });
    const Progress told = slot->wait(kQuestionPatience).value;
    nextQuestion_ = Clock::now() + kBetweenQuestions;
    if (told.total <= 0) return;
    const auto completed =
        static_cast<std::uint64_t>(std::clamp<std::int64_t>(told.completed, 0, told.total));
    const auto total = static_cast<std::uint64_t>(told.total);
    line_.show(static_cast<double>(completed) / static_cast<double>(total),
               bytesText(completed) + " of " + bytesText(total) + " (" + shareText(completed, total) + ")");
  }

  CommandContext &context_;
  ProgressLine line_;
  const std::shared_ptr<FPDAction> action_;
  const std::shared_ptr<AnswerSlot<ControlClient::Item>> ended_ =
      std::make_shared<AnswerSlot<ControlClient::Item>>();
  Clock::time_point nextQuestion_ = Clock::now() + kBetweenQuestions;
};

int reportStopped(CommandContext &context, const std::string &asked, const ActionEnd &end) {
  context.err << "droxa: " << escapedText(asked) << ": ";
  if (end.error.is(NSCocoaErrorDomain, NSXPCConnectionReplyInvalid)) {
    context.err << "cancelled, but not ended yet; `droxa ls` shows what became of it" << std::endl;
  } else if (end.error) {
    context.err << "cancelled, nothing was changed" << std::endl;
  } else {
    context.err << "it was done before it could be cancelled" << std::endl;
  }
  return kExitInterrupted;
}

}  // namespace

ActionEnd act(CommandContext &context, const std::string &asked, const FPDActionRequest &request,
              ActionPatience patience) {
  const auto begun = context.host->performAction(request);
  if (!begun.value) return {nullptr, begun.error, false};
  ActionEnd end = Action(context, asked, begun.value).wait(patience);
  // Whatever it was that came back with neither, it was known a moment ago.
  const bool mayHaveNeither = request.kind == Kind::importDocument || request.kind == Kind::deleteItem;
  if (!end.item && !end.error && !mayHaveNeither) {
    end.error = fileProviderErrorForNonExistentItemWithIdentifier(request.identifier);
  }
  return end;
}

int reportAction(CommandContext &context, const std::string &asked, const FPDActionRequest &request,
                 const ActionEnd &end, bool json) {
  if (end.item) {
    context.out << (json ? itemJSON(end.item->fields()) : longLine(end.item->fields())) << std::endl;
  } else if (!end.error && request.kind == Kind::importDocument) {
    context.err << "droxa: " << escapedText(asked)
                << ": it was imported, but keld can't tell what it is yet; `droxa ls` will" << std::endl;
  }
  if (end.wasStopped) return reportStopped(context, asked, end);
  return end.error ? reportError(context, asked, end.error) : kExitSuccess;
}

int actAndReport(CommandContext &context, const std::string &asked, const FPDActionRequest &request,
                 bool json) {
  return reportAction(context, asked, request, act(context, asked, request), json);
}

}  // namespace droxa
