#pragma once

#include <gtest/gtest.h>
#include <memory>
#include <sys/socket.h>
#include <utility>

#include "platform/xpc/NSXPCConnection.h"

namespace droxa {

// The two ends of a connection inside one process, not resumed yet. Both are invalidated at the end.
struct ConnectedPair {
  std::shared_ptr<NSXPCConnection> server;
  std::shared_ptr<NSXPCConnection> client;

  ConnectedPair() {
    int ends[2] = {-1, -1};
    EXPECT_EQ(socketpair(AF_UNIX, SOCK_STREAM, 0, ends), 0);
    server = NSXPCConnection::connectionWithDescriptor(ends[0]);
    client = NSXPCConnection::connectionWithDescriptor(ends[1]);
  }
  ConnectedPair(const ConnectedPair &) = delete;
  ConnectedPair &operator=(const ConnectedPair &) = delete;
  ~ConnectedPair() {
    client->invalidate();
    server->invalidate();
  }

  // Exports `object` at the server and resumes both.
  template <class Protocol>
  void serve(const NSXPCInterface &interface, std::shared_ptr<Protocol> object) {
    server->setExportedObject(interface, std::move(object));
    client->setRemoteObjectInterface(interface);
    server->resume();
    client->resume();
  }
};

}  // namespace droxa
