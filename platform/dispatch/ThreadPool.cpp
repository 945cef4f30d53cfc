#include "platform/dispatch/ThreadPool.h"

#include <cstdio>
#include <cstdlib>
#include <pthread.h>
#include <system_error>
#include <thread>

#define ASIO_STANDALONE
#include <asio/executor_work_guard.hpp>
#include <asio/io_context.hpp>
#include <asio/post.hpp>
#include <asio/steady_timer.hpp>

#include "platform/foundation/ThreadSafety.h"

namespace droxa {

struct ThreadPool::State {
  asio::io_context context;
  const asio::executor_work_guard<asio::io_context::executor_type> guard = asio::make_work_guard(context);

  mutable Mutex mutex;
  std::size_t threads GUARDED_BY(mutex) = 0;  // started and not ended
  std::size_t idle GUARDED_BY(mutex) = 0;     // of them: free to take a block or to wait for timers
  std::size_t waiting GUARDED_BY(mutex) = 0;  // blocks that no thread has taken yet
  std::size_t timers GUARDED_BY(mutex) = 0;   // that haven't fired

  // One idle thread is enough: it looks again when it takes a block. A burst of short blocks is thus mostly
  // run by the threads that there are, while blocks that wait bring up one thread after the other.
  bool lacksThread() const REQUIRES(mutex) {
    return idle == 0 && waiting + timers > 0 && threads < kMostThreads;
  }

  void startThreadIfLacking() REQUIRES(mutex);
  void runThread();
  bool mayEnd() EXCLUDES(mutex);
  void run(const dispatch_block_t &block) EXCLUDES(mutex);
  void timerFired(dispatch_block_t block) EXCLUDES(mutex);
  void post(dispatch_block_t block) EXCLUDES(mutex);
};

void ThreadPool::State::startThreadIfLacking() {
  if (!lacksThread()) return;
  try {
    std::thread([this] { runThread(); }).detach();
  } catch (const std::system_error &error) {
    if (threads > 0) return;  // the blocks wait for the threads that there are
    std::fprintf(stderr, "droxa: no thread can be started: %s\n", error.what());
    std::abort();
  }
  ++threads;
  ++idle;
}

void ThreadPool::State::runThread() {
  pthread_setname_np(pthread_self(), "droxa-pool");
  for (;;) {
    bool isOnlyIdle = false;
    {
      const Lock lock(mutex);
      isOnlyIdle = idle == 1;
    }
    // The last idle thread stays, without waking up from time to time.
    if (isOnlyIdle) {
      context.run_one();
    } else if (context.run_one_for(kIdleTime) == 0 && mayEnd()) {
      return;
    }
  }
}

bool ThreadPool::State::mayEnd() {
  const Lock lock(mutex);
  if (idle <= 1) return false;
  --idle;
  --threads;
  return true;
}

void ThreadPool::State::run(const dispatch_block_t &block) {
  {
    const Lock lock(mutex);
    --waiting;
    --idle;
    startThreadIfLacking();
  }
  block();
}

void ThreadPool::State::post(dispatch_block_t block) {
  {
    const Lock lock(mutex);
    ++waiting;
    startThreadIfLacking();
  }
  asio::post(context, [this, handed = std::move(block)]() mutable {
    {
      // What the block holds is released before the thread counts as idle: that may block as well.
      const dispatch_block_t taken = std::move(handed);
      run(taken);
    }
    const Lock lock(mutex);
    ++idle;
  });
}

void ThreadPool::State::timerFired(dispatch_block_t block) {
  {
    const Lock lock(mutex);
    --timers;
  }
  post(std::move(block));
}

ThreadPool &ThreadPool::shared() {
  static auto *pool = new ThreadPool;
  return *pool;
}

ThreadPool::ThreadPool() : state_(std::make_unique<State>()) {}

void ThreadPool::post(dispatch_block_t block) {
  state_->post(std::move(block));
}

void ThreadPool::postAfter(std::chrono::nanoseconds delay, dispatch_block_t block) {
  {
    const Lock lock(state_->mutex);
    ++state_->timers;
    state_->startThreadIfLacking();
  }
  auto timer = std::make_shared<asio::steady_timer>(state_->context, delay);
  timer->async_wait([state = state_.get(), timer, handed = std::move(block)](
                        const asio::error_code &) mutable { state->timerFired(std::move(handed)); });
}

std::size_t ThreadPool::threadCount() const {
  const Lock lock(state_->mutex);
  return state_->threads;
}

}  // namespace droxa
