#include "extension/HostedObservers.h"

#include <utility>

#include "tessaly/QVLog.h"

namespace droxa {

bool SingleAnswer::claim(const char *what) {
  if (!claimed_.exchange(true)) return true;
  os_log_fault(qvc_default_log(), "[CRIT] Assertion failed: !answered (%s)", what);
  return false;
}

bool SingleAnswer::isOpen(const char *what) const {
  if (!claimed_) return true;
  os_log_fault(qvc_default_log(), "[CRIT] Assertion failed: !answered (%s)", what);
  return false;
}

bool SingleAnswer::claimDropped(const char *what) {
  if (claimed_.exchange(true)) return false;
  os_log_fault(qvc_default_log(), "[CRIT] Assertion failed: answered (%s)", what);
  return true;
}

NSError DroppedObserverError(const std::string &what) {
  return NSError(
      NSCocoaErrorDomain, NSXPCConnectionReplyInvalid,
      NSUserInfo{{NSLocalizedDescriptionKey, "the enumerator dropped " + what + " without an answer"}});
}

HostedEnumerationObserver::HostedEnumerationObserver(NSFileProviderPageCompletion completion)
    : completion_(std::move(completion)) {}

HostedEnumerationObserver::~HostedEnumerationObserver() {
  if (answer_.claimDropped("enumeration observer")) completion_({}, {}, DroppedObserverError("a listing"));
}

void HostedEnumerationObserver::didEnumerateItems(const NSFileProviderItems &items) {
  if (!answer_.isOpen("didEnumerateItems")) return;
  items_.insert(items_.end(), items.begin(), items.end());
}

void HostedEnumerationObserver::finishEnumeratingUpToPage(const NSData &nextPage) {
  if (answer_.claim("finishEnumeratingUpToPage")) completion_(items_, nextPage, {});
}

void HostedEnumerationObserver::finishEnumeratingWithError(const NSError &error) {
  if (answer_.claim("finishEnumeratingWithError")) completion_({}, {}, error);
}

HostedChangeObserver::HostedChangeObserver(NSFileProviderChangesCompletion completion)
    : completion_(std::move(completion)) {}

HostedChangeObserver::~HostedChangeObserver() {
  if (answer_.claimDropped("change observer")) {
    completion_({}, {}, {}, false, DroppedObserverError("a request for changes"));
  }
}

void HostedChangeObserver::didUpdateItems(const NSFileProviderItems &items) {
  if (!answer_.isOpen("didUpdateItems")) return;
  updated_.insert(updated_.end(), items.begin(), items.end());
}

void HostedChangeObserver::didDeleteItemsWithIdentifiers(const std::vector<std::string> &identifiers) {
  if (!answer_.isOpen("didDeleteItemsWithIdentifiers")) return;
  deleted_.insert(deleted_.end(), identifiers.begin(), identifiers.end());
}

void HostedChangeObserver::finishEnumeratingChangesUpToSyncAnchor(const NSData &anchor, bool moreComing) {
  if (answer_.claim("finishEnumeratingChangesUpToSyncAnchor")) {
    completion_(updated_, deleted_, anchor, moreComing, {});
  }
}

void HostedChangeObserver::finishEnumeratingWithError(const NSError &error) {
  if (answer_.claim("finishEnumeratingWithError")) completion_({}, {}, {}, false, error);
}

namespace {

// Gives a sync anchor once, nil when it is released before.
class AnchorAnswer {
 public:
  explicit AnchorAnswer(NSFileProviderAnchorCompletion completion) : completion_(std::move(completion)) {}
  ~AnchorAnswer() {
    if (answer_.claimDropped("sync anchor")) completion_({});
  }
  AnchorAnswer(const AnchorAnswer &) = delete;
  AnchorAnswer &operator=(const AnchorAnswer &) = delete;

  void give(const NSData &anchor) {
    if (answer_.claim("sync anchor")) completion_(anchor);
  }

 private:
  const NSFileProviderAnchorCompletion completion_;
  SingleAnswer answer_;
};

}  // namespace

NSFileProviderSyncAnchorCompletion HostedAnchorCompletion(NSFileProviderAnchorCompletion completion) {
  return [answer = std::make_shared<AnchorAnswer>(std::move(completion))](const NSData &anchor) {
    answer->give(anchor);
  };
}

}  // namespace droxa
