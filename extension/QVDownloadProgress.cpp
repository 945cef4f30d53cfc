#include "extension/QVDownloadProgress.h"

#include <chrono>

#include "platform/dispatch/dispatch.h"

namespace droxa {
namespace {

constexpr std::chrono::milliseconds kInterval{250};

// The operation is asked on the pool, since its answer may have to come from the daemon.
void ReportSoon(const std::weak_ptr<QVFileProvidingOperation> &watched,
                const std::shared_ptr<NSProgress> &progress) {
  dispatch_after_global(kInterval, [watched, progress] {
    const auto operation = watched.lock();
    if (!operation || operation->isFinished()) return;
    const auto told = operation->progress();
    if (operation->isFinished()) return;
    progress->setTotalUnitCount(told.totalBytes ? static_cast<std::int64_t>(told.totalBytes) : -1);
    progress->setCompletedUnitCount(static_cast<std::int64_t>(told.completedBytes));
    ReportSoon(watched, progress);
  });
}

}  // namespace

void QVDownloadReportsToProgress(const std::shared_ptr<QVFileProvidingOperation> &operation,
                                 const std::shared_ptr<NSProgress> &progress) {
  if (!progress) return;
  const std::weak_ptr<QVFileProvidingOperation> watched = operation;
  progress->setCancellationHandler([watched] {
    if (const auto cancelled = watched.lock()) cancelled->cancel();
  });
  ReportSoon(watched, progress);
}

}  // namespace droxa
