#include "tests/support/RecordingHostLink.h"

#include <utility>

#include "platform/dispatch/dispatch.h"
#include "tessaly/QVFileProviderManager.h"
#include "tests/support/Eventually.h"

namespace droxa {

std::shared_ptr<RecordingHostLink> RecordingHostLink::install() {
  const std::shared_ptr<RecordingHostLink> link(new RecordingHostLink);
  qv_sharedProviderManager().setHostLink(link);
  // The manager holds the link itself; what is handed out takes it away again.
  return {link.get(), [link](RecordingHostLink *) {
            link->releaseCompletions();
            qv_sharedProviderManager().setHostLink(nullptr);
          }};
}

RecordingHostLink::~RecordingHostLink() = default;

void RecordingHostLink::signalEnumeratorForContainerItemIdentifier(
    const std::string &identifier, NSFileProviderSignalCompletion completion) {
  std::function<void(const std::string &)> hook;
  bool holding;
  NSError error;
  {
    const std::lock_guard<std::mutex> lock(mutex_);
    signals_.push_back(identifier);
    hook = hook_;
    error = error_;
    holding = holding_;
    if (holding) held_.push_back({completion, error});
    condition_.notify_all();
  }
  if (hook) hook(identifier);
  if (!holding) complete({std::move(completion), std::move(error)});
}

void RecordingHostLink::complete(Held held) {
  dispatch_async_global([held = std::move(held)] { held.completion(held.error); });
}

void RecordingHostLink::whenSignalled(std::function<void(const std::string &identifier)> hook) {
  const std::lock_guard<std::mutex> lock(mutex_);
  hook_ = std::move(hook);
}

void RecordingHostLink::answerWith(NSError error) {
  const std::lock_guard<std::mutex> lock(mutex_);
  error_ = std::move(error);
}

void RecordingHostLink::holdCompletions() {
  const std::lock_guard<std::mutex> lock(mutex_);
  holding_ = true;
}

void RecordingHostLink::releaseCompletions() {
  std::vector<Held> held;
  {
    const std::lock_guard<std::mutex> lock(mutex_);
    holding_ = false;
    held.swap(held_);
  }
  for (Held &one : held) complete(std::move(one));
}

std::vector<std::string> RecordingHostLink::signals() const {
  const std::lock_guard<std::mutex> lock(mutex_);
  return signals_;
}

bool RecordingHostLink::waitForSignals(std::size_t count) const {
  std::unique_lock<std::mutex> lock(mutex_);
  return condition_.wait_for(lock, kTestDeadline, [&] { return signals_.size() >= count; });
}

}  // namespace droxa
