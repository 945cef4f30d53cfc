#pragma once

#include <functional>
#include <memory>
#include <string>

#include "platform/foundation/NSError.h"

namespace droxa {

using NSFileProviderSignalCompletion =
    std::function<void(const NSError &error)>;  // exactly once, nil on success

// The extension's line to the framework's daemon.
// Thread contract: any thread; completions run on the line's threads.
class NSFileProviderHostLink {
 public:
  virtual ~NSFileProviderHostLink() = default;
  virtual void signalEnumeratorForContainerItemIdentifier(const std::string &identifier,
                                                          NSFileProviderSignalCompletion completion) = 0;
};

// Tells the framework that a container has changes to ask for.
// Thread contract: any thread.
class NSFileProviderManager {
 public:
  static NSFileProviderManager &defaultManager();

  // Completes with NSXPCConnectionInvalid (NSCocoaErrorDomain) when no host is connected.
  void signalEnumeratorForContainerItemIdentifier(const std::string &identifier,
                                                  NSFileProviderSignalCompletion completion);

  // Where signals go: set by NSExtensionMain when the host connects, by tests to a recording double.
  void setHostLink(std::shared_ptr<NSFileProviderHostLink> link);

  NSFileProviderManager();
  ~NSFileProviderManager();

 private:
  struct State;
  std::unique_ptr<State> state_;
};

}  // namespace droxa
