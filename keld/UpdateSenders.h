#pragma once

#include <functional>
#include <memory>
#include <unordered_map>
#include <vector>

#include "keld/ContainerList.h"
#include "keld/ItemQueries.h"
#include "keld/UpdateSender.h"

namespace droxa::keld {

// All senders of the daemon: who is told of which change.
// Thread contract: any thread; publish() on the keeper's.
class UpdateSenders {
 public:
  void add(const std::shared_ptr<UpdateSender> &sender);
  std::size_t count() const;  // those that live

  // Hands each sender the changes of what it watches. `before` and `after` are the containers around the
  // changes.
  void publish(const std::vector<ItemChange> &changes, const Containers &before, const Containers &after,
               ItemQueries &queries);

 private:
  std::vector<std::shared_ptr<UpdateSender>> living() const;

  mutable Mutex mutex_;
  mutable std::vector<std::weak_ptr<UpdateSender>> senders_ GUARDED_BY(mutex_);
};

}  // namespace droxa::keld
