#pragma once

#include <atomic>
#include <cstdint>
#include <functional>
#include <memory>

#include "platform/foundation/NSError.h"
#include "platform/foundation/NSOperationQueue.h"
#include "platform/foundation/NSURL.h"
#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVContents.h"
#include "tessaly/QVRememberedCompletion.h"

namespace droxa {

// Brings a document's contents, or those of everything below a folder, here through the daemon: an interest
// in the daemon's download, given up when the operation is cancelled. Its completion is called exactly once,
// also when it is cancelled before an operation queue has started it (which then never runs it): nil, the
// daemon's error, QVErrorCancelled, or the connection's error when the daemon goes. It keeps no thread while
// it waits.
//
// Thread contract: any thread. The completion runs on the pool or on a thread of the daemon's connection,
// under the persona under which it was set (or the thread's, when that can't be adopted), with no lock held.
class QVFileProvidingOperation final : public NSOperation,
                                       public std::enable_shared_from_this<QVFileProvidingOperation> {
 private:
  struct Passkey {};

 public:
  using Completion = std::function<void(const NSError &error)>;
  struct Progress {
    std::uint64_t completedBytes = 0;
    std::uint64_t totalBytes = 0;  // 0: not known yet
    bool operator==(const Progress &) const = default;
  };

  static std::shared_ptr<QVFileProvidingOperation> initWithURL(const NSURL &url,
                                                               std::uint64_t readingOptions);
  QVFileProvidingOperation(Passkey, NSURL url, std::uint64_t readingOptions);

  const NSURL &url() const { return url_; }
  std::uint64_t readingOptions() const { return readingOptions_; }

  // Whether contents that are here are good enough (the default), or the cloud is asked for newer ones first.
  // Set before it is given to a queue.
  void setWantsCurrentVersion(bool wants) { wantsCurrentVersion_ = wants; }
  bool wantsCurrentVersion() const { return wantsCurrentVersion_; }

  // Set once; when everything is over already, it is called at once, on the pool.
  void setFileProvidingCompletion(Completion completion);
  // How far it is. Blocks on the daemon while the download is under way.
  Progress progress();

  bool isAsynchronous() const override { return true; }
  void main() override;
  void cancel() override;

 private:
  enum class Stage : std::uint8_t { fresh, starting, waiting, ended };

  using Delivery = QVRememberedCompletion<NSError>;

  void transferStarted(const std::shared_ptr<QVTransfer> &transfer, const NSError &error);
  void end(const NSError &error);

  // Constant after construction.
  const NSURL url_;
  const std::uint64_t readingOptions_;
  // Constant once a queue has it.
  std::atomic<bool> wantsCurrentVersion_ = false;

  Mutex mutex_;
  Stage stage_ GUARDED_BY(mutex_) = Stage::fresh;
  bool mainRan_ GUARDED_BY(mutex_) = false;
  std::shared_ptr<QVTransfer> transfer_ GUARDED_BY(mutex_);  // while waiting
  std::shared_ptr<Delivery> delivery_ GUARDED_BY(mutex_);
  NSError outcome_ GUARDED_BY(mutex_);  // once ended
  Progress progress_ GUARDED_BY(mutex_);
};

}  // namespace droxa
