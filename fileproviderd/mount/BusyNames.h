#pragma once

#include <set>
#include <string>
#include <utility>
#include <vector>

#include "fileproviderd/mount/NodeTable.h"

namespace droxa {

// The names that are being changed through the mount at this moment: what is seen of them in the replica
// meanwhile is no news. Thread contract: any thread; lock_ guards the names.
class BusyNames {
 public:
  using Name = std::pair<NodeId, std::string>;

  // Keeps names busy for as long as it lives.
  class Guard {
   public:
    Guard(BusyNames &busy, std::vector<Name> names);
    ~Guard();
    Guard(const Guard &) = delete;
    Guard &operator=(const Guard &) = delete;

   private:
    BusyNames &busy_;
    const std::vector<Name> names_;
  };

  bool contains(NodeId folder, const std::string &name) const;

 private:
  mutable Mutex lock_;
  std::multiset<Name> names_ GUARDED_BY(lock_);
};

}  // namespace droxa
