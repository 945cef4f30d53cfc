#pragma once

#include <condition_variable>
#include <cstddef>
#include <deque>
#include <optional>
#include <vector>

#include "platform/fileprovider/NSFileProviderRemote.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// Thumbnails between whoever fetches them and whoever asks for the next ones. Holds little: adding waits
// while more than a few megabytes of pictures have come that nobody has asked for.
// Thread contract: any thread; one asks for the next ones at a time. Replies run on the thread that adds,
// ends or asks, and without the lock.
class FPDThumbnailStream final {
 public:
  void add(FPDThumbnail thumbnail);
  // False when it has ended before: nothing changes then.
  bool end(const NSError &error);
  // Ends it, and lets go of what has come: nobody asks any more.
  void abandon(const NSError &error);
  // Replies as FPDThumbnails does. A second asker, while one waits, is answered with an error.
  void next(FPDThumbnailsReply reply);

  bool hasEnded() const;
  std::size_t added() const;

 private:
  struct Delivery {
    FPDThumbnailsReply reply;
    std::vector<FPDThumbnail> thumbnails;
    bool isLast = false;
    NSError error;
    void deliver() const {
      if (reply) reply(thumbnails, isLast, error);
    }
  };
  Delivery takeDelivery() REQUIRES(lock_);
  bool endLocked(const NSError &error) REQUIRES(lock_);

  mutable Mutex lock_;
  std::condition_variable_any changed_;
  std::deque<FPDThumbnail> waiting_ GUARDED_BY(lock_);
  std::size_t bytes_ GUARDED_BY(lock_) = 0;  // of the pictures that wait
  std::size_t added_ GUARDED_BY(lock_) = 0;
  std::optional<NSError> outcome_ GUARDED_BY(lock_);
  FPDThumbnailsReply asker_ GUARDED_BY(lock_);
};

}  // namespace droxa
