#include <atomic>
#include <future>
#include <gtest/gtest.h>
#include <vector>

#include "platform/foundation/NSOperationQueue.h"
#include "platform/oslog/os_log.h"
#include "tests/support/Eventually.h"

namespace droxa {
namespace {

class Counted : public NSOperation {
 public:
  void main() override { ++runs; }
  std::atomic<int> runs = 0;
};

// Runs until it is cancelled.
class Patient : public NSOperation {
 public:
  void main() override {
    started.set_value();
    EXPECT_TRUE(eventually([this] { return isCancelled(); }));
  }
  std::promise<void> started;
};

// Finishes when it is told, long after main().
class Asynchronous : public NSOperation {
 public:
  bool isAsynchronous() const override { return true; }
  void main() override { ++runs; }
  void end() { finish(); }
  std::atomic<int> runs = 0;
};

TEST(NSOperationQueue, anAsynchronousOperationIsFinishedWhenItSaysSo) {
  NSOperationQueue queue;
  const auto operation = std::make_shared<Asynchronous>();
  queue.addOperation(operation);
  EXPECT_TRUE(eventually([&] { return operation->runs == 1; }));
  EXPECT_FALSE(operation->isFinished());
  EXPECT_EQ(queue.operationCount(), 1U);
  operation->end();
  queue.waitUntilAllOperationsAreFinished();
  operation->waitUntilFinished();
  EXPECT_TRUE(operation->isFinished());
}

TEST(NSOperationQueue, anAsynchronousOperationThatNeverStartedIsFinished) {
  NSOperationQueue queue;
  const auto operation = std::make_shared<Asynchronous>();
  operation->cancel();
  queue.addOperation(operation);
  operation->waitUntilFinished();
  queue.waitUntilAllOperationsAreFinished();
  EXPECT_EQ(operation->runs, 0);
}

TEST(NSOperationQueue, runsEachOperationOnce) {
  NSOperationQueue queue;
  std::vector<std::shared_ptr<Counted>> operations;
  for (int i = 0; i < 50; ++i) {
    operations.push_back(std::make_shared<Counted>());
    queue.addOperation(operations.back());
  }
  queue.waitUntilAllOperationsAreFinished();
  EXPECT_EQ(queue.operationCount(), 0U);
  for (const auto &operation : operations) {
    EXPECT_EQ(operation->runs, 1);
    EXPECT_TRUE(operation->isFinished());
    EXPECT_FALSE(operation->isCancelled());
  }
}

TEST(NSOperationQueue, runsOperationsAtTheSameTime) {
  NSOperationQueue queue;
  constexpr int kTogether = 40;
  std::atomic<int> arrived = 0;
  std::atomic<int> met = 0;
  for (int i = 0; i < kTogether; ++i) {
    queue.addOperationWithBlock([&] {
      ++arrived;
      if (eventually([&] { return arrived == kTogether; })) ++met;
    });
  }
  queue.waitUntilAllOperationsAreFinished();
  EXPECT_EQ(met, kTogether);
}

TEST(NSOperationQueue, neverRunsAnOperationThatWasCancelledBefore) {
  NSOperationQueue queue;
  const auto operation = std::make_shared<Counted>();
  operation->cancel();
  queue.addOperation(operation);
  operation->waitUntilFinished();
  EXPECT_EQ(operation->runs, 0);
  EXPECT_TRUE(operation->isCancelled());
  EXPECT_TRUE(operation->isFinished());
}

TEST(NSOperationQueue, cancelsOperationsThatRun) {
  NSOperationQueue queue;
  const auto operation = std::make_shared<Patient>();
  queue.addOperation(operation);
  operation->started.get_future().wait();
  EXPECT_EQ(queue.operationCount(), 1U);
  EXPECT_FALSE(operation->isFinished());
  queue.cancelAllOperations();
  queue.waitUntilAllOperationsAreFinished();
  EXPECT_TRUE(operation->isFinished());
}

TEST(NSOperationQueue, anOperationOutlivesItsQueue) {
  const auto operation = std::make_shared<Patient>();
  {
    NSOperationQueue queue;
    queue.addOperation(operation);
  }
  operation->started.get_future().wait();
  operation->cancel();
  operation->waitUntilFinished();
}

TEST(NSOperationQueue, waitingForAnEmptyQueueReturns) {
  NSOperationQueue queue;
  queue.cancelAllOperations();
  queue.waitUntilAllOperationsAreFinished();
  EXPECT_EQ(queue.operationCount(), 0U);
}

TEST(NSOperationQueue, refusesAnOperationThatWasAddedBefore) {
  NSOperationQueue queue;
  const auto operation = std::make_shared<Counted>();
  queue.addOperation(operation);
  operation->waitUntilFinished();
  const OSLogCapture log;
  queue.addOperation(operation);
  queue.addOperation(nullptr);
  queue.waitUntilAllOperationsAreFinished();
  EXPECT_EQ(operation->runs, 1);
  EXPECT_EQ(log.texts(), (std::vector<std::string>{
                             "[CRIT] an operation queue was given an operation that was added before",
                             "[CRIT] an operation queue was given no operation"}));
}

}  // namespace
}  // namespace droxa
