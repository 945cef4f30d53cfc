#pragma once

#include <memory>
#include <string>

#include "fileproviderd/ExtensionCalls.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// An enumerator as a client of the host has it: passes each request on to the extension's enumerator of the
// container. When the extension ended in between, it takes a new one and asks once more; page tokens hold
// across that, sync anchors expire. Thread contract: any thread. lock_ guards the current enumerator and is
// never held during a call.
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

 private:
  using Enumerator = std::shared_ptr<NSFileProviderRemoteEnumerator>;
  Enumerator current() const;
  // Replaces `gone`, unless another request did so already, and goes on with the new one.
  void reopen(const Enumerator &gone, NSFileProviderEnumeratorCompletion completion);

  const std::shared_ptr<ExtensionCalls> calls_;
  const std::string identifier_;
  mutable Mutex lock_;
  Enumerator enumerator_ GUARDED_BY(lock_);
};

}  // namespace droxa
