#pragma once

#include <deque>
#include <memory>
#include <optional>
#include <utility>

#include "platform/cloudkit/CKFetchRecordsOperation.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// The operations of one request that haven't been launched yet, and the zone of each: the i-th zone is that
// of the i-th operation. Both are consumed from the front. Thread contract: any thread; no operation is
// called with the lock held.
class QVThumbnailOperations {
 public:
  void append(std::shared_ptr<CKFetchRecordsOperation> operation, const CKRecordZoneID &zone) {
    const Lock lock(mutex_);
    operations_.push_back(std::move(operation));
    zones_.push_back(zone);
  }
  std::shared_ptr<CKFetchRecordsOperation> firstOperation() const {
    const Lock lock(mutex_);
    return operations_.empty() ? nullptr : operations_.front();
  }
  std::optional<CKRecordZoneID> firstZone() const {
    const Lock lock(mutex_);
    return zones_.empty() ? std::nullopt : std::optional(zones_.front());
  }
  void removeFirst() {
    const Lock lock(mutex_);
    operations_.pop_front();
    zones_.pop_front();
  }
  bool isEmpty() const {
    const Lock lock(mutex_);
    return operations_.empty() || zones_.empty();
  }
  // Cancelled ones stay, and answer so when their turn comes.
  void cancelAll() const {
    for (const auto &operation : operations()) operation->cancel();
  }

 private:
  std::deque<std::shared_ptr<CKFetchRecordsOperation>> operations() const {
    const Lock lock(mutex_);
    return operations_;
  }

  mutable Mutex mutex_;
  std::deque<std::shared_ptr<CKFetchRecordsOperation>> operations_ GUARDED_BY(mutex_);
  std::deque<CKRecordZoneID> zones_ GUARDED_BY(mutex_);
};

}  // namespace droxa
