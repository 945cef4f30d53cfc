#pragma once

#include <chrono>
#include <condition_variable>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "keld/contents/ContentsStorage.h"
#include "keld/sync/ItemStates.h"
#include "keld/sync/ReplicaFiles.h"
#include "keld/sync/SyncStore.h"
#include "keld/sync/TransferRate.h"
#include "platform/cloudkit/CKCloud.h"
#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVContents.h"

namespace droxa::keld {

enum class DownloadPriority : std::uint8_t { background = 0, asked = 1, reader = 2 };

struct DownloadOptions {
  std::size_t atOnce = 4;
  // A transfer that doesn't move for so long has failed.
  std::chrono::milliseconds stallTimeout = std::chrono::seconds(60);
};

// Fetches documents' contents: those that a reader waits for first, one transfer for a document however many
// ask. Contents come into a part file, which survives everything, and are published by one step when they are
// whole. Thread contract: any thread. Ends are told on the pool.
class Downloads : public std::enable_shared_from_this<Downloads> {
 public:
  using Ended = std::function<void(const NSError &error)>;

  Downloads(std::shared_ptr<CKCloud> cloud, SyncStore &store, ReplicaFiles &files,
            const ContentsStorage &storage, ItemStates &states, DownloadOptions options);

  // Puts what was prepared where a document is that was changed here, and keeps both. Blocks. Set once,
  // before anything is wanted.
  using ConflictHandler = std::function<ContentsResult(const FileLocation &location, PreparedFile &prepared)>;
  void setConflictHandler(ConflictHandler handler) { keepBoth_ = std::move(handler); }

  // One who wants the document here. The transfer is cancelled when the last of them has gone.
  class Interest {
   public:
    ~Interest();
    // Calls `ended` when the transfer has ended, once.
    void whenEnded(Ended ended);
    void progress(std::uint64_t *done, std::uint64_t *total) const;
    void cancel();

   private:
    friend class Downloads;
    struct State;
    std::shared_ptr<Downloads> downloads_;
    std::uint64_t transfer_ = 0;
    std::shared_ptr<State> state_;
  };
  std::unique_ptr<Interest> want(ItemNumber item, std::uint64_t size, DownloadPriority priority);
  // Wants it on the daemon's own behalf, until it has ended well: retryDue() begins what failed again, after
  // a pause that grows. Does nothing when it is wanted so already.
  void fetchInBackground(ItemNumber item, std::uint64_t size);
  void retryDue();
  void retryAllNow();  // the cloud is back
  // While paused nothing is begun; what runs ends with `why`.
  void pause(const NSError &why);
  void resume();

  QVTransferCounts counts() const;
  // The bytes that are there of the transfer under way; nullopt when there is none.
  std::optional<std::uint64_t> transferred(ItemNumber item) const;
  NSError lastError(ItemNumber item) const;  // nil when the last transfer went well, or there was none
  // Everything ends, as cancelled; returns when it has.
  void stop();

 private:
  struct Transfer {
    ItemNumber item = 0;
    std::uint64_t number = 0;
    std::string path;  // where the document was last
    std::uint64_t done = 0, total = 0;
    DownloadPriority priority = DownloadPriority::background;
    bool isRunning = false;
    std::shared_ptr<CKCancellation> cancellation = std::make_shared<CKCancellation>();
    std::set<std::shared_ptr<Interest::State>> interests;
    bool isKept = false;  // wanted by the daemon itself
    NSError why;          // of its cancellation, where that isn't its interests'
  };
  // What the daemon itself wants, and failed.
  struct Retry {
    std::uint64_t size = 0;
    int failures = 0;
    std::chrono::steady_clock::time_point when;
  };

  Transfer &transferOf(ItemNumber item, std::uint64_t size, DownloadPriority priority) REQUIRES(mutex_);
  void startMore() REQUIRES(mutex_);
  void run(std::uint64_t number, ItemNumber item, const std::shared_ptr<CKCancellation> &cancellation);
  void end(std::uint64_t number, const NSError &error);
  void release(std::uint64_t transfer, const std::shared_ptr<Interest::State> &interest);
  void noteOutcome(const Transfer &transfer, const NSError &error) REQUIRES(mutex_);

  enum class Try { ended, again, wait, waitForOther };
  Try attempt(std::uint64_t number, ItemNumber item, const std::shared_ptr<CKCancellation> &cancellation,
              NSError *error);
  Try fill(std::uint64_t number, const FileLocation &location, const DocumentMarker &wanted,
           const std::function<ContentsResult(PartFile &part, PartUse use)> &publish,
           const std::shared_ptr<CKCancellation> &cancellation, NSError *error);
  NSError receive(std::uint64_t number, const CKAssetReference &asset, PartFile &part,
                  const std::shared_ptr<CKCancellation> &cancellation);
  void becameNewer(const std::string &tag);
  void published(ItemNumber item, const std::string &digest, const ContentsResult &result);
  NSError nothingThere(ItemNumber item, std::uint64_t number) const;

  const std::shared_ptr<CKCloud> cloud_;
  SyncStore &store_;
  ReplicaFiles &files_;
  const ContentsStorage &storage_;
  ItemStates &states_;
  const DownloadOptions options_;
  ConflictHandler keepBoth_;

  mutable Mutex mutex_;
  std::map<std::uint64_t, Transfer> transfers_ GUARDED_BY(mutex_);  // by their numbers
  std::map<ItemNumber, std::uint64_t> byItem_ GUARDED_BY(mutex_);
  std::set<std::pair<int, std::uint64_t>> waiting_ GUARDED_BY(mutex_);  // by falling priority, then age
  std::map<ItemNumber, Retry> retries_ GUARDED_BY(mutex_);
  std::map<ItemNumber, NSError> failures_ GUARDED_BY(mutex_);
  std::map<std::string, int> digests_ GUARDED_BY(mutex_);  // under way
  std::uint64_t lastNumber_ GUARDED_BY(mutex_) = 0;
  std::size_t running_ GUARDED_BY(mutex_) = 0;
  std::uint64_t done_ GUARDED_BY(mutex_) = 0, failed_ GUARDED_BY(mutex_) = 0;
  TransferRate rate_ GUARDED_BY(mutex_);
  std::condition_variable_any idle_;
  bool stopped_ GUARDED_BY(mutex_) = false;
  NSError pausedBecause_ GUARDED_BY(mutex_);  // nil: not paused
};

}  // namespace droxa::keld
