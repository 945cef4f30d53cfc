#include "cli/Materialising.h"

#include <chrono>

#include "cli/Waiting.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/fileprovider/NSFileProviderItem.h"
#include "tessaly/QVFileCoordinatorReadingOptions.h"
#include "tessaly/QVFileObjectID.h"

namespace droxa {

namespace {

using namespace std::chrono_literals;
using Clock = std::chrono::steady_clock;

constexpr auto kLook = 50ms;
constexpr auto kCancelPatience = 2s;
constexpr auto kQuestionPatience = 1s;
constexpr std::chrono::nanoseconds kProgressInterval = 200ms;

// One providing under way.
class Wait {
 public:
  Wait(CommandContext &context, const ContentsArgument &contents, const MaterialisingOptions &options,
       const ControlClient::Provided &provided)
      : context_(context), contents_(contents), options_(options), provided_(provided) {
    const auto proxy =
        NSXPCProxyWithErrorHandler<FPDProviding>(provided.providing, [slot = ended_](const NSError &error) {
          slot->put({false, error});
        });
    proxy->waitWithReply([slot = ended_](const NSError &error) { slot->put({!error, error}); });
  }

  Materialised run() {
    for (;;) {
      if (const auto end = ended_->waitFor(kLook)) return {provided_.url, end->error, false};
      if (options_.canBeStopped && context_.waitForStop(0ms)) return cancel();
      tellProgress();
    }
  }

 private:
  // What came before the cancellation did stays.
  Materialised cancel() {
    provided_.providing->cancel();
    const auto end = ended_->waitFor(kCancelPatience);
    return {provided_.url, end ? end->error : NSError(), true};
  }

  // Over a large folder the question is dear, so it is asked the less often.
  void tellProgress() {
    const auto began = Clock::now();
    if (!options_.progress || began < nextQuestion_) return;
    const auto status = contentsStatus(context_, contents_, kQuestionPatience);
    const auto now = Clock::now();
    nextQuestion_ = now + std::max<std::chrono::nanoseconds>(kProgressInterval, 10 * (now - began));
    if (!status.error) options_.progress(status.value);
  }

  CommandContext &context_;
  const ContentsArgument &contents_;
  const MaterialisingOptions &options_;
  const ControlClient::Provided &provided_;
  const std::shared_ptr<AnswerSlot<bool>> ended_ = std::make_shared<AnswerSlot<bool>>();
  Clock::time_point nextQuestion_;
};

// The item's own, and of the root those of the containers that lie beside it.
CallResult<std::vector<std::string>> identifiersOf(CommandContext &context,
                                                   const ContentsArgument &contents) {
  std::vector<std::string> identifiers{contents.identifier};
  for (std::size_t index = 1; index < contents.urls.size(); ++index) {
    const auto item = context.host->itemAtPath(contents.urls[index].path());
    if (!item.value) return {{}, item.error};
    identifiers.push_back(item.value->itemIdentifier());
  }
  return {identifiers, NSError()};
}

}  // namespace

Materialised materialise(CommandContext &context, const ContentsArgument &contents,
                         const MaterialisingOptions &options) {
  const auto identifiers = identifiersOf(context, contents);
  if (identifiers.error) return {NSURL(), identifiers.error, false};
  const std::uint64_t readingOptions = options.isForced ? QVFileCoordinatorReadingForcedDownload : 0;
  Materialised first;
  for (const std::string &identifier : identifiers.value) {
    const auto provided = context.host->startProviding(identifier, readingOptions);
    if (!provided.value.providing) return {NSURL(), provided.error, false};
    const Materialised one = Wait(context, contents, options, provided.value).run();
    if (one.wasStopped) return one;
    if (!first.url) first.url = one.url;
    if (!first.error) first.error = one.error;
  }
  return first;
}

}  // namespace droxa
