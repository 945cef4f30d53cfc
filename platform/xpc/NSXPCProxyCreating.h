#pragma once

#include <functional>
#include <memory>

#include "platform/foundation/NSError.h"

namespace droxa {

// Called instead of a call's reply when the call can't be answered: the peer went away, the deadline passed,
// or the reply made no sense (NSCocoaErrorDomain, NSXPCConnection…). For each call exactly one of its reply
// and the error handler is called, once, on a thread of the pool. A call without a reply reports its failure
// the same way.
using NSXPCErrorHandler = std::function<void(const NSError &error)>;

// An object that crossed a connection, or stands in for one: makes proxies of itself.
template <class Protocol>
class NSXPCProxyCreating {
 public:
  virtual ~NSXPCProxyCreating() = default;
  virtual std::shared_ptr<Protocol> remoteObjectProxyWithErrorHandler(NSXPCErrorHandler handler) = 0;
};

// A proxy of `object` that reports failures to `handler`. Every object that was received over a connection
// can be asked; an object of this process never fails and is given back itself. A received object that was
// never asked reports failures to the handler of the proxy whose reply brought it; one that came as an
// argument, to the log.
template <class Protocol>
std::shared_ptr<Protocol> NSXPCProxyWithErrorHandler(const std::shared_ptr<Protocol> &object,
                                                     NSXPCErrorHandler handler) {
  if (auto maker = std::dynamic_pointer_cast<NSXPCProxyCreating<Protocol>>(object))
    return maker->remoteObjectProxyWithErrorHandler(std::move(handler));
  return object;
}

}  // namespace droxa
