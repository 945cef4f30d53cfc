#include "platform/fileprovider/FPDThumbnailStream.h"

#include <utility>

namespace droxa {
namespace {

// What waits here, and what one reply carries, in bytes of pictures; a single larger one goes all the same.
constexpr std::size_t kMostWaiting = 8U << 20;
constexpr std::size_t kMostInReply = 4U << 20;

NSError SomebodyAsksAlready() {
  return NSError(NSCocoaErrorDomain, NSXPCConnectionReplyInvalid,
                 {{NSLocalizedDescriptionKey, "the next thumbnails are being waited for already"}});
}

}  // namespace

void FPDThumbnailStream::add(FPDThumbnail thumbnail) {
  Delivery delivery;
  {
    const Lock lock(lock_);
    while (!outcome_ && bytes_ > kMostWaiting) changed_.wait(lock_);
    if (outcome_) return;
    bytes_ += thumbnail.imageData.length();
    ++added_;
    waiting_.push_back(std::move(thumbnail));
    delivery = takeDelivery();
  }
  delivery.deliver();
}

bool FPDThumbnailStream::endLocked(const NSError &error) {
  if (outcome_) return false;
  outcome_ = error;
  changed_.notify_all();
  return true;
}

bool FPDThumbnailStream::end(const NSError &error) {
  Delivery delivery;
  {
    const Lock lock(lock_);
    if (!endLocked(error)) return false;
    delivery = takeDelivery();
  }
  delivery.deliver();
  return true;
}

void FPDThumbnailStream::abandon(const NSError &error) {
  Delivery delivery;
  std::deque<FPDThumbnail> released;
  {
    const Lock lock(lock_);
    if (!endLocked(error)) return;
    released.swap(waiting_);
    bytes_ = 0;
    delivery = takeDelivery();
  }
  delivery.deliver();
}

void FPDThumbnailStream::next(FPDThumbnailsReply reply) {
  Delivery delivery;
  {
    const Lock lock(lock_);
    if (asker_) {
      delivery = {std::move(reply), {}, true, SomebodyAsksAlready()};
    } else {
      asker_ = std::move(reply);
      delivery = takeDelivery();
    }
  }
  delivery.deliver();
}

// Empty when nobody asks, or there is nothing to tell.
FPDThumbnailStream::Delivery FPDThumbnailStream::takeDelivery() {
  Delivery delivery;
  if (!asker_ || (waiting_.empty() && !outcome_)) return delivery;
  std::size_t taken = 0;
  while (!waiting_.empty() && (taken == 0 || taken + waiting_.front().imageData.length() <= kMostInReply)) {
    taken += waiting_.front().imageData.length() + 1;
    bytes_ -= waiting_.front().imageData.length();
    delivery.thumbnails.push_back(std::move(waiting_.front()));
    waiting_.pop_front();
  }
  delivery.isLast = waiting_.empty() && outcome_;
  if (delivery.isLast) delivery.error = *outcome_;
  delivery.reply = std::exchange(asker_, nullptr);
  changed_.notify_all();
  return delivery;
}

bool FPDThumbnailStream::hasEnded() const {
  const Lock lock(lock_);
  return outcome_.has_value();
}

std::size_t FPDThumbnailStream::added() const {
  const Lock lock(lock_);
  return added_;
}

}  // namespace droxa
