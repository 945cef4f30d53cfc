#pragma once

#include <atomic>
#include <functional>
#include <memory>

#include "platform/xpc/capnp/Loop.h"

namespace droxa {

// Accepts what connects to a listening socket, on the loop, and hands each connected socket to the pool.
// Thread contract: any thread.
class AcceptLoop : public std::enable_shared_from_this<AcceptLoop> {
 public:
  using Accepted = std::function<void(int socket)>;  // called on the pool; takes ownership

  static std::shared_ptr<AcceptLoop> create(int socket);  // takes ownership
  ~AcceptLoop();
  AcceptLoop(const AcceptLoop &) = delete;
  AcceptLoop &operator=(const AcceptLoop &) = delete;

  void start(Accepted accepted);  // once
  void stop();                    // the socket is closed when it returns
  bool isOpen() const { return open_; }

 private:
  explicit AcceptLoop(int socket) : socket_(socket) {}
  kj::Promise<void> cycle();
  bool acceptAll();  // false when descriptors have run out

  const int socket_;
  std::atomic<bool> open_ = true;
  // The loop's.
  Accepted accepted_;
  kj::Own<kj::UnixEventPort::FdObserver> observer_;
  kj::Promise<void> work_ = nullptr;
};

}  // namespace droxa
