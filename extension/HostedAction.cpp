#include "extension/HostedAction.h"

#include <utility>

#include "tessaly/QVErrors.h"
#include "tessaly/QVLog.h"

namespace droxa {
namespace {

NSError CancelledError(NSUserInfo userInfo = {}) {
  return NSError(NSCocoaErrorDomain, NSUserCancelledError, std::move(userInfo));
}

// The answer that the principal owes, shared by the copies of its completion: dropped, it is an error.
class OwedAnswer {
 public:
  OwedAnswer(std::shared_ptr<FPDActionOutcome> outcome, std::shared_ptr<NSProgress> progress)
      : outcome_(std::move(outcome)), progress_(std::move(progress)) {}
  ~OwedAnswer() {
    const NSError dropped(
        NSCocoaErrorDomain, NSXPCConnectionReplyInvalid,
        NSUserInfo{{NSLocalizedDescriptionKey, "the extension dropped an action without an answer"}});
    if (outcome_->end(nullptr, dropped)) {
      os_log_fault(qvc_default_log(), "[CRIT] Assertion failed: answered (action)");
    }
  }
  OwedAnswer(const OwedAnswer &) = delete;
  OwedAnswer &operator=(const OwedAnswer &) = delete;

  // A download that ended because the action was cancelled has words of its own for that.
  void give(const std::shared_ptr<const NSFileProviderItem> &item, const NSError &error) {
    const bool isCancelled = progress_->isCancelled() && error.is(QVTessalyErrorDomain, QVErrorCancelled);
    if (!outcome_->end(item, isCancelled ? CancelledError({{NSUnderlyingErrorKey, error}}) : error)) {
      os_log_fault(qvc_default_log(), "[CRIT] an action was completed again: %@", error);
    }
  }

 private:
  const std::shared_ptr<FPDActionOutcome> outcome_;
  const std::shared_ptr<NSProgress> progress_;
};

void Perform(NSFileProviderExtension &principal, const FPDActionRequest &request,
             const NSFileProviderItemCompletion &completion) {
  using Kind = FPDActionRequest::Kind;
  switch (request.kind) {
    case Kind::importDocument:
      return principal.importDocumentAtURL(request.url, *request.parentIdentifier, completion);
    case Kind::createDirectory:
      return principal.createDirectoryWithName(*request.name, *request.parentIdentifier, completion);
    case Kind::rename:
      return principal.renameItemWithIdentifier(request.identifier, *request.name, completion);
    case Kind::reparent:
      return principal.reparentItemWithIdentifier(request.identifier, *request.parentIdentifier, request.name,
                                                  completion);
    case Kind::trash:
      return principal.trashItemWithIdentifier(request.identifier, completion);
    case Kind::untrash:
      return principal.untrashItemWithIdentifier(request.identifier, request.parentIdentifier, completion);
    case Kind::deleteItem:
      return principal.deleteItemWithIdentifier(
          request.identifier, [completion](const NSError &error) { completion(nullptr, error); });
    case Kind::setLastUsedDate:
      return principal.setLastUsedDate(request.date, request.identifier, completion);
    case Kind::setTagData:
      return principal.setTagData(request.tagData, request.identifier, completion);
    case Kind::setFavoriteRank:
      return principal.setFavoriteRank(request.favoriteRank, request.identifier, completion);
  }
}

}  // namespace

HostedAction::HostedAction(std::shared_ptr<NSFileProviderExtension> principal, FPDActionRequest request)
    : principal_(std::move(principal)),
      request_(std::move(request)),
      progress_(std::make_shared<NSProgress>()),
      outcome_(std::make_shared<FPDActionOutcome>()) {}

HostedAction::~HostedAction() {
  if (!outcome_->hasEnded()) progress_->cancel();
}

void HostedAction::waitWithReply(NSFileProviderItemCompletion completion) {
  outcome_->wait(std::move(completion));
  if (!isBegun_.exchange(true)) begin();
}

void HostedAction::begin() {
  if (progress_->isCancelled()) {
    outcome_->end(nullptr, CancelledError());
    return;
  }
  const auto answer = std::make_shared<OwedAnswer>(outcome_, progress_);
  const NSCurrentProgress current(progress_);
  Perform(*principal_, request_,
          [answer](const auto &item, const NSError &error) { answer->give(item, error); });
}

void HostedAction::getProgress(FPDProgressCompletion completion) {
  completion(progress_->completedUnitCount(), progress_->totalUnitCount());
}

void HostedAction::cancel() {
  progress_->cancel();
}

}  // namespace droxa
