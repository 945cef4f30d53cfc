#pragma once

#include <cstdint>
#include <memory>

#include "platform/fileprovider/NSFileProviderExtension.h"
#include "platform/fileprovider/NSFileProviderRemote.h"

namespace droxa {

// What the principal provides for the host. When the host lets go of it before it has ended, as its death
// does, the principal is told that nobody waits.
// Thread contract: any thread; replies run where the principal's completion does, or before the call returns.
class HostedProviding final : public FPDProviding {
 private:
  struct Passkey {};

 public:
  static std::shared_ptr<HostedProviding> start(std::shared_ptr<NSFileProviderExtension> principal,
                                                const NSURL &url, std::uint64_t readingOptions);
  HostedProviding(Passkey, std::shared_ptr<NSFileProviderExtension> principal, NSURL url);
  ~HostedProviding() override;
  HostedProviding(const HostedProviding &) = delete;
  HostedProviding &operator=(const HostedProviding &) = delete;

  void waitWithReply(NSFileProviderErrorCompletion completion) override;
  void getProgress(FPDProgressCompletion completion) override;
  void cancel() override;

 private:
  struct Outcome;
  const std::shared_ptr<NSFileProviderExtension> principal_;
  const NSURL url_;
  const std::shared_ptr<Outcome> outcome_;  // shared with the principal's completion
};

}  // namespace droxa
