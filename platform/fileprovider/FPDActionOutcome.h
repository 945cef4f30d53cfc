#pragma once

#include <memory>
#include <optional>
#include <vector>

#include "platform/fileprovider/NSFileProviderRemote.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// How an action ended, once it has, and who waits for that.
// Thread contract: any thread; completions run on the thread that ends it, or before wait() returns, and
// without the lock.
class FPDActionOutcome final {
 public:
  void wait(NSFileProviderItemCompletion completion);
  bool hasEnded() const;
  // False when it has ended before: nothing changes then.
  bool end(const std::shared_ptr<const NSFileProviderItem> &item, const NSError &error);

 private:
  struct Result {
    std::shared_ptr<const NSFileProviderItem> item;
    NSError error;
  };
  mutable Mutex lock_;
  std::optional<Result> result_ GUARDED_BY(lock_);
  std::vector<NSFileProviderItemCompletion> waiting_ GUARDED_BY(lock_);
};

}  // namespace droxa
