#include "tests/cli/ScriptedHost.h"

#include "platform/foundation/NSFileManager.h"
#include "platform/xpc/NSXPCConnection.h"
#include "tessaly/QVUnreachableDaemon.h"

namespace droxa::testing {

namespace {

// Pages are numbered from 0; the initial pages are the first.
class ScriptedListing final : public NSFileProviderRemoteEnumerator {
 public:
  ScriptedListing(std::shared_ptr<ScriptedHost> host, std::string container)
      : host_(std::move(host)), container_(std::move(container)) {}

  void enumerateItems(const NSData &page, NSFileProviderPageCompletion completion) override {
    const bool isFirst =
        page == NSFileProviderInitialPageSortedByName() || page == NSFileProviderInitialPageSortedByDate();
    if (isFirst) host_->firstPageWasByDate = page == NSFileProviderInitialPageSortedByDate();
    answer(isFirst ? 0 : page.bytes()[0],
           [completion](const auto &items, const NSData &next, const NSError &error) {
             completion(items, next, error);
           });
  }
  // The working set's: each page is one batch.
  void enumerateChanges(const NSData &anchor, NSFileProviderChangesCompletion completion) override {
    answer(anchor.bytes()[0],
           [anchor, completion](const auto &items, const NSData &next, const NSError &error) {
             completion(items, {}, next ? next : anchor, static_cast<bool>(next), error);
           });
  }
  void currentSyncAnchor(NSFileProviderAnchorCompletion completion) override { completion(token(0)); }
  void invalidate() override {}

 private:
  static NSData token(std::size_t number) {
    const auto byte = static_cast<std::uint8_t>(number);
    return NSData::dataWithBytes(&byte, 1);
  }

  void answer(std::size_t number, const NSFileProviderPageCompletion &completion) {
    if (host_->onPage) host_->onPage(container_, number);
    const auto &pages = host_->listings[container_];
    if (number >= pages.size()) {
      completion({}, NSData(), host_->pageErrors[container_]);
      return;
    }
    NSFileProviderItems items;
    for (const auto &fields : pages[number])
      items.push_back(std::make_shared<NSFileProviderPlainItem>(fields));
    const bool isLast = number + 1 == pages.size() && !host_->pageErrors.contains(container_);
    completion(items, isLast ? NSData() : token(number + 1), NSError());
  }

