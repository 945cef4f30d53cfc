#pragma once

#include <deque>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "platform/fileprovider/NSFileProviderExtension.h"
#include "platform/foundation/ThreadSafety.h"
#include "tests/extension/ScriptedEnumerator.h"
#include "tests/support/CallLog.h"

namespace droxa {

// A principal that answers with what the test put there.
class ScriptedPrincipal final : public NSFileProviderExtension {
 public:
  NSURL URLForItemWithPersistentIdentifier(const std::string &identifier) override {
    return identifier == "d1" ? url : NSURL();
  }
  std::optional<std::string> persistentIdentifierForItemAtURL(const NSURL &asked) override {
    return asked == url ? std::optional<std::string>("d1") : std::nullopt;
  }
  std::shared_ptr<const NSFileProviderItem> itemForIdentifier(const std::string &identifier,
                                                              NSError *error) override {
    if (hook) hook(identifier);
    *error = failure;
    return item;
  }
  std::shared_ptr<NSFileProviderEnumerator> enumeratorForContainerItemIdentifier(const std::string &,
                                                                                 NSError *error) override {
    *error = failure;
    return enumerator;
  }

  // Kept for the test to answer.
  void startProvidingItemAtURL(const NSURL &asked, std::uint64_t readingOptions,
                               NSFileProviderErrorCompletion completion) override {
    log.add("start " + asked.path() + ", " + std::to_string(readingOptions));
    const Lock lock(mutex);
    starts.push_back(std::move(completion));
  }
  void startProvidingItemAtURL(const NSURL &asked, NSFileProviderErrorCompletion completion) override {
    startProvidingItemAtURL(asked, 0, std::move(completion));
  }
  void stopProvidingItemAtURL(const NSURL &asked) override { log.add("stop " + asked.path()); }
  void cancelProvidingItemAtURL(const NSURL &asked) override { log.add("cancel " + asked.path()); }
  void itemChangedAtURL(const NSURL &asked) override { log.add("changed " + asked.path()); }
  void providePlaceholderAtURL(const NSURL &asked, NSFileProviderErrorCompletion completion) override {
    log.add("placeholder " + asked.path());
    completion(failure);
  }
  void movingItemAtURL_requiresProvidingWithDestinationURL(
      const NSURL &asked, const NSURL &destination, NSFileProviderMovingCompletion completion) override {
    log.add("move " + asked.path() + " to " + destination.path());
    completion(!failure, failure);
  }
  // Answers the oldest start.
  void endStart(const NSError &error) {
    NSFileProviderErrorCompletion completion;
    {
      const Lock lock(mutex);
      completion = std::move(starts.front());
      starts.pop_front();
    }
    completion(error);
  }

  CallLog log;
  Mutex mutex;
  std::deque<NSFileProviderErrorCompletion> starts GUARDED_BY(mutex);
  const NSURL url = NSURL::fileURLWithPath("/replica/a");
  std::shared_ptr<const NSFileProviderItem> item;
  std::shared_ptr<NSFileProviderEnumerator> enumerator;
  NSError failure;
  std::function<void(const std::string &identifier)> hook;
};

}  // namespace droxa
