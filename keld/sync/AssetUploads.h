#pragma once

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "keld/FolderReading.h"
#include "keld/sync/SyncStore.h"
#include "platform/cloudkit/CKCloud.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa::keld {

// Sends large contents beside the sync's own thread, so that one long upload holds up nothing else. What is
// finished waits here until the record that names it is saved. Thread contract: any thread.
class AssetUploads : public std::enable_shared_from_this<AssetUploads> {
 public:
  struct Finished {
    NSError error;  // nil: `digest` is that of the whole contents
    std::string digest;
  };
  struct Progress {
    ItemNumber item = 0;
    std::uint64_t done = 0, total = 0;
  };

  // `ended` is called on the pool after each upload. One that doesn't move for `stallTimeout` has failed.
  AssetUploads(std::shared_ptr<CKCloud> cloud, std::chrono::milliseconds stallTimeout,
               std::function<void(ItemNumber item)> ended);

  // The outcome of an upload of exactly that file, which is forgotten by that; otherwise starts one, or
  // leaves the one under way. One that is of an older state of the file is stopped.
  std::optional<Finished> take(ItemNumber item, const LocalFile &file, int descriptor);
  // The item is gone: its upload is stopped, and what was sent forgotten.
  void forget(ItemNumber item);
  // No more upload is started; returns when those under way have ended, which is soon.
  void stop();
  std::vector<Progress> underWay() const;
  bool isUnderWay(ItemNumber item) const;

 private:
  struct Upload {
    LocalFile file;
    std::shared_ptr<CKCancellation> cancellation;
    std::uint64_t done = 0;
    std::optional<Finished> finished;
    std::uint64_t number = 0;
  };
  void run(ItemNumber item, std::uint64_t number, const LocalFile &file, int descriptor,
           const std::shared_ptr<CKCancellation> &cancellation);

  const std::shared_ptr<CKCloud> cloud_;
  const std::chrono::milliseconds stallTimeout_;
  const std::function<void(ItemNumber)> ended_;
  mutable Mutex mutex_;
  std::map<ItemNumber, Upload> uploads_ GUARDED_BY(mutex_);
  std::uint64_t lastNumber_ GUARDED_BY(mutex_) = 0;
  std::size_t running_ GUARDED_BY(mutex_) = 0;
  std::condition_variable_any idle_;
  bool stopped_ GUARDED_BY(mutex_) = false;
};

// Sends the contents of an open file and tells what was sent: an error when it changed meanwhile.
AssetUploads::Finished SendContents(CKCloud &cloud, int descriptor, const LocalFile &file,
                                    const CKProgressHandler &progress, const CKCallContext &context);

}  // namespace droxa::keld
