#pragma once

#include <deque>
#include <functional>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "platform/dispatch/dispatch.h"
#include "platform/foundation/NSError.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// How the fake daemon answers: at once on the caller's thread, or on a thread of its own; now, or when the
// test releases the replies of that operation; with success or with the failure that the test asked for.
// Operations bear the names of the protocols' member functions. Thread contract: any thread.
class FakeReplies {
 public:
  FakeReplies();

  // Off (the default): an answer is given before the call returns.
  void answerOnAnotherThread(bool on);

  // The next call of the operation is answered with the error.
  void failNext(const std::string &operation, NSError error);
  NSError takeFailure(const std::string &operation);
  // The next call of the operation fails in transport: the error handler of its proxy is called instead.
  void failNextInTransport(const std::string &operation, NSError error);
  NSError takeTransportFailure(const std::string &operation);

  // Holds the operation's answers back until they are released.
  void hold(const std::string &operation);
  void release(const std::string &operation);  // those held, and holds no more
  std::size_t heldCount(const std::string &operation) const;
  void dropHeld();  // they are never given

  // Gives an answer, by these rules.
  void give(const std::string &operation, std::function<void()> answer);
  // Runs a block where answers run.
  void run(std::function<void()> block);

 private:
  static void checkName(const std::string &operation);

  const dispatch_queue_t queue_;
  mutable Mutex mutex_;
  bool elsewhere_ GUARDED_BY(mutex_) = false;
  std::map<std::string, std::deque<NSError>> failures_ GUARDED_BY(mutex_);
  std::map<std::string, std::deque<NSError>> transportFailures_ GUARDED_BY(mutex_);
  std::map<std::string, std::vector<std::function<void()>>> held_ GUARDED_BY(mutex_);
};

}  // namespace droxa
