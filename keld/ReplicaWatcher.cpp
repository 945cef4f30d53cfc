#include "keld/ReplicaWatcher.h"

#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

// Sees nothing by itself.
class ScanningWatcher final : public ReplicaWatcher {
 public:
  explicit ScanningWatcher(std::string why)
      : description_(why.empty() ? "scanning" : "scanning, because " + why) {}
  void folderAppeared(ItemNumber, int) override {}
  void folderVanished(ItemNumber) override {}
  std::string description() const override { return description_; }
  bool needsScanning() const override { return true; }

 private:
  const std::string description_;
};

}  // namespace

std::unique_ptr<ReplicaWatcher> MakeScanningWatcher(std::string why) {
  return std::make_unique<ScanningWatcher>(std::move(why));
}

std::unique_ptr<ReplicaWatcher> MakeReplicaWatcher(WatcherKind kind, const std::string &replicaPath,
                                                   ReplicaWatcherSink &sink) {
  if (kind == WatcherKind::scan) return MakeScanningWatcher("it was asked for");
  std::string problem;
  std::unique_ptr<ReplicaWatcher> watcher;
  if (kind != WatcherKind::inotify) watcher = MakeFanotifyWatcher(replicaPath, sink, &problem);
  if (watcher || kind == WatcherKind::fanotify) {
    if (watcher) return watcher;
    os_log(qvc_default_log(), "[WARNING] fanotify doesn't work here (%s): the replica is scanned instead",
           problem);
    return MakeScanningWatcher(problem);
  }
  if (kind == WatcherKind::best)
    os_log_info(qvc_default_log(), "[INFO] no fanotify (%s), trying inotify", problem);
  if ((watcher = MakeInotifyWatcher(sink, &problem))) return watcher;
  os_log(qvc_default_log(), "[WARNING] inotify doesn't work here (%s): the replica is scanned instead",
         problem);
  return MakeScanningWatcher(problem);
}

}  // namespace droxa::keld
