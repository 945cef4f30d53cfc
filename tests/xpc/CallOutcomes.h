#pragma once

#include <algorithm>
#include <gtest/gtest.h>
#include <memory>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "platform/fileprovider/NSFileProviderRemote.h"
#include "platform/xpc/NSXPCConnection.h"
#include "tests/support/Eventually.h"

namespace droxa {

// Counts how each of many calls ended: by its reply or its error handler, and that it was by one of them,
// once. Thread contract: the functions made here on any thread; everything else on the test's.
class CallOutcomes {
 public:
  struct State {
    std::mutex mutex;
    std::vector<int> ends;
    int replies = 0;
    std::vector<NSError> failures;
    std::vector<std::string> order;
  };

  // Calls the host through a proxy of its own.
  void call(const std::shared_ptr<NSXPCConnection> &connection, const std::string &identifier) {
    std::size_t number = 0;
    {
      const std::lock_guard<std::mutex> lock(state_->mutex);
      number = state_->ends.size();
      state_->ends.push_back(0);
    }
    const auto state = state_;
    connection
        ->remoteObjectProxyWithErrorHandler<NSFileProviderHostProtocol>(
            [state, number](const NSError &error) {
              const std::lock_guard<std::mutex> lock(state->mutex);
              ++state->ends[number];
              state->failures.push_back(error);
              state->order.push_back("failure");
            })
        ->signalEnumerator(identifier, [state, number](const NSError &) {
          const std::lock_guard<std::mutex> lock(state->mutex);
          ++state->ends[number];
          ++state->replies;
        });
  }
  // Notes the connection's own ends in the same order.
  void follow(const std::shared_ptr<NSXPCConnection> &connection) {
    const auto note = [state = state_](const char *what) {
      return [state, what] {
        const std::lock_guard<std::mutex> lock(state->mutex);
        state->order.push_back(what);
      };
    };
    connection->setInterruptionHandler(note("interruption"));
    connection->setInvalidationHandler(note("invalidation"));
  }

  bool waitForAll() const {
    return eventually([this] {
      const std::lock_guard<std::mutex> lock(state_->mutex);
      for (const int ends : state_->ends) {
        if (ends == 0) return false;
      }
      return true;
    });
  }
  // Waits until the last of `order()` is `what`.
  bool waitForLast(const std::string &what) const {
    return eventually([&] {
      const auto all = order();
      return !all.empty() && all.back() == what;
    });
  }
  // Waits until `what` is in `order()`.
  bool waitFor(const std::string &what) const {
    return eventually([&] {
      const auto all = order();
      return std::find(all.begin(), all.end(), what) != all.end();
    });
  }
  void expectEachEndedOnce() const {
    const std::lock_guard<std::mutex> lock(state_->mutex);
    for (std::size_t number = 0; number < state_->ends.size(); ++number) {
      EXPECT_EQ(state_->ends[number], 1) << "call " << number;
    }
  }
  int replies() const {
    const std::lock_guard<std::mutex> lock(state_->mutex);
    return state_->replies;
  }
  std::vector<NSError> failures() const {
    const std::lock_guard<std::mutex> lock(state_->mutex);
    return state_->failures;
  }
  std::vector<std::string> order() const {
    const std::lock_guard<std::mutex> lock(state_->mutex);
    return state_->order;
  }
  std::vector<std::int64_t> codes() const {
    std::vector<std::int64_t> list;
    for (const NSError &error : failures()) list.push_back(error.code());
    return list;
  }

 private:
  const std::shared_ptr<State> state_ = std::make_shared<State>();
};

}  // namespace droxa
