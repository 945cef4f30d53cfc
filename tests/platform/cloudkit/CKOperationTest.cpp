#include <atomic>

#include "platform/cloudkit/CKContainer.h"
#include "platform/cloudkit/CKFetchRecordsOperation.h"
#include "platform/cloudkit/CKOperation.h"
#include "platform/oslog/os_log.h"
#include "tests/platform/cloudkit/OperationFixture.h"

namespace droxa::contract {
namespace {

// Fetching one record stands for every operation: the base class does what is tested here.
class CKOperationTest : public OperationTest {
 protected:
  std::shared_ptr<CKFetchRecordsOperation> fetching() {
    auto operation = make<CKFetchRecordsOperation>();
    operation->recordIDs = {item("a").recordID};
    operation->fetchRecordsCompletionBlock = [this](const auto &, const NSError &) { ++completions; };
    return operation;
  }
  int calls() const { return cloud->count(Call::fetchRecords); }
  std::atomic<int> completions{0};
};

TEST_F(CKOperationTest, transientErrorsAreRetriedUntilItWorks) {
  save(*cloud, item("a"));
  using enum CKErrorCode;
  int n = 0;
  for (const auto code :
       {networkUnavailable, networkFailure, serviceUnavailable, requestRateLimited, zoneBusy}) {
    cloud->onCall(Call::fetchRecords, ++n, failing(code));
  }
  const auto operation = fetching();
  EXPECT_OK(CKRunOperation(database, operation));
  EXPECT_EQ(operation->attempts(), 6);
  EXPECT_EQ(operation->results().size(), 1U);
  EXPECT_EQ(completions, 1);
}

TEST_F(CKOperationTest, otherErrorsAndForbiddenRetriesAreFinal) {
  using enum CKErrorCode;
  for (const auto code : {internalError, notAuthenticated, invalidArguments, quotaExceeded, limitExceeded}) {
    cloud->onNextCall(Call::fetchRecords, failing(code));
    const auto operation = fetching();
    EXPECT_TRUE(CKErrorIs(CKRunOperation(database, operation), code));
    EXPECT_EQ(operation->attempts(), 1);
  }
  cloud->onNextCall(Call::fetchRecords, failing(networkFailure));
  const auto operation = fetching();
  operation->configuration.allowsRetry = false;
  EXPECT_CODE(CKRunOperation(database, operation), networkFailure);
  EXPECT_EQ(operation->attempts(), 1);
  EXPECT_EQ(completions, 6);
}

TEST_F(CKOperationTest, theCloudsRetryAfterIsRespected) {
  save(*cloud, item("a"));
  FaultyCloud::Fault fault;
  fault.error =
      CKErrorMakeRetryAfter(CKErrorCode::requestRateLimited, "slowly", std::chrono::milliseconds(200));
  cloud->onNextCall(Call::fetchRecords, fault);
  const auto start = std::chrono::steady_clock::now();
  EXPECT_OK(CKRunOperation(database, fetching()));
  EXPECT_GE(std::chrono::steady_clock::now() - start, std::chrono::milliseconds(200));
}

TEST_F(CKOperationTest, aWaitBeyondTheDeadlineIsNotBegun) {
  FaultyCloud::Fault fault;
  fault.error = CKErrorMakeRetryAfter(CKErrorCode::requestRateLimited, "slowly", std::chrono::hours(1));
  cloud->onEveryCall(Call::fetchRecords, fault);
  const auto operation = fetching();
  EXPECT_EQ(CKRunOperation(database, operation), fault.error);
  EXPECT_EQ(operation->attempts(), 1);
}

TEST_F(CKOperationTest, retriesEndAtTheOperationsDeadline) {
  cloud->onEveryCall(failing(CKErrorCode::networkUnavailable));
  const auto operation = fetching();
  operation->configuration.timeoutIntervalForResource = std::chrono::milliseconds(150);
  operation->configuration.longestRetryDelay = std::chrono::milliseconds(20);
  EXPECT_CODE(CKRunOperation(database, operation), networkUnavailable);
  EXPECT_GT(operation->attempts(), 3);
  EXPECT_EQ(completions, 1);
}

TEST_F(CKOperationTest, anAttemptThatHangsIsGivenUpAndTriedAgain) {
  save(*cloud, item("a"));
  cloud->onNextCall(Call::fetchRecords, hanging());
  const auto operation = fetching();
  operation->configuration.timeoutIntervalForRequest = std::chrono::milliseconds(50);
  EXPECT_OK(CKRunOperation(database, operation));
  EXPECT_EQ(operation->attempts(), 2);
}

TEST_F(CKOperationTest, cancellingARunningCallEndsItSoon) {
  cloud->onNextCall(Call::fetchRecords, hanging());
  const auto operation = fetching();
  database.addOperation(operation);
  EXPECT_TRUE(eventually([&] { return cloud->hanging() == 1; }));
  const auto start = std::chrono::steady_clock::now();
  operation->cancel();
  operation->waitUntilFinished();
  EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(2));
  EXPECT_CODE(operation->error(), operationCancelled);
  EXPECT_EQ(completions, 1);
}

TEST_F(CKOperationTest, cancellingAWaitForARetryEndsItAtOnce) {
  cloud->onEveryCall(Call::fetchRecords, failing(CKErrorCode::serviceUnavailable));
  const auto operation = fetching();
  operation->configuration.timeoutIntervalForResource = std::chrono::hours(10);
  operation->configuration.initialRetryDelay = std::chrono::hours(1);
  operation->configuration.longestRetryDelay = std::chrono::hours(1);
  database.addOperation(operation);
  EXPECT_TRUE(eventually([&] { return calls() == 1; }));
  database.cancelAllOperations();
  operation->waitUntilFinished();
  EXPECT_CODE(operation->error(), operationCancelled);
  EXPECT_EQ(completions, 1);
}

TEST_F(CKOperationTest, oneCancelledBeforeItIsAddedStillAnswers) {
  const auto operation = fetching();
  operation->cancel();
  EXPECT_TRUE(operation->isCancelled());
  EXPECT_CODE(CKRunOperation(database, operation), operationCancelled);
  EXPECT_EQ(calls(), 0);
  EXPECT_EQ(completions, 1);
}

TEST_F(CKOperationTest, everyOneAnswersOnceWheneverItIsCancelled) {
  save(*cloud, item("a"));
  FaultyCloud::Fault slow;
  slow.delay = std::chrono::milliseconds(1);
  cloud->onEveryCall(Call::fetchRecords, slow);
  std::vector<std::shared_ptr<CKFetchRecordsOperation>> operations;
  for (int i = 0; i < 200; ++i) {
    operations.push_back(fetching());
    database.addOperation(operations.back());
    if (i % 2 == 0) operations[static_cast<std::size_t>(i) / 2]->cancel();
  }
  database.waitUntilAllOperationsAreFinished();
  EXPECT_EQ(completions, 200);
  for (const auto &operation : operations) {
    EXPECT_TRUE(!operation->error() || CKErrorIs(operation->error(), CKErrorCode::operationCancelled));
  }
}

TEST_F(CKOperationTest, oneIsRunOnceHoweverOftenItIsAdded) {
  const OSLogCapture log;
  const auto operation = fetching();
  database.addOperation(operation);
  database.addOperation(operation);
  operation->waitUntilFinished();
  database.waitUntilAllOperationsAreFinished();
  EXPECT_EQ(completions, 1);
  EXPECT_TRUE(log.contains("[CRIT] a database was given an operation that was added before"));
}

TEST_F(CKOperationTest, theSharedDatabaseHasNoZonesAndTakesNone) {
  const CKContainer container("documents", cloud);
  EXPECT_EQ(container.privateCloudDatabase()->cloud(), cloud);
  CKCloud &shared = *container.sharedCloudDatabase()->cloud();
  EXPECT_TRUE(shared.listZones(patiently()).zones.empty());
  EXPECT_CODE(shared.saveZone(kZone, patiently()), permissionFailure);
  EXPECT_CODE(fetch(shared, item("a").recordID).error, zoneNotFound);
  EXPECT_CODE(saveError(shared, item("a")), zoneNotFound);
  EXPECT_CODE(changes(shared).error, zoneNotFound);
}

}  // namespace
}  // namespace droxa::contract
