#include "fileproviderd/RelayedThumbnails.h"

#include <cerrno>
#include <utility>

#include "platform/xpc/NSXPCProxyCreating.h"

namespace droxa {
namespace {

std::vector<std::string> EachOnce(const std::vector<std::string> &identifiers) {
  std::set<std::string> seen;
  std::vector<std::string> once;
  for (const std::string &identifier : identifiers)
    if (seen.insert(identifier).second) once.push_back(identifier);
  return once;
}

NSError NotTold() {
  return NSError(NSCocoaErrorDomain, NSXPCConnectionReplyInvalid,
                 {{NSLocalizedDescriptionKey, "the extension said nothing of this item's thumbnail"}});
}

}  // namespace

void RelayedThumbnails::open(const std::shared_ptr<ExtensionCalls> &calls,
                             const std::vector<std::string> &identifiers, CGSize size,
                             const FPDThumbnailsCompletion &completion) {
  if (identifiers.size() > FPDMostThumbnailsAtOnce) {
    return completion(
        nullptr, NSError::errorWithPOSIXCode(E2BIG, "thumbnails of " + std::to_string(identifiers.size()) +
                                                        " items were asked for at once; at most " +
                                                        std::to_string(FPDMostThumbnailsAtOnce) + " can be"));
  }
  std::vector<std::string> once = EachOnce(identifiers);
  calls->fetchThumbnailsForItemIdentifiers(
      once, size, [calls, once, completion](const auto &thumbnails, const NSError &error) {
        if (!thumbnails) return completion(nullptr, error);
        completion(std::make_shared<RelayedThumbnails>(Passkey{}, calls, once, thumbnails), NSError());
      });
}

RelayedThumbnails::RelayedThumbnails(Passkey, std::shared_ptr<ExtensionCalls> calls,
                                     std::vector<std::string> identifiers,
                                     std::shared_ptr<FPDThumbnails> thumbnails)
    : calls_(std::move(calls)),
      identifiers_(std::move(identifiers)),
      thumbnails_(std::move(thumbnails)),
      unanswered_(identifiers_.begin(), identifiers_.end()) {}

// The extension's are told even so: a question for the next ones, which is under way, holds them.
RelayedThumbnails::~RelayedThumbnails() {
  RelayedThumbnails::cancel();
}

// Holds nothing of this while the extension is asked, so that a client's death reaches it.
void RelayedThumbnails::nextWithReply(FPDThumbnailsReply reply) {
  {
    const Lock lock(lock_);
    if (hasEnded_) {
      // Asked again after the end.
      return reply({}, true, outcome_);
    }
  }
  const auto told = [weak = weak_from_this(), reply](const std::vector<FPDThumbnail> &thumbnails, bool isLast,
                                                     const NSError &error) {
    const auto self = weak.lock();
    if (!self) return reply({}, true, NSError(NSCocoaErrorDomain, NSUserCancelledError));
    self->relay(thumbnails, isLast, error, reply);
  };
  NSXPCProxyWithErrorHandler<FPDThumbnails>(thumbnails_, [told, calls = calls_](const NSError &failure) {
    told({}, true, calls->cutOffError(failure));
  })->nextWithReply(told);
}

void RelayedThumbnails::relay(std::vector<FPDThumbnail> thumbnails, bool isLast, const NSError &error,
                              const FPDThumbnailsReply &reply) {
  {
    const Lock lock(lock_);
    std::erase_if(thumbnails, [this](const FPDThumbnail &thumbnail)
                                  REQUIRES(lock_) { return unanswered_.erase(thumbnail.identifier) == 0; });
    if (isLast) {
      hasEnded_ = true;
      outcome_ = error;
      for (const std::string &identifier : identifiers_) {
        if (unanswered_.erase(identifier) != 0)
          thumbnails.push_back({identifier, {}, std::nullopt, error ? error : NotTold()});
      }
    }
  }
  reply(thumbnails, isLast, error);
}

void RelayedThumbnails::getProgress(FPDProgressCompletion completion) {
  std::size_t left = 0;
  {
    const Lock lock(lock_);
    left = unanswered_.size();
  }
  completion(static_cast<std::int64_t>(identifiers_.size() - left),
             static_cast<std::int64_t>(identifiers_.size()));
}

void RelayedThumbnails::cancel() {
  {
    const Lock lock(lock_);
    if (hasEnded_) return;
  }
  if (isCancelled_.exchange(true)) return;
  NSXPCProxyWithErrorHandler<FPDThumbnails>(thumbnails_, [](const NSError &) {})->cancel();
}

}  // namespace droxa
