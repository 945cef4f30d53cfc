#pragma once

#include <atomic>
#include <functional>
#include <memory>
#include <string>

#include "fileproviderd/Actions.h"
#include "fileproviderd/DesktopThumbnailFiller.h"
#include "fileproviderd/FollowedContainers.h"
#include "fileproviderd/HostMount.h"
#include "fileproviderd/OpenListings.h"
#include "fileproviderd/PathResolver.h"
#include "fileproviderd/Providings.h"
#include "fileproviderd/Services.h"

namespace droxa {

// What the extension's process reaches in the host.
// Thread contract: any thread.
class HostSignalReceiver final : public NSFileProviderHostProtocol {
 public:
  HostSignalReceiver(std::shared_ptr<FollowedContainers> followed, std::shared_ptr<OpenListings> listings)
      : followed_(std::move(followed)), listings_(std::move(listings)) {}
  void signalEnumerator(const std::string &containerIdentifier,
                        NSFileProviderErrorCompletion completion) override;
  std::uint64_t signals() const { return signals_.load(); }

 private:
  const std::shared_ptr<FollowedContainers> followed_;
  const std::shared_ptr<OpenListings> listings_;
  std::atomic<std::uint64_t> signals_{0};
};

// What the clients of the host reach in it.
// Thread contract: any thread; completions on any thread.
class ControlService final : public FPDControlProtocol, public std::enable_shared_from_this<ControlService> {
 public:
  // Fills in what only the process itself knows: identifiers, times, launches.
  using StatusSource = std::function<FPDStatus()>;

  // Without a filler the desktop's cache is nobody's business here.
  ControlService(std::shared_ptr<ExtensionCalls> calls, std::shared_ptr<FollowedContainers> followed,
                 std::shared_ptr<OpenListings> listings, std::string replica, StatusSource status,
                 std::shared_ptr<DesktopThumbnailFiller> desktopThumbnails = nullptr);
  // Before the first client comes; without one the drive can't be mounted.
  void setMount(std::shared_ptr<HostMount> mount) { mount_ = std::move(mount); }
  const std::shared_ptr<Providings> &providings() const { return providings_; }

  void getStatus(FPDStatusCompletion completion) override;
  void itemForIdentifier(const std::string &identifier, NSFileProviderItemCompletion completion) override;
  void itemAtPath(const std::string &path, NSFileProviderItemCompletion completion) override;
  void URLForItemIdentifier(const std::string &identifier, NSFileProviderURLCompletion completion) override;
  void identifierForItemAtURL(const NSURL &url, NSFileProviderIdentifierCompletion completion) override;
  void enumeratorForContainer(const std::string &identifier,
                              NSFileProviderEnumeratorCompletion completion) override;
  void watchContainer(const std::string &identifier, std::shared_ptr<FPDWatchObserver> observer,
                      FPDWatchCompletion completion) override;
  void startProvidingItemWithIdentifier(const std::string &identifier, std::uint64_t readingOptions,
                                        FPDItemProvidingCompletion completion) override;
  void startProvidingItemAtPath(const std::string &path, std::uint64_t readingOptions,
                                FPDItemProvidingCompletion completion) override;
  void stopProvidingItemAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) override;
  void movingItemAtURL(const NSURL &url, const NSURL &destination,
                       NSFileProviderMovingCompletion completion) override;
  void performAction(const FPDActionRequest &request, FPDActionCompletion completion) override;
  void listenerEndpointForServiceName(const std::string &name, const std::string &itemIdentifier,
                                      FPDServiceCompletion completion) override;
  void fetchThumbnailsForItemIdentifiers(const std::vector<std::string> &identifiers, CGSize size,
                                         FPDThumbnailsCompletion completion) override;
  void defaultContainerForBundleIdentifier(const std::optional<std::string> &bundleIdentifier,
                                           NSFileProviderItemCompletion completion) override;
  void fillDesktopThumbnailsForContainer(const std::string &identifier,
                                         NSFileProviderErrorCompletion completion) override;

  void mountAtPath(const std::string &path, FPDMountCompletion completion) override;
  void unmount(NSFileProviderErrorCompletion completion) override;

  HostMount &mount() { return *mount_; }  // REQUIRES: setMount()

 private:
  std::shared_ptr<NSFileProviderRemoteEnumerator> relayed(
      const std::string &identifier, const std::shared_ptr<NSFileProviderRemoteEnumerator> &enumerator) const;

  const std::shared_ptr<ExtensionCalls> calls_;
  const std::shared_ptr<FollowedContainers> followed_;
  const std::shared_ptr<OpenListings> listings_;
  const std::shared_ptr<PathResolver> paths_;
  const std::shared_ptr<Providings> providings_;
  const Actions actions_;
  const std::shared_ptr<Services> services_;
  const StatusSource status_;
  const std::shared_ptr<DesktopThumbnailFiller> desktopThumbnails_;  // may be null
  std::shared_ptr<HostMount> mount_;                                 // constant after setMount()
};

}  // namespace droxa
