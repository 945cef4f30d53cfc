#pragma once

#include <functional>
#include <memory>

namespace droxa {

// A unit of work that an NSOperationQueue starts once and that may be cancelled at any time. It is finished
// when main() returns; an asynchronous one, which keeps no thread while it waits, when it says so.
// Thread contract: isCancelled(), cancel(), finish() on any thread; main() on the queue's threads.
class NSOperation {
 public:
  NSOperation();
  virtual ~NSOperation();
  virtual void main() = 0;
  virtual void cancel();  // marks it; one that hasn't started never runs
  virtual bool isAsynchronous() const { return false; }
  bool isCancelled() const;
  bool isFinished() const;
  void waitUntilFinished() const;

 protected:
  // REQUIRES: isAsynchronous(), and main() has been called. Once: in main() or at any time after it.
  void finish();

 private:
  friend class NSOperationQueue;
  struct State;
  std::unique_ptr<State> state_;
};

// Runs operations concurrently on the process's thread pool, each exactly once or, when cancelled before it
// starts, never.
// Thread contract: every member may be called on any thread.
class NSOperationQueue {
 public:
  NSOperationQueue();
  ~NSOperationQueue();  // doesn't wait: operations already started finish on their own
  void addOperation(std::shared_ptr<NSOperation> operation);
  void addOperationWithBlock(std::function<void()> block);
  void cancelAllOperations();
  void waitUntilAllOperationsAreFinished();
  std::size_t operationCount() const;

 private:
  struct State;
  std::shared_ptr<State> state_;
};

}  // namespace droxa
