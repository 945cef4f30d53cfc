#pragma once

// What the fuzz targets of exported services share: a client's bytes, sent to a connection that exports the
// service. Whatever they are, the connection ends when the client has closed, and the process goes on. The
// input's first byte says how much of a real client's bytes comes before the rest of the input.

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <cstdlib>
#include <memory>
#include <mutex>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>
#include <vector>

#include "platform/oslog/os_log.h"
#include "platform/xpc/NSXPCConnection.h"

namespace droxa::fuzz {

struct Ended {
  std::mutex mutex;
  std::condition_variable condition;
  bool ended = false;
};

// What a real client writes that makes `calls` and has had no answer yet.
template <class Protocol, class Calls>
std::vector<std::uint8_t> recordClient(const NSXPCInterface &interface, const Calls &calls) {
  int ends[2];
  if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) != 0) std::abort();
  const auto client = NSXPCConnection::connectionWithDescriptor(ends[0]);
  client->setRemoteObjectInterface(interface);
  client->resume();
  calls(*client->remoteObjectProxyWithErrorHandler<Protocol>([](const NSError &) {}));
  std::vector<std::uint8_t> bytes;
  pollfd poller{ends[1], POLLIN, 0};
  while (poll(&poller, 1, 200) == 1) {
    std::uint8_t buffer[4096];
    const ssize_t count = read(ends[1], buffer, sizeof buffer);
    if (count <= 0) break;
    bytes.insert(bytes.end(), buffer, buffer + count);
  }
  client->invalidate();
  close(ends[1]);
  return bytes;
}

inline void sendAll(int socket, const std::uint8_t *bytes, std::size_t size) {
  while (size > 0) {
    const ssize_t count = send(socket, bytes, size, MSG_NOSIGNAL);
    if (count <= 0) return;
    bytes += count;
    size -= static_cast<std::size_t>(count);
  }
}

// Takes what is written to the peer, so that nobody waits for room.
inline void drain(int socket) {
  std::uint8_t buffer[4096];
  while (recv(socket, buffer, sizeof buffer, MSG_DONTWAIT) > 0) {
  }
}

// One input against an object of its own.
template <class Protocol>
void run(const NSXPCInterface &interface, std::shared_ptr<Protocol> object,
         const std::vector<std::uint8_t> &recorded, const std::uint8_t *data, std::size_t size) {
  static OSLogCapture *const quiet = new OSLogCapture();
  quiet->clear();

  int ends[2];
  if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) != 0) std::abort();
  const auto ended = std::make_shared<Ended>();
  const auto connection = NSXPCConnection::connectionWithDescriptor(ends[0]);
  connection->setExportedObject<Protocol>(interface, std::move(object));
  connection->setInvalidationHandler([ended] {
    const std::lock_guard<std::mutex> lock(ended->mutex);
    ended->ended = true;
    ended->condition.notify_all();
  });
  connection->resume();

  if (size > 0) {
    sendAll(ends[1], recorded.data(), recorded.size() * data[0] / 255);
    sendAll(ends[1], data + 1, size - 1);
  }
  shutdown(ends[1], SHUT_WR);
  std::unique_lock<std::mutex> lock(ended->mutex);
  for (int wait = 0; !ended->ended; ++wait) {
    if (wait > 500) std::abort();  // a peer that closed must end its connection
    ended->condition.wait_for(lock, std::chrono::milliseconds(10));
    drain(ends[1]);
  }
  close(ends[1]);
}

}  // namespace droxa::fuzz
