#include "fileproviderd/RelayedEnumerator.h"

namespace droxa {

RelayedEnumerator::RelayedEnumerator(std::shared_ptr<ExtensionCalls> calls, std::string identifier,
                                     std::shared_ptr<NSFileProviderRemoteEnumerator> enumerator)
    : calls_(std::move(calls)), identifier_(std::move(identifier)), enumerator_(std::move(enumerator)) {}

// The extension's enumerator watches its folder for as long as it isn't told that nobody asks any more.
RelayedEnumerator::~RelayedEnumerator() {
  current()->invalidate();
}

RelayedEnumerator::Enumerator RelayedEnumerator::current() const {
  Lock held(lock_);
  return enumerator_;
}

void RelayedEnumerator::reopen(const Enumerator &gone, NSFileProviderEnumeratorCompletion completion) {
  const Enumerator now = current();
  if (now != gone) {
    completion(now, NSError());
    return;
  }
  calls_->enumeratorForContainer(identifier_, [self = shared_from_this(), completion](
                                                  const Enumerator &enumerator, const NSError &error) {
    if (enumerator) {
      Lock held(self->lock_);
      self->enumerator_ = enumerator;
    }
    completion(enumerator, error);
  });
}

void RelayedEnumerator::enumerateItems(const NSData &page, NSFileProviderPageCompletion completion) {
  const Enumerator asked = current();
  asked->enumerateItems(
      page, [self = shared_from_this(), asked, page, completion](const NSFileProviderItems &items,
                                                                 const NSData &next, const NSError &error) {
        if (!isConnectionGone(error)) {
          completion(items, next, error);
          return;
        }
        self->reopen(asked, [page, completion](const Enumerator &enumerator, const NSError &failure) {
          if (!enumerator) {
            completion({}, NSData(), failure);
          } else {
            enumerator->enumerateItems(page, completion);
          }
        });
      });
}

void RelayedEnumerator::enumerateChanges(const NSData &anchor, NSFileProviderChangesCompletion completion) {
  const Enumerator asked = current();
  asked->enumerateChanges(
      anchor, [self = shared_from_this(), asked, anchor, completion](
                  const NSFileProviderItems &updated, const std::vector<std::string> &deleted,
                  const NSData &next, bool moreComing, const NSError &error) {
        if (!isConnectionGone(error)) {
          completion(updated, deleted, next, moreComing, error);
          return;
        }
        self->reopen(asked, [anchor, completion](const Enumerator &enumerator, const NSError &failure) {
          if (!enumerator) {
            completion({}, {}, NSData(), false, failure);
          } else {
            enumerator->enumerateChanges(anchor, completion);
          }
        });
      });
}

void RelayedEnumerator::currentSyncAnchor(NSFileProviderAnchorCompletion completion) {
  current()->currentSyncAnchor(std::move(completion));
}

void RelayedEnumerator::invalidate() {
  current()->invalidate();
}

}  // namespace droxa
