#include "extension/HostedProviding.h"

#include <optional>
#include <utility>
#include <vector>

#include "platform/dispatch/dispatch.h"
#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVLog.h"

namespace droxa {

// How it ended, once it has, and who waits for that.
struct HostedProviding::Outcome {
  mutable Mutex mutex;
  std::optional<NSError> error GUARDED_BY(mutex);
  std::vector<NSFileProviderErrorCompletion> waiting GUARDED_BY(mutex);

  bool hasEnded() const {
    const Lock lock(mutex);
    return error.has_value();
  }
  void end(const NSError &outcome) {
    std::vector<NSFileProviderErrorCompletion> answered;
    {
      const Lock lock(mutex);
      if (error) {
        os_log_fault(qvc_default_log(), "[CRIT] a providing was completed again: %@", outcome);
        return;
      }
      error = outcome;
      answered.swap(waiting);
    }
    for (const NSFileProviderErrorCompletion &completion : answered) completion(outcome);
  }
};

std::shared_ptr<HostedProviding> HostedProviding::start(std::shared_ptr<NSFileProviderExtension> principal,
                                                        const NSURL &url, std::uint64_t readingOptions) {
  auto providing = std::make_shared<HostedProviding>(Passkey{}, principal, url);
  principal->startProvidingItemAtURL(
      url, readingOptions, [outcome = providing->outcome_](const NSError &error) { outcome->end(error); });
  return providing;
}

HostedProviding::HostedProviding(Passkey, std::shared_ptr<NSFileProviderExtension> principal, NSURL url)
    : principal_(std::move(principal)), url_(std::move(url)), outcome_(std::make_shared<Outcome>()) {}

HostedProviding::~HostedProviding() {
  cancel();
}

void HostedProviding::waitWithReply(NSFileProviderErrorCompletion completion) {
  NSError error;
  {
    const Lock lock(outcome_->mutex);
    if (!outcome_->error) {
      outcome_->waiting.push_back(std::move(completion));
      return;
    }
    error = *outcome_->error;
  }
  completion(error);
}

// On a thread of its own: the daemon may not answer, and nobody who cancels waits behind it.
void HostedProviding::getProgress(FPDProgressCompletion completion) {
  dispatch_async_global([principal = principal_, url = url_, completion = std::move(completion)] {
    const auto [completed, total] = principal->progressOfProvidingItemAtURL(url);
    completion(completed, total);
  });
}

void HostedProviding::cancel() {
  if (!outcome_->hasEnded()) principal_->cancelProvidingItemAtURL(url_);
}

}  // namespace droxa
