#pragma once

#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>

#include "platform/fileprovider/NSFileProviderExtension.h"
#include "platform/foundation/NSProgress.h"
#include "platform/foundation/ThreadSafety.h"
#include "tests/extension/ScriptedEnumerator.h"
#include "tests/support/CallLog.h"

namespace droxa {

// A principal that answers with what the test put there.
class ScriptedPrincipal final : public NSFileProviderExtension {
 public:
  NSURL URLForItemWithPersistentIdentifier(const std::string &identifier) override {
    const auto found = urls.find(identifier);
    if (found != urls.end()) return found->second;
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

  NSFileProviderServiceSources supportedServiceSourcesForItemIdentifier(const std::string &identifier,
                                                                        NSError *error) override {
    log.add("services " + identifier);
    *error = failure;
    return sources;
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

  // Kept for the test to answer, with the progress under which they were asked for.
  void importDocumentAtURL(const NSURL &asked, const std::string &parent,
                           NSFileProviderItemCompletion completion) override {
    keep("import " + asked.path() + " to " + parent, std::move(completion));
  }
  void createDirectoryWithName(const std::string &name, const std::string &parent,
                               NSFileProviderItemCompletion completion) override {
    keep("create " + name + " in " + parent, std::move(completion));
  }
  void renameItemWithIdentifier(const std::string &identifier, const std::string &name,
                                NSFileProviderItemCompletion completion) override {
    keep("rename " + identifier + " to " + name, std::move(completion));
  }
  void reparentItemWithIdentifier(const std::string &identifier, const std::string &parent,
                                  const std::optional<std::string> &newName,
                                  NSFileProviderItemCompletion completion) override {
    keep("reparent " + identifier + " to " + parent + " as " + newName.value_or("nil"),
         std::move(completion));
  }
  void trashItemWithIdentifier(const std::string &identifier,
                               NSFileProviderItemCompletion completion) override {
    keep("trash " + identifier, std::move(completion));
  }
  void untrashItemWithIdentifier(const std::string &identifier, const std::optional<std::string> &parent,
                                 NSFileProviderItemCompletion completion) override {
    keep("untrash " + identifier + " to " + parent.value_or("nil"), std::move(completion));
  }
  void deleteItemWithIdentifier(const std::string &identifier,
                                NSFileProviderErrorCompletion completion) override {
    keep("delete " + identifier, [completion](const auto &, const NSError &error) { completion(error); });
  }
  void setLastUsedDate(const NSDate &date, const std::string &identifier,
                       NSFileProviderItemCompletion completion) override {
    keep("used " + date.description() + " " + identifier, std::move(completion));
  }
  void setTagData(const NSData &tagData, const std::string &identifier,
                  NSFileProviderItemCompletion completion) override {
    keep("tags " + std::to_string(tagData.length()) + " " + identifier, std::move(completion));
  }
  void setFavoriteRank(const std::optional<std::uint64_t> &rank, const std::string &identifier,
                       NSFileProviderItemCompletion completion) override {
    keep("rank " + (rank ? std::to_string(*rank) : "nil") + " " + identifier, std::move(completion));
  }

  // Kept for the test to answer.
  std::shared_ptr<NSProgress> fetchThumbnailsForItemIdentifiers(
      const std::vector<std::string> &identifiers, CGSize, NSFileProviderThumbnailHandler handler,
      NSFileProviderErrorCompletion completion) override {
    std::string text;
    for (const std::string &identifier : identifiers) text += " " + identifier;
    const Lock lock(mutex);
    thumbnailHandler = std::move(handler);
    thumbnailCompletion = std::move(completion);
    log.add("thumbnails" + text);
    return thumbnailProgress;
  }
  NSFileProviderThumbnailHandler takeThumbnailHandler() {
    const Lock lock(mutex);
    return std::exchange(thumbnailHandler, nullptr);
  }
  NSFileProviderErrorCompletion takeThumbnailCompletion() {
    const Lock lock(mutex);
    return std::exchange(thumbnailCompletion, nullptr);
  }
  void _defaultApplicationContainerForBundleIdentifier(const std::optional<std::string> &bundleIdentifier,
                                                       NSFileProviderItemCompletion completion) override {
    keep("default container of " + bundleIdentifier.value_or("nil"), std::move(completion));
  }

  struct Asked {
    NSFileProviderItemCompletion completion;
    std::shared_ptr<NSProgress> progress;
  };
  // The oldest action that nobody has taken.
  Asked takeAction() {
    const Lock lock(mutex);
    Asked taken = std::move(actions.front());
    actions.pop_front();
    return taken;
  }
  void keep(const std::string &what, NSFileProviderItemCompletion completion) {
    log.add(what);
    const Lock lock(mutex);
    actions.push_back({std::move(completion), NSProgress::currentProgress()});
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
  std::deque<Asked> actions GUARDED_BY(mutex);
  NSFileProviderThumbnailHandler thumbnailHandler GUARDED_BY(mutex);
  NSFileProviderErrorCompletion thumbnailCompletion GUARDED_BY(mutex);
  const std::shared_ptr<NSProgress> thumbnailProgress = std::make_shared<NSProgress>();
  std::map<std::string, NSURL> urls;  // by identifier; besides "d1", which is at `url`
  const NSURL url = NSURL::fileURLWithPath("/replica/a");
  std::shared_ptr<const NSFileProviderItem> item;
  std::shared_ptr<NSFileProviderEnumerator> enumerator;
  NSFileProviderServiceSources sources;
  NSError failure;
  std::function<void(const std::string &identifier)> hook;
};

}  // namespace droxa
