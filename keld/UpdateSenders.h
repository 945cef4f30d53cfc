#pragma once

#include <functional>
#include <memory>
#include <vector>

#include "keld/ChangeJournal.h"
#include "keld/ContainerList.h"
#include "keld/ItemQueries.h"
#include "keld/UpdateSender.h"

namespace droxa::keld {

// All senders of the daemon: who is told of which change.
//
// A client lists a folder without waiting for its watch, so a watch begins with what happened since its
// sender was made: the journal has it. Each commit reaches a watch once, by one way or the other.
//
// Thread contract: any thread; publish() on the keeper's.
class UpdateSenders {
 public:
  void add(const std::shared_ptr<UpdateSender> &sender);
  std::size_t count() const;  // those that live

  // The number of the newest commit that was published.
  std::uint64_t lastCommit() const;

  // Hands each sender the changes of what it watches.
  void publish(Commit commit, ItemQueries &queries);

  // Runs a question on a connection that sees all that was published before.
  using Read = std::function<NSError(const std::function<void(ItemQueries &queries)> &question)>;
  // Lets the watch stand, after the changes of what it watches that were published since the commit `since`.
  // QVErrorChangeTokenExpired when they are too many to be known.
  NSError beginWatch(UpdateSender &sender, UpdateWatch watch, std::uint64_t since, const Read &read);

 private:
  std::vector<std::shared_ptr<UpdateSender>> living() const;

  mutable Mutex mutex_;
  mutable std::vector<std::weak_ptr<UpdateSender>> senders_ GUARDED_BY(mutex_);
  ChangeJournal journal_ GUARDED_BY(mutex_);
};

}  // namespace droxa::keld
