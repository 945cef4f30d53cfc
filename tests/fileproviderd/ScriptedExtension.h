#pragma once

#include <algorithm>
#include <atomic>
#include <condition_variable>
#include <deque>
#include <map>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "fileproviderd/ExtensionConnecting.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa::testing {

// Values that come from one thread and are waited for on another, at most ten seconds.
template <class Value>
class Arrivals {
 public:
  void put(Value value) {
    Lock held(lock_);
    values_.push_back(std::move(value));
    arrived_.notify_all();
  }
  // The next one; a default-constructed value when none comes.
  Value take() {
    const auto until = std::chrono::steady_clock::now() + std::chrono::seconds(10);
    Lock held(lock_);
    while (values_.empty())
      if (arrived_.wait_until(held, until) == std::cv_status::timeout) return {};
    Value value = std::move(values_.front());
    values_.pop_front();
    return value;
  }
  std::size_t size() const {
    Lock held(lock_);
    return values_.size();
  }

 private:
  mutable Mutex lock_;
  std::condition_variable_any arrived_;
  std::deque<Value> values_ GUARDED_BY(lock_);
};

// A request to an enumerator, answered by the test.
struct EnumeratorCall {
  std::string what;  // "anchor", "items PAGE", "changes ANCHOR", "invalidate"; "" when none came
  NSFileProviderAnchorCompletion anchor;
  NSFileProviderPageCompletion page;
  NSFileProviderChangesCompletion changes;
};

class ScriptedEnumerator final : public NSFileProviderRemoteEnumerator {
 public:
  void enumerateItems(const NSData &page, NSFileProviderPageCompletion completion) override;
  void enumerateChanges(const NSData &anchor, NSFileProviderChangesCompletion completion) override;
  void currentSyncAnchor(NSFileProviderAnchorCompletion completion) override;
  void invalidate() override {}

  // Waits for the next request, which must be `what`.
  EnumeratorCall expect(const std::string &what);
  void answerAnchor(const std::string &anchor);
  void answerPage(const std::string &page, const NSFileProviderItems &items, const std::string &next = {});
  void answerChanges(const std::string &anchor, const NSFileProviderItems &updated,
                     const std::vector<std::string> &deleted, const std::string &next,
                     bool moreComing = false);
  void failChanges(const std::string &anchor, const NSError &error);
  void failPage(const std::string &page, const NSError &error);
  // Anchor "A", one page with `items`, and no changes after it.
  void answerFirstListing(const NSFileProviderItems &items);

  Arrivals<EnumeratorCall> calls;
};

// A providing that the test ends: with an outcome, or by the end of its extension. Thread contract: any
// thread.
class ScriptedProviding final : public FPDProviding,
                                public NSXPCProxyCreating<FPDProviding>,
                                public std::enable_shared_from_this<ScriptedProviding> {
 public:
  void waitWithReply(NSFileProviderErrorCompletion completion) override {
    const Lock held(lock_);
    reply_ = std::move(completion);
  }
  // One byte more each time, until all that it has are here.
  void getProgress(FPDProgressCompletion completion) override {
    const int asked = ++progressQuestions;
    completion(std::min(asked, mostProgress.load()), mostProgress.load());
  }
  void cancel() override { ++cancels; }
  std::shared_ptr<FPDProviding> remoteObjectProxyWithErrorHandler(NSXPCErrorHandler handler) override {
    const Lock held(lock_);
    handler_ = std::move(handler);
    return shared_from_this();
  }
  void end(const NSError &error) {
    NSFileProviderErrorCompletion reply;
    NSXPCErrorHandler dropped;
    {
      const Lock held(lock_);
      reply.swap(reply_);
      dropped.swap(handler_);
    }
    reply(error);
  }
  // Forgets who waits, who may hold what holds this.
  void drop() {
    NSFileProviderErrorCompletion reply;
    NSXPCErrorHandler handler;
    const Lock held(lock_);
    reply.swap(reply_);
    handler.swap(handler_);
  }
  void cutOff(const NSError &error) {
    NSXPCErrorHandler handler;
    NSFileProviderErrorCompletion dropped;
    {
      const Lock held(lock_);
      handler.swap(handler_);
      dropped.swap(reply_);
    }
    handler(error);
  }
  std::atomic<int> progressQuestions{0};
  std::atomic<int> mostProgress{0};
  std::atomic<int> cancels{0};

 private:
  Mutex lock_;
  NSFileProviderErrorCompletion reply_ GUARDED_BY(lock_);
  NSXPCErrorHandler handler_ GUARDED_BY(lock_);
};

