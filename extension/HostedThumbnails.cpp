#include "extension/HostedThumbnails.h"

#include <utility>

#include "platform/dispatch/dispatch.h"
#include "tessaly/QVLog.h"

namespace droxa {
namespace {

NSError CancelledError() {
  return NSError(NSCocoaErrorDomain, NSUserCancelledError);
}

// The end that the principal owes, shared by the copies of its completion: dropped, it is an error.
class OwedEnd {
 public:
  explicit OwedEnd(std::function<bool(const NSError &error)> end) : end_(std::move(end)) {}
  ~OwedEnd() {
    const NSError dropped(
        NSCocoaErrorDomain, NSXPCConnectionReplyInvalid,
        NSUserInfo{{NSLocalizedDescriptionKey, "the extension dropped thumbnails without an end"}});
    if (end_(dropped)) os_log_fault(qvc_default_log(), "[CRIT] Assertion failed: answered (thumbnails)");
  }
  OwedEnd(const OwedEnd &) = delete;
  OwedEnd &operator=(const OwedEnd &) = delete;

  void give(const NSError &error) const { end_(error); }

 private:
  const std::function<bool(const NSError &error)> end_;
};

}  // namespace

struct HostedThumbnails::Fetch {
  FPDThumbnailStream stream;

  // Of the principal, once it has begun.
  void setProgress(const std::shared_ptr<NSProgress> &begun) {
    {
      const Lock lock(mutex);
      progress = begun;
      if (!isCancelled) return;
    }
    if (begun) begun->cancel();
  }
  void cancel() {
    std::shared_ptr<NSProgress> begun;
    {
      const Lock lock(mutex);
      isCancelled = true;
      begun = progress;
    }
    stream.abandon(CancelledError());
    if (begun) begun->cancel();
  }

 private:
  Mutex mutex;
  bool isCancelled GUARDED_BY(mutex) = false;
  std::shared_ptr<NSProgress> progress GUARDED_BY(mutex);
};

HostedThumbnails::HostedThumbnails(std::shared_ptr<NSFileProviderExtension> principal,
                                   std::vector<std::string> identifiers, CGSize size)
    : principal_(std::move(principal)),
      identifiers_(std::move(identifiers)),
      size_(size),
      fetch_(std::make_shared<Fetch>()) {}

HostedThumbnails::~HostedThumbnails() {
  if (!fetch_->stream.hasEnded()) fetch_->cancel();
}

void HostedThumbnails::nextWithReply(FPDThumbnailsReply reply) {
  fetch_->stream.next(std::move(reply));
  if (isBegun_.exchange(true) || fetch_->stream.hasEnded()) return;
  // On the pool: the principal is held up by whoever doesn't ask, which must not be this call.
  dispatch_async_global([principal = principal_, identifiers = identifiers_, size = size_, fetch = fetch_] {
    const auto owed =
        std::make_shared<OwedEnd>([fetch](const NSError &error) { return fetch->stream.end(error); });
    fetch->setProgress(principal->fetchThumbnailsForItemIdentifiers(
        identifiers, size,
        [fetch](const std::string &identifier, const NSData &data,
                const std::optional<std::string> &contentType, const NSError &error) {
          fetch->stream.add({identifier, data, contentType, error});
        },
        [owed](const NSError &error) { owed->give(error); }));
  });
}

void HostedThumbnails::getProgress(FPDProgressCompletion completion) {
  completion(static_cast<std::int64_t>(fetch_->stream.added()),
             static_cast<std::int64_t>(identifiers_.size()));
}

void HostedThumbnails::cancel() {
  fetch_->cancel();
}

}  // namespace droxa
