#pragma once

#include <atomic>
#include <cerrno>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <sstream>
#include <string>
#include <vector>

#include "cli/Commands.h"
#include "platform/fileprovider/FPDActionOutcome.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVDaemonConnection.h"

namespace droxa::testing {

// A host with items at paths and listings in pages, all set by the test.
class ScriptedHost final : public FPDControlProtocol, public std::enable_shared_from_this<ScriptedHost> {
 public:
  using Pages = std::vector<std::vector<NSFileProviderItemFields>>;

  void getStatus(FPDStatusCompletion completion) override { completion(status); }
  void itemForIdentifier(const std::string &identifier, NSFileProviderItemCompletion completion) override;
  void itemAtPath(const std::string &path, NSFileProviderItemCompletion completion) override;
  void URLForItemIdentifier(const std::string &identifier, NSFileProviderURLCompletion completion) override;
  void identifierForItemAtURL(const NSURL &, NSFileProviderIdentifierCompletion completion) override {
    completion(std::nullopt);
  }
  void enumeratorForContainer(const std::string &identifier,
                              NSFileProviderEnumeratorCompletion completion) override;
  void watchContainer(const std::string &identifier, std::shared_ptr<FPDWatchObserver> observer,
                      FPDWatchCompletion completion) override;
  // Fetches through `provide`, as the extension would.
  void startProvidingItemWithIdentifier(const std::string &identifier, std::uint64_t readingOptions,
                                        FPDItemProvidingCompletion completion) override;
  // No command asks for these.
  void startProvidingItemAtPath(const std::string &, std::uint64_t,
                                FPDItemProvidingCompletion completion) override {
    completion(nullptr, NSURL(), NSError(NSPOSIXErrorDomain, ENOSYS));
  }
  void stopProvidingItemAtURL(const NSURL &, NSFileProviderErrorCompletion completion) override {
    completion(NSError(NSPOSIXErrorDomain, ENOSYS));
  }
  void movingItemAtURL(const NSURL &, const NSURL &, NSFileProviderMovingCompletion completion) override {
    completion(false, NSError(NSPOSIXErrorDomain, ENOSYS));
  }
  // Done by `act`, as the extension would.
  void performAction(const FPDActionRequest &request, FPDActionCompletion completion) override;
  void fetchThumbnailsForItemIdentifiers(const std::vector<std::string> &identifiers, CGSize size,
                                         FPDThumbnailsCompletion completion) override {
    if (!fetchThumbnails) return completion(nullptr, NSError(NSPOSIXErrorDomain, ENOSYS));
    completion(fetchThumbnails(identifiers, size), NSError());
  }
  void defaultContainerForBundleIdentifier(const std::optional<std::string> &bundleIdentifier,
                                           NSFileProviderItemCompletion completion) override {
    if (!defaultContainer) return completion(nullptr, NSError(NSPOSIXErrorDomain, ENOSYS));
    defaultContainer(bundleIdentifier, completion);
  }
  void fillDesktopThumbnailsForContainer(const std::string &identifier,
                                         NSFileProviderErrorCompletion completion) override {
    filled.push_back(identifier);
    completion(NSError());
  }
  // As the item offers them: `services` by name.
  void listenerEndpointForServiceName(const std::string &name, const std::string &itemIdentifier,
                                      FPDServiceCompletion completion) override;

  void mountAtPath(const std::string &path, FPDMountCompletion completion) override {
    if (!mountError) status.mountPoint = path.empty() ? "/home/anna/Droxa Drive" : path;
    completion(mountError ? std::string() : status.mountPoint, mountError);
  }
  void unmount(NSFileProviderErrorCompletion completion) override {
    status.mountPoint.clear();
    completion(NSError());
  }