  const std::shared_ptr<ScriptedHost> host_;
  const std::string container_;
};

class SilentWatch final : public FPDWatch {
 public:
  void stop() override {}
};

}  // namespace

void ScriptedHost::itemForIdentifier(const std::string &identifier, NSFileProviderItemCompletion completion) {
  if (!items.contains(identifier)) {
    completion(nullptr, fileProviderErrorForNonExistentItemWithIdentifier(identifier));
    return;
  }
  completion(std::make_shared<NSFileProviderPlainItem>(items[identifier]), NSError());
}

void ScriptedHost::itemAtPath(const std::string &path, NSFileProviderItemCompletion completion) {
  itemForIdentifier(paths.contains(path) ? paths[path] : path, std::move(completion));
}

void ScriptedHost::URLForItemIdentifier(const std::string &identifier,
                                        NSFileProviderURLCompletion completion) {
  completion(urls.contains(identifier) ? NSURL::fileURLWithPath(urls[identifier]) : NSURL());
}

void ScriptedHost::enumeratorForContainer(const std::string &identifier,
                                          NSFileProviderEnumeratorCompletion completion) {
  if (!listings.contains(identifier)) {
    completion(nullptr, fileProviderErrorForNonExistentItemWithIdentifier(identifier));
    return;
  }
  completion(std::make_shared<ScriptedListing>(shared_from_this(), identifier), NSError());
}

void ScriptedHost::watchContainer(const std::string &identifier, std::shared_ptr<FPDWatchObserver> received,
                                  FPDWatchCompletion completion) {
  if (!listings.contains(identifier)) {
    completion(nullptr, fileProviderErrorForNonExistentItemWithIdentifier(identifier));
    return;
  }
  observer = std::move(received);
  completion(std::make_shared<SilentWatch>(), NSError());
}

void ScriptedHost::startProvidingItemWithIdentifier(const std::string &identifier,
                                                    std::uint64_t readingOptions,
                                                    FPDItemProvidingCompletion completion) {
  if (!urls.contains(identifier) || !provide) {
    completion(nullptr, NSURL(), fileProviderErrorForNonExistentItemWithIdentifier(identifier));
    return;
  }
  const NSURL url = NSURL::fileURLWithPath(urls[identifier]);
  completion(provide(url, readingOptions), url, NSError());
}

void ScriptedHost::listenerEndpointForServiceName(const std::string &name, const std::string &itemIdentifier,
                                                  FPDServiceCompletion completion) {
  const auto found = services.find(name);
  if (found == services.end())
    return completion(nullptr, NSError(NSCocoaErrorDomain, NSFeatureUnsupportedError));
  completion(found->second(itemIdentifier), NSError());
}

void ScriptedHost::performAction(const FPDActionRequest &request, FPDActionCompletion completion) {
  requests.push_back(request);
  if (const NSError error = FPDActionRequestError(request)) return completion(nullptr, error);
  if (!act) return completion(nullptr, NSError(NSPOSIXErrorDomain, ENOSYS));
  completion(act(request), NSError());
}

void ScriptedProviding::waitWithReply(NSFileProviderErrorCompletion completion) {
  std::optional<NSError> outcome;
  {
    const Lock held(lock_);
    outcome = outcome_;
    if (!outcome) waiting_ = std::move(completion);
  }
  if (outcome) completion(*outcome);
}

void ScriptedProviding::cancel() {
  wasCancelled_ = true;
  end(NSError(NSCocoaErrorDomain, NSUserCancelledError));
}

void ScriptedProviding::end(const NSError &error) {
  NSFileProviderErrorCompletion completion;
  {
    const Lock held(lock_);
    if (outcome_) return;
    outcome_ = error;
    completion.swap(waiting_);
  }
  if (completion) completion(error);
}

void ScriptedAction::waitWithReply(NSFileProviderItemCompletion completion) {
  outcome_.wait(std::move(completion));
}

void ScriptedAction::cancel() {
  wasCancelled_ = true;
  if (onCancel) return onCancel();
  end(nullptr, NSError(NSCocoaErrorDomain, NSUserCancelledError));
}

void ScriptedAction::end(const std::shared_ptr<const NSFileProviderItem> &item, const NSError &error) {
  outcome_.end(item, error);
}

std::shared_ptr<FPDControlProtocol> ScriptedHostConnecting::control(NSXPCErrorHandler, NSError *error) {
  *error = failure;
  return failure ? nullptr : host_;
}

std::shared_ptr<QVProtocol> AbsentDaemon::remoteObjectProxyWithErrorHandler(NSXPCErrorHandler handler) {
  return QVUnreachableDaemon(
      [handler = std::move(handler)] { handler(NSError(NSCocoaErrorDomain, NSXPCConnectionInvalid)); });
}

CommandFixture::CommandFixture() {
  host->listings[NSFileProviderRootContainerItemIdentifier] = {{}};
}

CommandContext CommandFixture::context() {
  using namespace std::chrono_literals;
  return {out,       err, std::make_shared<ControlClient>(connecting, 5s),
          daemon,    5s,  [this](std::chrono::milliseconds) { return stop(); },
          isTerminal};
}

int CommandFixture::run(const std::function<int(CommandContext &)> &command) {
  out.str("");
  err.str("");
  CommandContext made = context();
  return command(made);
}

NSFileProviderItemFields item(const std::string &identifier, const std::string &name,
                              NSFileProviderItemKind kind) {
  NSFileProviderItemFields fields;
  fields.itemIdentifier = identifier;
  fields.parentItemIdentifier = NSFileProviderRootContainerItemIdentifier;
  fields.filename = name;
  fields.kind = kind;
  fields.typeIdentifier = "text/plain";
  fields.permissions = 0644;
  return fields;
}

NSFileProviderItemFields folder(const std::string &identifier, const std::string &name) {
  return item(identifier, name, NSFileProviderItemKind::folder);
}

}  // namespace droxa::testing
