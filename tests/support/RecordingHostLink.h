#pragma once

#include <condition_variable>
#include <cstddef>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "platform/fileprovider/NSFileProviderManager.h"

namespace droxa {

// Stands in for the framework's daemon: keeps the identifier of every signal, in order, and completes each
// once, on a thread of the pool, without an error unless told otherwise.
//
// Thread contract: any thread.
class RecordingHostLink final : public NSFileProviderHostLink {
 public:
  // A link to which the process's manager signals until the returned object is released. Completions that are
  // held by then are answered.
  static std::shared_ptr<RecordingHostLink> install();
  ~RecordingHostLink() override;

  void signalEnumeratorForContainerItemIdentifier(const std::string &identifier,
                                                  NSFileProviderSignalCompletion completion) override;

  // Runs inside each later signal, on the signaller's thread, after it has been recorded.
  void whenSignalled(std::function<void(const std::string &identifier)> hook);
  void answerWith(NSError error);  // every later signal; nil: success again
  void holdCompletions();
  void releaseCompletions();  // and complete at once again

  std::vector<std::string> signals() const;
  std::size_t signalCount() const { return signals().size(); }
  // Waits until there have been as many. False when the deadline passed.
  bool waitForSignals(std::size_t count) const;

 private:
  RecordingHostLink() = default;
  struct Held {
    NSFileProviderSignalCompletion completion;
    NSError error;
  };
  static void complete(Held held);

  mutable std::mutex mutex_;
  mutable std::condition_variable condition_;
  std::vector<std::string> signals_;
  std::vector<Held> held_;
  std::function<void(const std::string &)> hook_;
  NSError error_;
  bool holding_ = false;
};

}  // namespace droxa
