#include "tessaly/QVFileProvidingOperation.h"

#include <atomic>
#include <future>
#include <optional>
#include <utility>

#include "platform/dispatch/dispatch.h"
#include "tessaly/QVDaemonConnection.h"
#include "tessaly/QVErrors.h"

namespace droxa {

namespace {

NSError cancelledError(const NSURL &url) {
  return qvc_error(QVErrorCancelled, "the download of " + url.path() + " was cancelled");
}

}  // namespace

std::shared_ptr<QVFileProvidingOperation> QVFileProvidingOperation::initWithURL(
    const NSURL &url, std::uint64_t readingOptions) {
  return std::make_shared<QVFileProvidingOperation>(Passkey{}, url, readingOptions);
}

QVFileProvidingOperation::QVFileProvidingOperation(Passkey, NSURL url, std::uint64_t readingOptions)
    : url_(std::move(url)), readingOptions_(readingOptions) {}

void QVFileProvidingOperation::setFileProvidingCompletion(Completion completion) {
  auto delivery = std::make_shared<Delivery>(std::move(completion));
  NSError outcome;
  {
    const Lock lock(mutex_);
    if (stage_ != Stage::ended) {
      delivery_ = std::move(delivery);
      return;
    }
    outcome = outcome_;
  }
  dispatch_async_global([delivery, outcome] { delivery->deliver({outcome}); });
}

void QVFileProvidingOperation::main() {
  bool isOver = false;
  {
    const Lock lock(mutex_);
    mainRan_ = true;
    isOver = stage_ == Stage::ended;
    if (!isOver) stage_ = Stage::starting;
  }
  if (isOver) return finish();  // ended before this, which left it to be finished here
  const auto self = shared_from_this();
  if (isCancelled()) return end(cancelledError(url_));
  const std::uint64_t version = wantsCurrentVersion_ ? QVDownloadCurrentVersion : 0;
  QVDaemonConnection::defaultConnection()
      ->remoteObjectProxyWithErrorHandler([self](const NSError &error) { self->end(error); })
      ->startDownloadAtURL(url_, QVDownloadForReader | version,
                           [self](const std::shared_ptr<QVTransfer> &transfer, const NSError &error) {
                             self->transferStarted(transfer, error);
                           });
}

void QVFileProvidingOperation::transferStarted(const std::shared_ptr<QVTransfer> &transfer,
                                               const NSError &error) {
  if (error) return end(error);
  if (!transfer) return end(NSError(NSCocoaErrorDomain, NSXPCConnectionReplyInvalid));
  bool isOver = false;
  {
    const Lock lock(mutex_);
    isOver = stage_ == Stage::ended;
    if (!isOver) {
      stage_ = Stage::waiting;
      transfer_ = transfer;
    }
  }
  if (isOver) return transfer->remoteObjectProxyWithErrorHandler([](const NSError &) {})->cancel();
  const auto self = shared_from_this();
  transfer->remoteObjectProxyWithErrorHandler([self](const NSError &failure) { self->end(failure); })
      ->waitWithReply([self](const NSError &outcome) { self->end(outcome); });
}

// The completion doesn't wait for the daemon's answer, which may never come.
void QVFileProvidingOperation::cancel() {
  NSOperation::cancel();
  std::shared_ptr<QVTransfer> transfer;
  {
    const Lock lock(mutex_);
    if (stage_ == Stage::ended) return;
    transfer = transfer_;
  }
  // On the pool: whoever cancels may hold what the completion needs.
  dispatch_async_global([self = shared_from_this(), transfer] {
    self->end(cancelledError(self->url_));
    if (transfer) transfer->remoteObjectProxyWithErrorHandler([](const NSError &) {})->cancel();
  });
}

void QVFileProvidingOperation::end(const NSError &error) {
  std::shared_ptr<Delivery> delivery;
  std::shared_ptr<QVTransfer> released;
  bool mainRan = false;
  {
    const Lock lock(mutex_);
    if (stage_ == Stage::ended) return;
    stage_ = Stage::ended;
    outcome_ = error;
    if (!error) progress_.completedBytes = progress_.totalBytes;
    delivery.swap(delivery_);
    released.swap(transfer_);
    mainRan = mainRan_;
  }
  if (delivery) delivery->deliver({error});
  if (mainRan) finish();  // otherwise the queue does, which never runs it, or main()
}

QVFileProvidingOperation::Progress QVFileProvidingOperation::progress() {
  std::shared_ptr<QVTransfer> transfer;
  {
    const Lock lock(mutex_);
    if (!transfer_) return progress_;
    transfer = transfer_;
  }
  struct Answer {
    std::promise<std::optional<Progress>> promise;
    std::atomic_flag given;
    void give(std::optional<Progress> progress) {
      if (!given.test_and_set()) promise.set_value(progress);
    }
  };
  const auto answer = std::make_shared<Answer>();
  auto future = answer->promise.get_future();
  transfer->remoteObjectProxyWithErrorHandler([answer](const NSError &) { answer->give(std::nullopt); })
      ->getProgress([answer](std::uint64_t completedBytes, std::uint64_t totalBytes) {
        answer->give(Progress{completedBytes, totalBytes});
      });
  const std::optional<Progress> told = future.get();
  const Lock lock(mutex_);
  if (told && stage_ != Stage::ended) progress_ = *told;
  return progress_;
}

}  // namespace droxa
