#include "fileproviderd/RelayedEnumerator.h"

namespace droxa {

namespace {
// Longer than it takes to print a page. A container of which no changes are pushed is never signalled.
constexpr std::chrono::seconds kLongestKept{1};
}  // namespace

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
  if (!takeAhead(page, completion)) ask(page, std::move(completion));
}

void RelayedEnumerator::ask(const NSData &page, NSFileProviderPageCompletion completion) {
  const Enumerator asked = current();
  const NSFileProviderPageCompletion answer = [self = shared_from_this(), completion = std::move(completion)](
                                                  const NSFileProviderItems &items, const NSData &next,
                                                  const NSError &error) {
    if (error) {
      completion(items, next, error);
    } else {
      self->give(items, next, completion);
    }
  };
  asked->enumerateItems(
      page, [self = shared_from_this(), asked, page, answer](const NSFileProviderItems &items,
                                                             const NSData &next, const NSError &error) {
        if (!isConnectionGone(error)) {
          answer(items, next, error);
          return;
        }
        self->reopen(asked, [page, answer](const Enumerator &enumerator, const NSError &failure) {
          if (!enumerator) {
            answer({}, NSData(), failure);
          } else {
            enumerator->enumerateItems(page, answer);
          }
        });
      });
}

// Asked for first: a client that asks for the next page before it returns finds it on its way.
void RelayedEnumerator::give(const NSFileProviderItems &items, const NSData &next,
                             const NSFileProviderPageCompletion &to) {
  if (next) askAhead(next);
  to(items, next, NSError());
}

void RelayedEnumerator::askAhead(const NSData &page) {
  const auto ahead = std::make_shared<PageAhead>();
  ahead->page = page;
  Enumerator asked;
  {
    Lock held(lock_);
    ahead_ = ahead;
    asked = enumerator_;
  }
  asked->enumerateItems(page, [weak = weak_from_this(), ahead](const NSFileProviderItems &items,
                                                               const NSData &next, const NSError &error) {
    if (const auto self = weak.lock()) self->cameAhead(ahead, items, next, error);
  });
}

// A failure is no news for anybody: who asks for the page is answered by asking anew.
void RelayedEnumerator::cameAhead(const std::shared_ptr<PageAhead> &ahead, const NSFileProviderItems &items,
                                  const NSData &next, const NSError &error) {
  NSFileProviderPageCompletion waiter;
  std::shared_ptr<RelayedEnumerator> kept;
  bool isWanted = false;
  {
    Lock held(lock_);
    waiter.swap(ahead->waiter);
    kept.swap(ahead->kept);
    isWanted = ahead_ == ahead && !error;
    if (isWanted && !waiter) {
      ahead->isHere = true;
      ahead->came = std::chrono::steady_clock::now();
      ahead->items = items;
      ahead->next = next;
      return;
    }
    if (ahead_ == ahead) ahead_.reset();
  }
  if (!waiter) return;
  if (isWanted) {
    give(items, next, waiter);
  } else {
    ask(ahead->page, std::move(waiter));
  }
}

bool RelayedEnumerator::takeAhead(const NSData &page, const NSFileProviderPageCompletion &completion) {
  std::shared_ptr<PageAhead> ahead;
  {
    Lock held(lock_);
    if (!ahead_ || ahead_->page != page || ahead_->waiter) return false;
    if (!ahead_->isHere) {
      ahead_->waiter = completion;
      ahead_->kept = shared_from_this();
      return true;
    }
    ahead.swap(ahead_);
  }
  if (std::chrono::steady_clock::now() - ahead->came > kLongestKept) return false;
  give(ahead->items, ahead->next, completion);
  return true;
}

// A page that a client waits for is still on its way, and asked for anew when it comes.
void RelayedEnumerator::containerWasSignalled() {
  Lock held(lock_);
  ahead_.reset();
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
  {
    Lock held(lock_);
    ahead_.reset();
  }
  current()->invalidate();
}

}  // namespace droxa
