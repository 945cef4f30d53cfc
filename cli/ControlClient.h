#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "cli/CallResult.h"
#include "cli/ControlConnecting.h"

namespace droxa {

// The host's calls, each waited for, at most for the timeout.
// Thread contract: one thread.
class ControlClient {
 public:
  using Item = std::shared_ptr<const NSFileProviderItem>;
  using Enumerator = std::shared_ptr<NSFileProviderRemoteEnumerator>;
  struct Page {
    NSFileProviderItems items;
    NSData next;
  };
  // Contents on their way here.
  struct Provided {
    std::shared_ptr<FPDProviding> providing;
    NSURL url;  // where they are when it has ended
  };
  struct Changes {
    NSFileProviderItems updated;
    NSData anchor;
    bool moreComing = false;
  };

  ControlClient(std::shared_ptr<ControlConnecting> connecting, std::chrono::milliseconds timeout);

  CallResult<FPDStatus> status();
  CallResult<Item> item(const std::string &identifier);
  CallResult<Item> itemAtPath(const std::string &path);
  CallResult<NSURL> url(const std::string &identifier);
  CallResult<Enumerator> enumerator(const std::string &identifier);
  CallResult<std::shared_ptr<FPDWatch>> watch(const std::string &identifier,
                                              std::shared_ptr<FPDWatchObserver> observer);

  CallResult<Provided> startProviding(const std::string &identifier, std::uint64_t readingOptions);

  // An action that hasn't begun: it does when it is waited for (cli/Acting.h).
  CallResult<std::shared_ptr<FPDAction>> performAction(const FPDActionRequest &request);

  // Thumbnails that are fetched once the next ones are asked for (cli/Thumbnail.cpp).
  CallResult<std::shared_ptr<FPDThumbnails>> fetchThumbnails(const std::vector<std::string> &identifiers,
                                                             CGSize size);
  // However long it takes.
  NSError fillDesktopThumbnails(const std::string &container,
                                const std::function<bool(std::chrono::milliseconds)> &waitForStop,
                                bool *wasStopped);
  // nullopt: of no application.
  CallResult<Item> defaultContainer(const std::optional<std::string> &application);
  // A service on the item, to be held until the first reply over its connection has come.
  CallResult<std::shared_ptr<FPDService>> service(const std::string &name, const std::string &identifier);

  CallResult<std::string> mount(const std::string &path);  // where it is mounted now
  NSError unmount();

  CallResult<Page> page(const Enumerator &enumerator, const NSData &page);
  CallResult<NSData> anchor(const Enumerator &enumerator);
  CallResult<Changes> changes(const Enumerator &enumerator, const NSData &anchor);

  const std::shared_ptr<ControlConnecting> &connecting() const { return connecting_; }

 private:
  const std::shared_ptr<ControlConnecting> connecting_;
  const std::chrono::milliseconds timeout_;
};

}  // namespace droxa
