#pragma once

#include <atomic>
#include <memory>
#include <set>
#include <string>
#include <vector>

#include "fileproviderd/ExtensionCalls.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// Thumbnails that a client of the host has asked for, relayed from the extension's. Here is where every item
// gets its one answer: what the extension tells twice, or wasn't asked for, is dropped; what it leaves out,
// because a batch failed or it died in the middle, is answered with the error of the whole, before the end.
// Thread contract: any thread; replies run where the extension's do.
class RelayedThumbnails final : public FPDThumbnails, public std::enable_shared_from_this<RelayedThumbnails> {
 private:
  struct Passkey {};

 public:
  // Completes with them, not begun, or with why there are none.
  static void open(const std::shared_ptr<ExtensionCalls> &calls, const std::vector<std::string> &identifiers,
                   CGSize size, const FPDThumbnailsCompletion &completion);
  RelayedThumbnails(Passkey, std::shared_ptr<ExtensionCalls> calls, std::vector<std::string> identifiers,
                    std::shared_ptr<FPDThumbnails> thumbnails);
  ~RelayedThumbnails() override;
  RelayedThumbnails(const RelayedThumbnails &) = delete;
  RelayedThumbnails &operator=(const RelayedThumbnails &) = delete;

  void nextWithReply(FPDThumbnailsReply reply) override;
  void getProgress(FPDProgressCompletion completion) override;
  void cancel() override;

 private:
  void relay(std::vector<FPDThumbnail> thumbnails, bool isLast, const NSError &error,
             const FPDThumbnailsReply &reply);

  const std::shared_ptr<ExtensionCalls> calls_;
  const std::vector<std::string> identifiers_;       // each once, in the order of the request
  const std::shared_ptr<FPDThumbnails> thumbnails_;  // the extension's
  std::atomic<bool> isCancelled_ = false;

  Mutex lock_;
  std::set<std::string> unanswered_ GUARDED_BY(lock_);
  bool hasEnded_ GUARDED_BY(lock_) = false;
  NSError outcome_ GUARDED_BY(lock_);  // once ended
};

}  // namespace droxa