// An action that the test ends: with an outcome, or by the end of its extension. Thread contract: any thread.
class ScriptedAction final : public FPDAction,
                             public NSXPCProxyCreating<FPDAction>,
                             public std::enable_shared_from_this<ScriptedAction> {
 public:
  void waitWithReply(NSFileProviderItemCompletion completion) override {
    ++waits;
    const Lock held(lock_);
    reply_ = std::move(completion);
    waitHandler_ = handler_;
  }
  void getProgress(FPDProgressCompletion completion) override { completion(3, 7); }
  void cancel() override { ++cancels; }
  std::shared_ptr<FPDAction> remoteObjectProxyWithErrorHandler(NSXPCErrorHandler handler) override {
    const Lock held(lock_);
    handler_ = std::move(handler);
    return shared_from_this();
  }
  void end(const std::shared_ptr<const NSFileProviderItem> &item, const NSError &error) {
    NSFileProviderItemCompletion reply;
    NSXPCErrorHandler dropped, last;
    {
      const Lock held(lock_);
      reply.swap(reply_);
      dropped.swap(waitHandler_);
      last.swap(handler_);
    }
    reply(item, error);
  }
  void cutOff(const NSError &error) {
    NSFileProviderItemCompletion dropped;
    NSXPCErrorHandler handler, last;
    {
      const Lock held(lock_);
      dropped.swap(reply_);
      handler.swap(waitHandler_);
      last.swap(handler_);
    }
    handler(error);
  }
  std::atomic<int> waits{0};
  std::atomic<int> cancels{0};

 private:
  Mutex lock_;
  NSFileProviderItemCompletion reply_ GUARDED_BY(lock_);
  NSXPCErrorHandler handler_ GUARDED_BY(lock_);      // of the proxy made last
  NSXPCErrorHandler waitHandler_ GUARDED_BY(lock_);  // of the wait under way
};

// An extension whose items and URLs the test sets, and whose enumerators it answers itself.
class ScriptedExtension final : public NSFileProviderExtensionProtocol {
 public:
  void itemForIdentifier(const std::string &identifier, NSFileProviderItemCompletion completion) override;
  void URLForItemIdentifier(const std::string &identifier, NSFileProviderURLCompletion completion) override;
  void identifierForItemAtURL(const NSURL &url, NSFileProviderIdentifierCompletion completion) override;
  void enumeratorForContainer(const std::string &identifier,
                              NSFileProviderEnumeratorCompletion completion) override;
  void startProvidingItemAtURL(const NSURL &url, std::uint64_t readingOptions,
                               FPDProvidingCompletion completion) override;
  void stopProvidingItemAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) override;
  void itemChangedAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) override;
  void providePlaceholderAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) override;
  void movingItemAtURL(const NSURL &url, const NSURL &destination,
                       NSFileProviderMovingCompletion completion) override;
  void performAction(const FPDActionRequest &request, FPDActionCompletion completion) override;
  // Gives what `services` has for "NAME IDENTIFIER", and its failure otherwise.
  void listenerEndpointForServiceName(const std::string &name, const std::string &itemIdentifier,
                                      FPDServiceCompletion completion) override;
  // With `thumbnails`, or `failure`.
  void fetchThumbnailsForItemIdentifiers(const std::vector<std::string> &identifiers, CGSize size,
                                         FPDThumbnailsCompletion completion) override;
  // With the item `defaultContainer`, or `failure`.
  void defaultContainerForBundleIdentifier(const std::optional<std::string> &bundleIdentifier,
                                           NSFileProviderItemCompletion completion) override;

  // An item at a path of the disk.
  void add(const std::string &identifier, const std::string &path, const NSFileProviderItemFields &fields);

  std::map<std::string, NSFileProviderItemFields> items;
  std::map<std::string, std::string> paths;        // by identifier
  std::map<std::string, std::string> identifiers;  // by path
  std::map<std::string, std::shared_ptr<FPDService>> services;
  std::shared_ptr<FPDThumbnails> thumbnails;
  std::optional<NSFileProviderItemFields> defaultContainer;
  NSError failure;  // of items and enumerators, when set
  Arrivals<std::string> asked;
  Arrivals<std::shared_ptr<ScriptedEnumerator>> enumerators;  // handed out, in order
  Arrivals<std::string> opened;
  std::vector<std::shared_ptr<ScriptedProviding>> providings;  // handed out, in order
  std::vector<std::shared_ptr<ScriptedAction>> actions;        // handed out, in order
  std::vector<FPDActionRequest> requests;                      // of actions
  std::deque<NSError> openFailures;                            // answers of the next enumerator requests
};

// Always gives the extension, unless the next calls are to fail in transport.
class ScriptedConnecting final : public ExtensionConnecting {
 public:
  explicit ScriptedConnecting(std::shared_ptr<NSFileProviderExtensionProtocol> extension)
      : extension_(std::move(extension)) {}
  std::shared_ptr<NSFileProviderExtensionProtocol> extension(NSXPCErrorHandler handler,
                                                             NSError *error) override;
  void noteAnswer() override { ++answers; }
  std::string describeEnd() override { return "exit status 1"; }

  int transportFailures = 0;  // so many calls end in their error handler
  NSError startFailure;
  std::atomic<int> answers{0};
  std::atomic<int> asked{0};

 private:
  const std::shared_ptr<NSFileProviderExtensionProtocol> extension_;
};

class RecordingObserver final : public FPDWatchObserver {
 public:
  void receiveChanges(const std::vector<FPDChange> &changes, std::function<void()> reply) override;
  // The next change as "added a.txt", "renamed a.txt -> b.txt", "removed a.txt", "relisted".
  std::string next();

  Arrivals<std::shared_ptr<FPDChange>> changes;
  Arrivals<std::function<void()>> replies;  // kept when the test answers itself
  bool answersItself = false;
};

NSError connectionInterrupted();
std::string changeText(const FPDChange &change);
// A document whose identifier is "d" and `number`.
std::shared_ptr<const NSFileProviderItem> document(int number, const std::string &name,
                                                   std::uint64_t rank = 1, const std::string &parent = "i1");

}  // namespace droxa::testing
