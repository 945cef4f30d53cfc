#include "platform/xpc/capnp/Loop.h"

#include <condition_variable>
#include <cstdlib>
#include <kj/debug.h>
#include <signal.h>
#include <sys/eventfd.h>
#include <unistd.h>

namespace droxa {
namespace {

// What the library has to say goes to the log, and no stack traces are collected.
class LogCallback final : public kj::ExceptionCallback {
 public:
  void logMessage(kj::LogSeverity severity, const char *, int, int, kj::String &&text) override {
    if (severity >= kj::LogSeverity::ERROR) {
      os_log_error(xpcLog(), "[ERROR] %s", text.cStr());
    } else {
      os_log_debug(xpcLog(), "[DEBUG] %s", text.cStr());
    }
  }
  StackTraceMode stackTraceMode() override { return StackTraceMode::NONE; }
};

// The library changes the disposition of SIGPIPE when it starts; it is given back, because the loop's thread
// blocks every signal anyway.
class KeptDisposition {
 public:
  KeptDisposition() { sigaction(SIGPIPE, nullptr, &kept_); }
  ~KeptDisposition() { sigaction(SIGPIPE, &kept_, nullptr); }
  KeptDisposition(const KeptDisposition &) = delete;
  KeptDisposition &operator=(const KeptDisposition &) = delete;

 private:
  struct sigaction kept_ = {};
};

}  // namespace

os_log_t xpcLog() {
  static const os_log_t log = os_log_create("com.quorva.platform", "xpc");
  return log;
}

XPCLoop &XPCLoop::shared() {
  static XPCLoop *const loop = new XPCLoop;
  return *loop;
}

XPCLoop::XPCLoop() : wake_(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {
  xpcLog();
  Mutex mutex;
  std::condition_variable_any changed;
  bool started = false;
  sigset_t all;
  sigset_t previous;
  sigfillset(&all);
  pthread_sigmask(SIG_SETMASK, &all, &previous);
  std::thread thread([&] {
    {
      const KeptDisposition kept;
      context_ = new kj::AsyncIoContext(kj::setupAsyncIo());
    }
    pthread_setname_np(pthread_self(), "xpc-loop");
    {
      const Lock lock(mutex);
      thread_ = pthread_self();
      started = true;
      changed.notify_all();
    }
    threadMain();
  });
  pthread_sigmask(SIG_SETMASK, &previous, nullptr);
  {
    const Lock lock(mutex);
    while (!started) changed.wait(mutex);
  }
  static std::thread *const kept = new std::thread(std::move(thread));
  static XPCLoop *const self = this;
  std::atexit([] {
    self->stop();
    kept->join();
  });
}

void XPCLoop::threadMain() {
  LogCallback callback;
  kj::UnixEventPort::FdObserver observer(context_->unixEventPort, wake_,
                                         kj::UnixEventPort::FdObserver::OBSERVE_READ);
  auto stopping = kj::newPromiseAndFulfiller<void>();
  stopped_ = kj::mv(stopping.fulfiller);
  cycle(observer).exclusiveJoin(kj::mv(stopping.promise)).wait(context_->waitScope);
}

kj::Promise<void> XPCLoop::cycle(kj::UnixEventPort::FdObserver &observer) {
  auto ready = observer.whenBecomesReadable();  // before the queue is read, so that no post is missed
  drain();
  return ready.then([this, &observer] { return cycle(observer); });
}

void XPCLoop::drain() {
  std::uint64_t count = 0;
  while (read(wake_, &count, sizeof count) < 0 && errno == EINTR) {
  }
  std::vector<Task> tasks = takeTasks();
  runTasks(tasks);
  if (isStopping_) end();
}

std::vector<XPCLoop::Task> XPCLoop::takeTasks() {
  const Lock lock(mutex_);
  return std::exchange(tasks_, {});
}

void XPCLoop::runTasks(std::vector<Task> &tasks) {
  for (Task &task : tasks) {
    KJ_IF_MAYBE (problem, kj::runCatchingExceptions([&task] { task(); })) {
      os_log_fault(xpcLog(), "[CRIT] Assertion failed: no exception on the loop (%s)",
                   problem->getDescription().cStr());
    }
  }
}

// Every task that was accepted is run, so that nobody waits for one that isn't.
void XPCLoop::end() {
  for (;;) {
    std::vector<Task> tasks;
    {
      const Lock lock(mutex_);
      over_ = tasks_.empty();
      if (over_) break;
      tasks.swap(tasks_);
    }
    runTasks(tasks);
  }
  for (XPCLoopResident *resident : residents_) resident->loopDidEnd();
  stopped_->fulfill();
}

bool XPCLoop::post(Task task) {
  {
    const Lock lock(mutex_);
    tasks_.push_back(kj::mv(task));
    if (over_) return false;
    if (tasks_.size() > 1) return true;  // whoever made it non-empty wakes the loop
  }
  const std::uint64_t one = 1;
  while (write(wake_, &one, sizeof one) < 0 && errno == EINTR) {
  }
  return true;
}

void XPCLoop::run(Task task) {
  if (isCurrent()) {
    task();
    return;
  }
  struct State {
    Mutex mutex;
    std::condition_variable_any changed;
    bool done GUARDED_BY(mutex) = false;
  };
  const auto state = std::make_shared<State>();
  const bool posted = post([state, task = kj::mv(task)]() mutable {
    task();
    const Lock lock(state->mutex);
    state->done = true;
    state->changed.notify_all();
  });
  if (!posted) return;
  Lock lock(state->mutex);
  while (!state->done) state->changed.wait(state->mutex);
}

void XPCLoop::stop() {
  post([this] { isStopping_ = true; });
}

}  // namespace droxa
