#pragma once

#include <functional>
#include <map>
#include <vector>

#include "keld/Keeper.h"
#include "keld/sync/SyncStore.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa::keld {

// What the item table, and so everybody who lists or watches, is to show of a document's sync.
struct ItemState {
  ItemNumber item = 0;
  bool isDataless = false;
  bool isUploaded = false;
  LocalFile file;  // the file that this was found out of: one that changed since is shown as not uploaded
  bool hasFile = false;
};

// Collects states and hands them to the keeper, many at a time, in the order in which they were told.
// Thread contract: any thread.
class ItemStates {
 public:
  explicit ItemStates(std::function<Keeper *()> keeper) : keeper_(std::move(keeper)) {}

  void show(const ItemState &state);
  // Whether the item is the root of a share.
  void showShared(ItemNumber item, bool isShared);
  // Hands over what was collected; `done` is called on the pool when that, and what was handed over before,
  // is committed.
  void flush(std::function<void()> done = nullptr);
  // Has the keeper look at these paths below the replica now instead of when the watcher tells.
  void lookAt(
      std::vector<std::string> paths, std::function<void()> done = [] {});

 private:
  const std::function<Keeper *()> keeper_;
  Mutex mutex_;
  std::vector<ItemState> states_ GUARDED_BY(mutex_);
  std::map<ItemNumber, bool> shared_ GUARDED_BY(mutex_);
};

}  // namespace droxa::keld
