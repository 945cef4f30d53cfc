#pragma once

#include <chrono>
#include <memory>
#include <string>

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
