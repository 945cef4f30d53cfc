#pragma once

#include <condition_variable>
#include <functional>
#include <gtest/gtest.h>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <tuple>
#include <utility>

#include "tests/support/Eventually.h"

namespace droxa {

// A completion that must be called exactly once: a second call, and none at all by the time the Once is gone,
// fail the test. `Args` are the values that the completion takes, without references:
//
//   Once<QVQueryItems, std::uint64_t, NSError> page("page");
//   daemon->enumerateItemsInFolder(folder, 0, 0, 200, page.completion());
//   EXPECT_EQ(page.value<2>(), NSError());
//
// Thread contract: the completion on any thread; the Once on the test's.
template <class... Args>
class Once {
 public:
  explicit Once(std::string what) : state_(std::make_shared<State>(std::move(what))) {}
  ~Once() {
    if (calls() == 0) ADD_FAILURE() << state_->what << ": never called";
  }
  Once(const Once &) = delete;
  Once &operator=(const Once &) = delete;

  auto completion() const {
    return [state = state_](const Args &...args) { state->call(args...); };
  }

  int calls() const {
    const std::lock_guard<std::mutex> lock(state_->mutex);
    return state_->calls;
  }
  bool called() const { return calls() > 0; }

  // Whether it has been called before the deadline.
  bool wait() const {
    std::unique_lock<std::mutex> lock(state_->mutex);
    return state_->condition.wait_for(lock, kTestDeadline, [this] { return state_->calls > 0; });
  }
  // The values of the call; waits for it. Default values, and a failed test, when it doesn't come.
  std::tuple<Args...> values() const {
    if (!wait()) {
      ADD_FAILURE() << state_->what << ": not called before the deadline";
      return {};
    }
    const std::lock_guard<std::mutex> lock(state_->mutex);
    return *state_->values;
  }
  template <std::size_t I>
  auto value() const {
    return std::get<I>(values());
  }

 private:
  struct State {
    explicit State(std::string name) : what(std::move(name)) {}
    void call(const Args &...args) {
      const std::lock_guard<std::mutex> lock(mutex);
      if (++calls > 1) ADD_FAILURE() << what << ": called " << calls << " times";
      if (!values) values.emplace(args...);
      condition.notify_all();
    }
    const std::string what;
    std::mutex mutex;
    std::condition_variable condition;
    int calls = 0;
    std::optional<std::tuple<Args...>> values;
  };
  const std::shared_ptr<State> state_;
};

// `block`, which must be called exactly once: a second call fails the test and isn't passed on; so does
// dropping the last copy uncalled.
template <class... Args>
std::function<void(Args...)> exactlyOnce(std::string what, std::function<void(Args...)> block) {
  struct State {
    State(std::string name, std::function<void(Args...)> inner)
        : what(std::move(name)), block(std::move(inner)) {}
    ~State() {
      if (block) ADD_FAILURE() << what << ": dropped without a call";
    }
    const std::string what;
    std::mutex mutex;
    std::function<void(Args...)> block;
  };
  auto state = std::make_shared<State>(std::move(what), std::move(block));
  return [state](Args... args) {
    std::function<void(Args...)> once;
    {
      const std::lock_guard<std::mutex> lock(state->mutex);
      once = std::exchange(state->block, nullptr);
    }
    if (!once) {
      ADD_FAILURE() << state->what << ": called again";
      return;
    }
    once(args...);
  };
}

}  // namespace droxa
