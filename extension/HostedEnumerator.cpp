#include "extension/HostedEnumerator.h"

#include <utility>

#include "extension/HostedObservers.h"

namespace droxa {

HostedEnumerator::HostedEnumerator(std::shared_ptr<NSFileProviderEnumerator> enumerator)
    : enumerator_(std::move(enumerator)) {}

HostedEnumerator::~HostedEnumerator() {
  HostedEnumerator::invalidate();
}

void HostedEnumerator::enumerateItems(const NSData &page, NSFileProviderPageCompletion completion) {
  enumerator_->enumerateItemsForObserver(std::make_shared<HostedEnumerationObserver>(std::move(completion)),
                                         page);
}

void HostedEnumerator::enumerateChanges(const NSData &anchor, NSFileProviderChangesCompletion completion) {
  enumerator_->enumerateChangesForObserver(std::make_shared<HostedChangeObserver>(std::move(completion)),
                                           anchor);
}

void HostedEnumerator::currentSyncAnchor(NSFileProviderAnchorCompletion completion) {
  enumerator_->currentSyncAnchorWithCompletionHandler(HostedAnchorCompletion(std::move(completion)));
}

void HostedEnumerator::invalidate() {
  if (!invalidated_.exchange(true)) enumerator_->invalidate();
}

}  // namespace droxa
