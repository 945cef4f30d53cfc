#pragma once

#include <kj/async-io.h>
#include <kj/async-unix.h>
#include <kj/function.h>
#include <memory>
#include <pthread.h>
#include <thread>
#include <utility>
#include <vector>

#include "platform/foundation/ThreadSafety.h"
#include "platform/oslog/os_log.h"

namespace droxa {

os_log_t xpcLog();  // "com.quorva.platform", "xpc"

// The one thread of the process on which every object of the RPC library is made, used and destroyed. It
// starts with its first use and ends at the process's exit; what lives on it then is left as it is. No code
// of a user runs on it.
//
// Thread contract: post(), run() and isCurrent() on any thread, everything else on the loop.
class XPCLoop {
 public:
  using Task = kj::Function<void()>;

  static XPCLoop &shared();
  XPCLoop(const XPCLoop &) = delete;
  XPCLoop &operator=(const XPCLoop &) = delete;

  // Tasks of one thread run in the order in which it posted them. Once the process exits they are kept, and
  // false is returned.
  bool post(Task task);
  // Posts the task and waits until it has run. Runs it at once on the loop itself.
  void run(Task task);
  bool isCurrent() const { return pthread_equal(pthread_self(), thread_) != 0; }

  kj::LowLevelAsyncIoProvider &io() { return *context_->lowLevelProvider; }
  kj::UnixEventPort &eventPort() { return context_->unixEventPort; }
  kj::Timer &timer() { return context_->provider->getTimer(); }

 private:
  XPCLoop();
  void threadMain();
  void stop();
  kj::Promise<void> cycle(kj::UnixEventPort::FdObserver &observer);
  void drain();

  const int wake_;
  pthread_t thread_ = {};
  // Never destroyed: objects that outlive the loop's thread may still point into it.
  kj::AsyncIoContext *context_ = nullptr;
  kj::Own<kj::PromiseFulfiller<void>> stopped_;

  Mutex mutex_;
  std::vector<Task> tasks_ GUARDED_BY(mutex_);
  bool over_ GUARDED_BY(mutex_) = false;
};

// Destroys an object on the loop, whoever lets go of it last.
struct XPCLoopDeleter {
  template <class T>
  void operator()(T *object) const {
    XPCLoop &loop = XPCLoop::shared();
    if (loop.isCurrent()) {
      delete object;
    } else {
      loop.post([object] { delete object; });
    }
  }
};

template <class T, class... Arguments>
std::shared_ptr<T> makeSharedOnLoop(Arguments &&...arguments) {
  return std::shared_ptr<T>(new T(std::forward<Arguments>(arguments)...), XPCLoopDeleter());
}

}  // namespace droxa
