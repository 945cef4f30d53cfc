#include "fileproviderd/Actions.h"

#include <atomic>
#include <utility>

#include "fileproviderd/HostErrors.h"
#include "platform/fileprovider/FPDActionOutcome.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/xpc/NSXPCProxyCreating.h"

namespace droxa {
namespace {

// A drive whose root isn't found has a daemon that doesn't tell.
NSError Explained(const NSError &error) {
  const auto &userInfo = error.userInfo();
  const auto found = userInfo.find(NSFileProviderErrorNonExistentItemIdentifierKey);
  const auto *identifier = found == userInfo.end() ? nullptr : std::get_if<std::string>(&found->second);
  return identifier ? explainedError(*identifier, error) : error;
}

NSError CutOffInTheMiddle(const ExtensionCalls &calls, const NSError &error) {
  const NSError cutOff = calls.cutOffError(error);
  return NSError(
      cutOff.domain(), cutOff.code(),
      {{NSUnderlyingErrorKey, error},
       {NSLocalizedDescriptionKey, "nobody knows whether this was done: " + cutOff.localizedDescription()}});
}

}  // namespace

// Thread contract: any thread.
class Actions::Relayed final : public FPDAction {
 public:
  Relayed(Actions actions, FPDActionRequest request, std::shared_ptr<FPDAction> action)
      : actions_(std::move(actions)), request_(std::move(request)), action_(std::move(action)) {}
  // The extension's is told even so: a wait for it, which is under way, holds it.
  ~Relayed() override { Relayed::cancel(); }
  Relayed(const Relayed &) = delete;
  Relayed &operator=(const Relayed &) = delete;

  void waitWithReply(NSFileProviderItemCompletion completion) override {
    outcome_->wait(std::move(completion));
    if (isBegun_.exchange(true)) return;
    const auto end = [actions = actions_, request = request_, outcome = outcome_](const auto &item,
                                                                                  const NSError &error) {
      actions.lookAgain(request, item);
      outcome->end(item, Explained(error));
    };
    NSXPCProxyWithErrorHandler<FPDAction>(action_, [end, calls = actions_.calls_](const NSError &failure) {
      end(nullptr, CutOffInTheMiddle(*calls, failure));
    })->waitWithReply(end);
  }

  void getProgress(FPDProgressCompletion completion) override {
    NSXPCProxyWithErrorHandler<FPDAction>(action_, [completion](const NSError &) {
      completion(0, -1);
    })->getProgress(completion);
  }

  void cancel() override {
    if (!outcome_->hasEnded()) {
      NSXPCProxyWithErrorHandler<FPDAction>(action_, [](const NSError &) {})->cancel();
    }
  }

 private:
  const Actions actions_;
  const FPDActionRequest request_;
  const std::shared_ptr<FPDAction> action_;  // the extension's
  const std::shared_ptr<FPDActionOutcome> outcome_ = std::make_shared<FPDActionOutcome>();
  std::atomic<bool> isBegun_{false};
};

Actions::Actions(std::shared_ptr<ExtensionCalls> calls, std::shared_ptr<FollowedContainers> followed,
                 std::shared_ptr<OpenListings> listings)
    : calls_(std::move(calls)), followed_(std::move(followed)), listings_(std::move(listings)) {}

void Actions::perform(const FPDActionRequest &request, const FPDActionCompletion &completion) const {
  if (const NSError error = FPDActionRequestError(request)) return completion(nullptr, error);
  calls_->performAction(request,
                        [actions = *this, request, completion](const auto &action, const NSError &error) {
                          if (!action) return completion(nullptr, error);
                          completion(std::make_shared<Relayed>(actions, request, action), NSError());
                        });
}

void Actions::lookAgain(const FPDActionRequest &request,
                        const std::shared_ptr<const NSFileProviderItem> &item) const {
  listings_->signalAll();
  if (request.parentIdentifier) followed_->signal(*request.parentIdentifier);
  if (!item) return;
  const std::string &parent = item->fields().parentItemIdentifier;
  if (parent != request.parentIdentifier) followed_->signal(parent);
}

}  // namespace droxa
