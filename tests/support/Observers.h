#pragma once

#include <condition_variable>
#include <functional>
#include <mutex>
#include <string>
#include <vector>

#include "platform/fileprovider/NSFileProviderEnumerating.h"

namespace droxa {

// What one call told an observer. Only what belongs to its kind is set.
struct ObserverCall {
  enum class Kind { didEnumerateItems, didUpdateItems, didDeleteItems, finished, failed };
  Kind kind;
  NSFileProviderItems items;
  std::vector<std::string> identifiers;
  NSData token;  // the next page, or the new anchor
  bool moreComing = false;
  NSError error;
};

// What both recording observers share: every call in its order. A call after the answer fails the test, and
// so does an observer that goes without an answer.
//
// Thread contract: calls come on any thread, one at a time
// (two at once fail the test); questions on any thread.
class ObserverRecord {
 public:
  explicit ObserverRecord(std::string name);
  ~ObserverRecord();
  ObserverRecord(const ObserverRecord &) = delete;
  ObserverRecord &operator=(const ObserverRecord &) = delete;

  // Runs inside each later call, after it has been recorded, on the caller's thread. Set it before the
  // request.
  void whenCalled(std::function<void(const ObserverCall &call)> hook) { hook_ = std::move(hook); }
  // For the tests in which no answer may come.
  void expectNoAnswer();

  bool answered() const;
  // Fails the test when the answer doesn't come before the deadline.
  void waitForAnswer() const;

  // These wait for the answer.
  std::vector<ObserverCall> calls() const;
  // One word a call, in order: "didEnumerateItems(3)", "didUpdateItems(0)", "didDeleteItems(d1, d2)",
  // "finished", "failed".
  std::vector<std::string> story() const;
  NSFileProviderItems items() const;                 // of all calls
  std::vector<std::string> itemIdentifiers() const;  // of items(), sorted
  std::vector<std::string> deletedIdentifiers() const;
  NSData token() const;
  bool moreComing() const;
  NSError error() const;  // nil when it was answered without one

 protected:
  void record(ObserverCall call);

 private:
  std::vector<ObserverCall> snapshot() const;
  ObserverCall answer() const;

  const std::string name_;
  std::function<void(const ObserverCall &)> hook_;
  mutable std::mutex mutex_;
  mutable std::condition_variable condition_;
  std::vector<ObserverCall> calls_;
  bool inCall_ = false;
  bool answered_ = false;
  bool expectsAnswer_ = true;
};

// A recording observer of one page.
class RecordingEnumerationObserver final : public NSFileProviderEnumerationObserver, public ObserverRecord {
 public:
  RecordingEnumerationObserver() : ObserverRecord("enumeration observer") {}
  void didEnumerateItems(const NSFileProviderItems &items) override;
  void finishEnumeratingUpToPage(const NSData &nextPage) override;
  void finishEnumeratingWithError(const NSError &error) override;
};

// A recording observer of one change request.
class RecordingChangeObserver final : public NSFileProviderChangeObserver, public ObserverRecord {
 public:
  RecordingChangeObserver() : ObserverRecord("change observer") {}
  void didUpdateItems(const NSFileProviderItems &items) override;
  void didDeleteItemsWithIdentifiers(const std::vector<std::string> &identifiers) override;
  void finishEnumeratingChangesUpToSyncAnchor(const NSData &anchor, bool moreComing) override;
  void finishEnumeratingWithError(const NSError &error) override;
};

// One whole request, waited for.
std::shared_ptr<RecordingEnumerationObserver> listPage(NSFileProviderEnumerator &enumerator,
                                                       const NSData &page);
std::shared_ptr<RecordingChangeObserver> changesSince(NSFileProviderEnumerator &enumerator,
                                                      const NSData &anchor);
// The enumerator's anchor; a completion that isn't called before the deadline fails the test.
NSData currentAnchor(NSFileProviderEnumerator &enumerator);

}  // namespace droxa
