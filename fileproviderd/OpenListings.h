#pragma once

#include <map>
#include <memory>
#include <string>

#include "fileproviderd/RelayedEnumerator.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// The enumerators that the host's clients hold, to be told when their container is signalled.
// Thread contract: any thread; lock_ guards the table and is never held while an enumerator is called.
class OpenListings {
 public:
  void add(const std::string &identifier, const std::shared_ptr<RelayedEnumerator> &enumerator);
  void signal(const std::string &identifier);
  void signalAll();

 private:
  mutable Mutex lock_;
  std::multimap<std::string, std::weak_ptr<RelayedEnumerator>> enumerators_ GUARDED_BY(lock_);
};

}  // namespace droxa
