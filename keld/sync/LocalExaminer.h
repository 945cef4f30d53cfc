#pragma once

#include <chrono>
#include <cstdint>
#include <deque>
#include <functional>
#include <string>
#include <vector>

#include "keld/ContainerList.h"
#include "keld/contents/ContentsStorage.h"
#include "keld/sync/ItemStates.h"
#include "keld/sync/ReplicaFiles.h"
#include "keld/sync/SyncStore.h"

namespace droxa::keld {

// When deletions are taken for an accident: both must be exceeded.
struct DeletionGuard {
  double share = 0.3;          // of the documents and folders that the drive has in the cloud
  std::uint64_t atLeast = 25;  // deletions
  // No deletion is sent sooner, so that the first ones of many are still here when the rest is noticed.
  std::chrono::milliseconds pause{700};
  // How long the announcement of a deletion stands, unless that was done before.
  std::chrono::milliseconds announced{300'000};
};

// Reads the item table's feed of changes and finds out which of them the cloud doesn't know: those it puts
// into the queue of uploads. It also recognises the files that the cloud's own changes made. The feed's rank
// is the only thing it remembers, so that nothing is missed over a restart. Thread contract: one thread at a
// time.
class LocalExaminer {
 public:
  LocalExaminer(SyncStore &store, ReplicaFiles &files, const ContentsStorage &storage, ItemStates &states,
                ReplicaFiles::Read read, DeletionGuard guard);

  // Examines all that is in the feed. Whether anything was queued.
  bool examine();
  // Examines one item now, whatever the feed says.
  void examineItem(ItemNumber item);

  // Whether the cloud has the item as it is here, by what the row says of the cloud; learns the file that
  // stands for the contents.
  bool isClean(const ItemRecord &item, SyncRow &row, const std::string &parent);
  // Finds the record that an item without one stands for; false when it is new.
  bool bind(const ItemRecord &item, const std::string &parent);
  // Has `item` stand for the record, whatever stood for it before.
  void bindTo(const std::string &record, ItemNumber item);
  // Called, on the examining thread, for each file that was found to stand for a record.
  void setBoundHandler(std::function<void(ItemNumber item, const SyncRow &row)> handler) {
    bound_ = std::move(handler);
  }
  // A person has said what is to become of the deletions that were held.
  void allowDeletions();
  // Nothing is held any more, so that what dies next is judged anew.
  void forgetHoldIfNothingIsHeld();
  // Deletions from now on wait for a person's word, as those do that weren't sent yet.
  void holdDeletions();
  // Asked before deletions are believed: whether the replica's folder is the one that it always was.
  void setReplicaCheck(std::function<bool()> isItself) { isReplicaItself_ = std::move(isItself); }

 private:
  struct Change {
    std::uint64_t rank = 0;
    ItemNumber item = 0;
    bool isDeath = false;
    ItemRecord record;
  };
  std::vector<Change> nextChanges(std::uint64_t after);
  void examineLive(const ItemRecord &item);
  void examineDeath(ItemNumber item);
  bool isUnasked(ItemNumber item);
  bool isAllowed(ItemNumber item);
  bool bindLink(const ItemRecord &item, SyncRow row);
  bool hasSyncedContents(const ItemRecord &item, SyncRow &row);
  void noticeEviction(const ItemRecord &item, SyncRow &row);
  std::optional<SyncRow> findUnmarked(const ItemRecord &item, const std::string &parent);
  void guardAgainstSpree(const std::vector<Change> &changes);
  std::uint64_t recentDeaths(std::uint64_t more);
  void queue(ItemNumber item, bool isDeletion);

  SyncStore &store_;
  ReplicaFiles &files_;
  const ContentsStorage &storage_;
  ItemStates &states_;
  const ReplicaFiles::Read read_;
  const DeletionGuard guard_;
  std::function<void(ItemNumber, const SyncRow &)> bound_;
  std::function<bool()> isReplicaItself_;
  struct Deaths {
    std::chrono::steady_clock::time_point when;
    std::uint64_t count = 0;
  };
  std::deque<Deaths> recent_;  // sent or not
  bool holdsDeletions_ = false;
  bool queuedAny_ = false;
};

}  // namespace droxa::keld
