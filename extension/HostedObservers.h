#pragma once

#include <atomic>
#include <string>
#include <vector>

#include "platform/fileprovider/NSFileProviderEnumerating.h"
#include "platform/fileprovider/NSFileProviderRemote.h"

// The observers that stand for the host in an enumerator's requests: they collect what they are told and give
// it to the request's completion in one answer. The completion is called exactly once whatever the enumerator
// does: a second answer, or anything told after the answer, is a fault and is dropped; an observer that is
// released unanswered is a fault and answers with NSXPCConnectionReplyInvalid.

namespace droxa {

// Lets one answer through. Thread contract: any thread.
class SingleAnswer {
 public:
  // True the first time; a fault, naming what was called, from then on.
  bool claim(const char *what);
  // Faults, naming what was called, when the answer has been given.
  bool isOpen(const char *what) const;
  // True, after a fault that names what was dropped, when nobody has answered.
  bool claimDropped(const char *what);

 private:
  std::atomic<bool> claimed_ = false;
};

// The error of a request that its enumerator dropped.
NSError DroppedObserverError(const std::string &what);

// Collects one page. Thread contract: as NSFileProviderEnumerationObserver says; the completion runs on the
// thread that answers.
class HostedEnumerationObserver final : public NSFileProviderEnumerationObserver {
 public:
  explicit HostedEnumerationObserver(NSFileProviderPageCompletion completion);
  ~HostedEnumerationObserver() override;
  void didEnumerateItems(const NSFileProviderItems &items) override;
  void finishEnumeratingUpToPage(const NSData &nextPage) override;
  void finishEnumeratingWithError(const NSError &error) override;

 private:
  const NSFileProviderPageCompletion completion_;
  SingleAnswer answer_;
  NSFileProviderItems items_;
};

// Collects one batch of changes. Thread contract: as NSFileProviderChangeObserver says; the completion runs
// on the thread that answers.
class HostedChangeObserver final : public NSFileProviderChangeObserver {
 public:
  explicit HostedChangeObserver(NSFileProviderChangesCompletion completion);
  ~HostedChangeObserver() override;
  void didUpdateItems(const NSFileProviderItems &items) override;
  void didDeleteItemsWithIdentifiers(const std::vector<std::string> &identifiers) override;
  void finishEnumeratingChangesUpToSyncAnchor(const NSData &anchor, bool moreComing) override;
  void finishEnumeratingWithError(const NSError &error) override;

 private:
  const NSFileProviderChangesCompletion completion_;
  SingleAnswer answer_;
  NSFileProviderItems updated_;
  std::vector<std::string> deleted_;
};

// The completion to give to an enumerator that is asked for its sync anchor; an unanswered one gives nil.
NSFileProviderSyncAnchorCompletion HostedAnchorCompletion(NSFileProviderAnchorCompletion completion);

}  // namespace droxa
