#pragma once

#include <chrono>
#include <memory>
#include <string>

#include "fileproviderd/ExtensionCalls.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// An enumerator as a client of the host has it: passes each request on to the extension's enumerator of the
// container. When the extension ended in between, it takes a new one and asks once more; page tokens hold
// across that, sync anchors expire.
//
// While a client works on a page, the next one is asked for already: one page, kept for a short while, and
// dropped when the container is signalled, since the page may have changed then.
//
// Thread contract: any thread. lock_ guards the current enumerator and the page ahead, and is never held
// during a call.
class RelayedEnumerator final : public NSFileProviderRemoteEnumerator,
                                public std::enable_shared_from_this<RelayedEnumerator> {
 public:
  RelayedEnumerator(std::shared_ptr<ExtensionCalls> calls, std::string identifier,
                    std::shared_ptr<NSFileProviderRemoteEnumerator> enumerator);
  ~RelayedEnumerator() override;

  void enumerateItems(const NSData &page, NSFileProviderPageCompletion completion) override;
  void enumerateChanges(const NSData &anchor, NSFileProviderChangesCompletion completion) override;
  void currentSyncAnchor(NSFileProviderAnchorCompletion completion) override;
  void invalidate() override;

  void containerWasSignalled();

 private:
  using Enumerator = std::shared_ptr<NSFileProviderRemoteEnumerator>;
  // A page that nobody has asked for yet; under the enumerator's lock.
  struct PageAhead {
    NSData page;
    bool isHere = false;
    std::chrono::steady_clock::time_point came;
    NSFileProviderItems items;
    NSData next;
    // The client that asked while it was on its way, and what keeps the enumerator until the client is
    // answered.
    NSFileProviderPageCompletion waiter;
    std::shared_ptr<RelayedEnumerator> kept;
  };

  Enumerator current() const;
  void ask(const NSData &page, NSFileProviderPageCompletion completion);
  void give(const NSFileProviderItems &items, const NSData &next, const NSFileProviderPageCompletion &to);
  void askAhead(const NSData &page);
  void cameAhead(const std::shared_ptr<PageAhead> &ahead, const NSFileProviderItems &items,
                 const NSData &next, const NSError &error);
  // Takes the page if it is here, or lets its coming answer `completion`; then true.
  bool takeAhead(const NSData &page, const NSFileProviderPageCompletion &completion);
  // Replaces `gone`, unless another request did so already, and goes on with the new one.
  void reopen(const Enumerator &gone, NSFileProviderEnumeratorCompletion completion);

  const std::shared_ptr<ExtensionCalls> calls_;
  const std::string identifier_;
  mutable Mutex lock_;
  Enumerator enumerator_ GUARDED_BY(lock_);
  std::shared_ptr<PageAhead> ahead_ GUARDED_BY(lock_);
};

}  // namespace droxa
