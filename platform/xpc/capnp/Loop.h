#pragma once

#include <kj/async-io.h>
#include <kj/async-unix.h>
#include <kj/function.h>
#include <memory>
#include <pthread.h>
#include <thread>
#include <unordered_set>
#include <utility>
#include <vector>

#include "platform/foundation/ThreadSafety.h"
#include "platform/oslog/os_log.h"

namespace droxa {

os_log_t xpcLog();  // "com.quorva.platform", "xpc"

// What lives on the loop until it is destroyed there, or until the process exits.
// Thread contract: the loop.
class XPCLoopResident {
 public:
  // Nothing runs on the loop after this. Whoever waits for the loop has to be let go.
  virtual void loopDidEnd() = 0;

 protected:
  ~XPCLoopResident() = default;
};

// The one thread of the process on which every object of the RPC library is made, used and destroyed. It
// starts with its first use and ends at the process's exit; what lives on it then is left as it is, but those
// who wait for it are let go. No code of a user runs on it.
//
// Thread contract: post(), run() and isCurrent() on any thread, everything else on the loop.
class XPCLoop {
 public:
  using Task = kj::Function<void()>;

  static XPCLoop &shared();
  XPCLoop(const XPCLoop &) = delete;
  XPCLoop &operator=(const XPCLoop &) = delete;

  // Tasks of one thread run in the order in which it posted them. Once the loop has ended they are kept, for
  // good and untouched, and false is returned; a task for which true is returned is run.
  bool post(Task task);
  // Posts the task and waits until it has run. Runs it at once on the loop itself.
  void run(Task task);
  bool isCurrent() const { return pthread_equal(pthread_self(), thread_) != 0; }

  // From the first to the second the loop knows the object. What the kernel alone points to, as it does to a
  // quiet connection, counts as lost otherwise.
  void add(XPCLoopResident &resident) { residents_.insert(&resident); }
  void remove(XPCLoopResident &resident) { residents_.erase(&resident); }

  kj::LowLevelAsyncIoProvider &io() { return *context_->lowLevelProvider; }
  kj::UnixEventPort &eventPort() { return context_->unixEventPort; }
  kj::Timer &timer() { return context_->provider->getTimer(); }

 private:
  XPCLoop();
  void threadMain();
  void stop();
  kj::Promise<void> cycle(kj::UnixEventPort::FdObserver &observer);
  void drain();
  std::vector<Task> takeTasks();
  static void runTasks(std::vector<Task> &tasks);
  void end();

  const int wake_;
  pthread_t thread_ = {};
  // Never destroyed: objects that outlive the loop's thread may still point into it.
  kj::AsyncIoContext *context_ = nullptr;
  kj::Own<kj::PromiseFulfiller<void>> stopped_;
  std::unordered_set<XPCLoopResident *> residents_;
  bool isStopping_ = false;

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