  NSError mountError;
  std::map<std::string, NSFileProviderItemFields> items;  // by identifier
  std::map<std::string, std::string> paths;               // to identifiers
  std::map<std::string, std::string> urls;                // by identifier
  std::map<std::string, Pages> listings;                  // by container
  std::map<std::string, NSError> pageErrors;              // by container: instead of the page after the last
  FPDStatus status;
  std::function<std::shared_ptr<FPDProviding>(const NSURL &url, std::uint64_t readingOptions)> provide;
  std::function<std::shared_ptr<FPDAction>(const FPDActionRequest &request)> act;
  std::function<std::shared_ptr<FPDThumbnails>(const std::vector<std::string> &identifiers, CGSize size)>
      fetchThumbnails;
  std::vector<std::string> filled;  // the containers whose thumbnails the desktop was given
  std::function<void(const std::optional<std::string> &, const NSFileProviderItemCompletion &)>
      defaultContainer;
  std::map<std::string, std::function<std::shared_ptr<FPDService>(const std::string &identifier)>> services;
  std::vector<FPDActionRequest> requests;                                      // of actions
  std::function<void(const std::string &container, std::size_t page)> onPage;  // before it is answered
  std::shared_ptr<FPDWatchObserver> observer;
  bool firstPageWasByDate = false;
};

// A providing that ends when the test says, or as cancelled. Thread contract: any thread.
class ScriptedProviding final : public FPDProviding {
 public:
  void waitWithReply(NSFileProviderErrorCompletion completion) override;
  void cancel() override;
  void end(const NSError &error);
  bool wasCancelled() const { return wasCancelled_; }

 private:
  std::atomic<bool> wasCancelled_{false};
  Mutex lock_;
  std::optional<NSError> outcome_ GUARDED_BY(lock_);
  NSFileProviderErrorCompletion waiting_ GUARDED_BY(lock_);
};

// An action that ends when the test says, or, once it was begun, as cancelled. Thread contract: any thread.
class ScriptedAction final : public FPDAction {
 public:
  void waitWithReply(NSFileProviderItemCompletion completion) override;
  void getProgress(FPDProgressCompletion completion) override { completion(completed, total); }
  void cancel() override;
  void end(const std::shared_ptr<const NSFileProviderItem> &item, const NSError &error = {});
  void end(const NSFileProviderItemFields &fields) { end(std::make_shared<NSFileProviderPlainItem>(fields)); }
  bool wasCancelled() const { return wasCancelled_; }

  std::atomic<std::int64_t> completed{0};
  std::atomic<std::int64_t> total{-1};
  std::function<void()> onCancel;  // instead of ending as cancelled

 private:
  std::atomic<bool> wasCancelled_{false};
  FPDActionOutcome outcome_;
};

class ScriptedHostConnecting final : public ControlConnecting {
 public:
  explicit ScriptedHostConnecting(std::shared_ptr<ScriptedHost> host) : host_(std::move(host)) {}
  std::shared_ptr<FPDControlProtocol> control(NSXPCErrorHandler, NSError *error) override;
  void setEndHandler(std::function<void()> handler) override { endHandler = std::move(handler); }

  NSError failure;
  std::function<void()> endHandler;

 private:
  const std::shared_ptr<ScriptedHost> host_;
};

// A daemon that isn't there.
class AbsentDaemon final : public QVDaemonConnection {
 public:
  std::shared_ptr<QVProtocol> remoteObjectProxyWithErrorHandler(NSXPCErrorHandler handler) override;
  std::unique_ptr<QVSyncProxy> newSyncProxy() override { return nullptr; }
  void setInterruptionHandler(std::function<void()>) override {}
};

// What a command needs, with its output kept.
struct CommandFixture {
  CommandFixture();
  CommandContext context();
  int run(const std::function<int(CommandContext &)> &command);  // empties what was printed before

  std::shared_ptr<ScriptedHost> host = std::make_shared<ScriptedHost>();
  std::shared_ptr<ScriptedHostConnecting> connecting = std::make_shared<ScriptedHostConnecting>(host);
  std::shared_ptr<QVDaemonConnection> daemon = std::make_shared<AbsentDaemon>();
  std::ostringstream out;
  std::ostringstream err;
  std::function<bool()> stop = [] { return true; };
  bool isTerminal = false;
};

NSFileProviderItemFields item(const std::string &identifier, const std::string &name,
                              NSFileProviderItemKind kind = NSFileProviderItemKind::document);
NSFileProviderItemFields folder(const std::string &identifier, const std::string &name);

}  // namespace droxa::testing
