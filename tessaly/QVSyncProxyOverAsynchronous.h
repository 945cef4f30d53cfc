#pragma once

#include <functional>
#include <memory>

#include "tessaly/QVDaemonConnection.h"

namespace droxa {

// Makes asynchronous proxies of the daemon.
using QVProxyMaker = std::function<std::shared_ptr<QVProtocol>(NSXPCErrorHandler handler)>;

// A synchronous proxy over asynchronous ones, for ways to the daemon that have none of their own: each call
// waits until its reply or its error handler was called, and runs the reply on the calling thread.
std::unique_ptr<QVSyncProxy> QVSyncProxyOverAsynchronous(QVProxyMaker maker);

}  // namespace droxa
