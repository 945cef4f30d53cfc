#pragma once

#include <atomic>
#include <memory>
#include <string>
#include <vector>

#include "platform/fileprovider/FPDThumbnailStream.h"
#include "platform/fileprovider/NSFileProviderExtension.h"
#include "platform/fileprovider/NSFileProviderRemote.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// Thumbnails that the principal fetches for the host, begun when the host first asks for the next ones. The
// principal is held up while the host doesn't ask for what has come. When the host lets go of it before it
// has ended, as its death does, it is cancelled.
// Thread contract: any thread. The principal runs on the pool; replies run where it answers.
class HostedThumbnails final : public FPDThumbnails {
 public:
  HostedThumbnails(std::shared_ptr<NSFileProviderExtension> principal, std::vector<std::string> identifiers,
                   CGSize size);
  ~HostedThumbnails() override;
  HostedThumbnails(const HostedThumbnails &) = delete;
  HostedThumbnails &operator=(const HostedThumbnails &) = delete;

  void nextWithReply(FPDThumbnailsReply reply) override;
  void getProgress(FPDProgressCompletion completion) override;
  void cancel() override;

 private:
  struct Fetch;

  const std::shared_ptr<NSFileProviderExtension> principal_;
  const std::vector<std::string> identifiers_;
  const CGSize size_;
  const std::shared_ptr<Fetch> fetch_;  // shared with the principal's handlers
  std::atomic<bool> isBegun_ = false;
};

}  // namespace droxa
