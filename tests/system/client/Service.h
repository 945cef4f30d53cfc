#pragma once

#include <atomic>
#include <functional>
#include <memory>
#include <string>

#include "platform/fileprovider/NSFileProviderRemote.h"
#include "platform/xpc/NSXPCConnection.h"
#include "tessaly/QVShareOperationProtocol.h"

namespace droxa::testing {

// Calls that were begun and how often each was answered. Thread contract: any thread.
class Tally {
 public:
  // What is to be called with the answer of one call, whatever it is.
  std::function<void()> begin();
  int unanswered() const { return made_ - answered_; }
  // Waits until every call has its answer, and prints what there was; 0 when each had exactly one.
  int finish();

 private:
  std::atomic<int> made_{0};
  std::atomic<int> answered_{0};
  std::atomic<int> twice_{0};
};

// The connection to fileproviderd; the program ends without it.
std::shared_ptr<NSXPCConnection> connectToHost(const std::string &home);

// The share operations of one item, over a connection of its own to the extension that ends with this
// object. Thread contract: one thread.
class Service {
 public:
  Service(NSXPCConnection &host, const std::string &path);
  ~Service();
  Service(const Service &) = delete;
  Service &operator=(const Service &) = delete;

  const NSError &error() const { return error_; }  // why it isn't open
  const NSURL &url() const { return url_; }        // the item's
  const std::shared_ptr<NSXPCConnection> &connection() const { return connection_; }
  // One for each call: `failed` is for that call alone.
  std::shared_ptr<QVShareOperationProtocol> remote(const NSXPCErrorHandler &failed) const;
  std::shared_ptr<QVShareOperationProtocol> waitingRemote(const NSXPCErrorHandler &failed) const;

 private:
  void open(NSXPCConnection &host, const std::string &path);

  NSError error_;
  NSURL url_;
  std::shared_ptr<FPDService> service_;
  std::shared_ptr<NSXPCConnection> connection_;
};

std::shared_ptr<FPDControlProtocol> waitingControl(NSXPCConnection &host, NSError *error);

}  // namespace droxa::testing
