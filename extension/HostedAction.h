#pragma once

#include <atomic>
#include <memory>

#include "platform/fileprovider/FPDActionOutcome.h"
#include "platform/fileprovider/NSFileProviderExtension.h"
#include "platform/fileprovider/NSFileProviderRemote.h"
#include "platform/foundation/NSProgress.h"

namespace droxa {

// What the principal does for the host: one of its actions, begun when the host first waits for it, under a
// progress of its own. When the host lets go of it before it has ended, as its death does, the progress is
// cancelled.
// Thread contract: any thread. The wait that begins it blocks while the principal's operation does, with the
// progress as the current one; replies run where the principal's completion does, or before the call returns.
class HostedAction final : public FPDAction {
 public:
  // REQUIRES: FPDActionRequestError finds nothing wrong with the request.
  HostedAction(std::shared_ptr<NSFileProviderExtension> principal, FPDActionRequest request);
  ~HostedAction() override;
  HostedAction(const HostedAction &) = delete;
  HostedAction &operator=(const HostedAction &) = delete;

  void waitWithReply(NSFileProviderItemCompletion completion) override;
  void getProgress(FPDProgressCompletion completion) override;
  void cancel() override;

 private:
  void begin();

  const std::shared_ptr<NSFileProviderExtension> principal_;
  const FPDActionRequest request_;
  const std::shared_ptr<NSProgress> progress_;
  const std::shared_ptr<FPDActionOutcome> outcome_;  // shared with the principal's completion
  std::atomic<bool> isBegun_ = false;
};

}  // namespace droxa
