#pragma once

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <deque>
#include <functional>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "keld/sync/SyncContext.h"
#include "keld/thumbnails/Thumbnailer.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa::keld {

// Makes the thumbnails of documents whose contents are in the cloud, beside the sync's thread, and saves them
// there: one key of the record, and only while the record has the contents that the thumbnail is of. Which
// ones are still wanted is in the sync store, so that a restart goes on with them. A document whose thumbnail
// can't be made has none, until it has other contents. Thread contract: work() on the sync's thread; the
// others on any thread. Jobs run on the pool, a few at a time; `wake` is called there when there is something
// for work() to do. The lock is never held during a call of another.
class ThumbnailQueue : public std::enable_shared_from_this<ThumbnailQueue> {
 public:
  ThumbnailQueue(const SyncContext &context, std::shared_ptr<Thumbnailer> thumbnailer,
                 std::function<void()> wake);

  // Whether a document of that name could have a thumbnail. Asked before its contents are saved, so that it
  // is noted by then what is wanted.
  bool isFor(const std::string &name) const;

  // Saves what was made, and has more made. Answers records that the cloud has in another state: they are to
  // be applied. `isPoll`: also looks for what nobody has told of.
  std::vector<CKRecord> work(bool isPoll, const CKCallContext &call);
  // Something that wasn't there when wanted ones were looked for may be there now.
  void lookAgain();
  void stop();  // returns when the jobs under way have ended, which is soon

 private:
  struct Made {
    WantedThumbnail wanted;
    CKAssetReference asset;
  };
  enum class End : std::uint8_t { made, never, later };

  std::vector<CKRecord> saveMade(const CKCallContext &call);
  bool belongsTo(const Made &made, const std::optional<SyncRow> &row) const;
  void saved(const Made &made, const std::string &sentTag, const CKRecord &record);
  bool isSettled(const Made &made, const CKRecord &sent, const CKRecordResult &result,
                 std::vector<CKRecord> *newer);
  void startMore(bool isPoll);
  std::optional<WantedThumbnail> next(bool *isMuchMade);
  void runJobs();
  void restIfIdle();
  void runJob(const WantedThumbnail &wanted);
  End make(const WantedThumbnail &wanted, Made *made);
  OwnedDescriptor open(const WantedThumbnail &wanted, const SyncRow &row, LocalFile *file, std::string *name);
  OwnedDescriptor openSource(const WantedThumbnail &wanted, LocalFile *file) const;
  void forget(const WantedThumbnail &wanted);

  const SyncContext &context_;
  const std::shared_ptr<Thumbnailer> thumbnailer_;
  const std::function<void()> wake_;
  const unsigned mostJobs_;
  const std::shared_ptr<CKCancellation> stopping_ = std::make_shared<CKCancellation>();

  // The sync's thread.
  std::vector<Made> unsaved_;
  std::uint64_t wantsSeen_ = UINT64_MAX;

  Mutex mutex_;
  std::condition_variable_any idle_;
  std::deque<WantedThumbnail> ready_ GUARDED_BY(mutex_);
  std::set<std::string> underWay_ GUARDED_BY(mutex_);  // records: ready, being made, or made and not saved
  std::vector<Made> made_ GUARDED_BY(mutex_);
  unsigned workers_ GUARDED_BY(mutex_) = 0;  // that take what is ready
  unsigned jobs_ GUARDED_BY(mutex_) = 0;     // the same, until they have ended
  bool looksAgain_ GUARDED_BY(mutex_) = false;
  bool isUnavailable_ GUARDED_BY(mutex_) = false;  // until the next start
  bool stopped_ GUARDED_BY(mutex_) = false;
};

}  // namespace droxa::keld
