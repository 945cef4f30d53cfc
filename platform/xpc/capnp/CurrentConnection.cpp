#include "platform/xpc/capnp/CurrentConnection.h"

#include <utility>

#include "platform/xpc/capnp/Connection.h"

namespace droxa {
namespace {

thread_local std::shared_ptr<NSXPCConnection> current;

}  // namespace

CurrentConnectionScope::CurrentConnectionScope(const std::weak_ptr<XPCConnection> &connection)
    : previous_(std::exchange(current, connection.lock())) {}

CurrentConnectionScope::~CurrentConnectionScope() {
  current = std::move(previous_);
}

std::shared_ptr<NSXPCConnection> NSXPCConnection::currentConnection() {
  return current;
}

}  // namespace droxa
