#pragma once

#include <atomic>
#include <memory>

#include "platform/fileprovider/NSFileProviderEnumerating.h"
#include "platform/fileprovider/NSFileProviderRemote.h"

namespace droxa {

// An enumerator of this process as the host sees it. Invalidates the enumerator once: when the host says so,
// else when the host releases it or goes away. Thread contract: any thread; each completion is called exactly
// once, on the thread on which the enumerator answers.
class HostedEnumerator final : public NSFileProviderRemoteEnumerator {
 public:
  explicit HostedEnumerator(std::shared_ptr<NSFileProviderEnumerator> enumerator);
  ~HostedEnumerator() override;

  void enumerateItems(const NSData &page, NSFileProviderPageCompletion completion) override;
  void enumerateChanges(const NSData &anchor, NSFileProviderChangesCompletion completion) override;
  void currentSyncAnchor(NSFileProviderAnchorCompletion completion) override;
  void invalidate() override;

 private:
  const std::shared_ptr<NSFileProviderEnumerator> enumerator_;
  std::atomic<bool> invalidated_ = false;
};

}  // namespace droxa
