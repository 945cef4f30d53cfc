#include "platform/cloudkit/CKFetchRecordZoneChangesOperation.h"
#include "platform/cloudkit/CKFetchRecordsOperation.h"
#include "platform/cloudkit/CKModifyRecordsOperation.h"
#include "tests/platform/cloudkit/OperationFixture.h"

namespace droxa::contract {
namespace {

class CKRecordOperations : public OperationTest {
 protected:
  std::shared_ptr<CKModifyRecordsOperation> saving(std::vector<CKRecord> records, bool isAtomic = true) {
    auto operation = make<CKModifyRecordsOperation>();
    operation->request.recordsToSave = std::move(records);
    operation->request.isAtomic = isAtomic;
    operation->perRecordSaveBlock = [this](const CKRecordResult &result) { told.push_back(result); };
    operation->modifyRecordsCompletionBlock = [this](const CKModifyReply &) { ++completions; };
    return operation;
  }
  void dropNextReply() {
    FaultyCloud::Fault fault;
    fault.dropsReply = true;
    cloud->onNextCall(Call::modifyRecords, fault);
  }
  std::vector<CKRecordResult> told;
  int completions = 0;
};

TEST_F(CKRecordOperations, everyRecordIsToldOnceAndThenTheWhole) {
  save(*cloud, item("a"));
  const auto operation = make<CKFetchRecordsOperation>();
  operation->recordIDs = {item("a").recordID, item("b").recordID};
  operation->perRecordCompletionBlock = [this](const CKRecordResult &result) {
    EXPECT_EQ(completions, 0);
    told.push_back(result);
  };
  operation->fetchRecordsCompletionBlock = [this](const auto &results, const NSError &error) {
    ++completions;
    EXPECT_EQ(results.size(), 2U);
    EXPECT_CODE(error, partialFailure);
  };
  EXPECT_CODE(CKRunOperation(database, operation), partialFailure);
  EXPECT_EQ(completions, 1);
  ASSERT_EQ(told.size(), 2U);
  EXPECT_OK(told[0].error);
  EXPECT_CODE(told[1].error, unknownItem);
}

TEST_F(CKRecordOperations, moreRecordsThanACallTakesAreFetchedInSeveral) {
  save(*cloud, item("0"));
  const auto operation = make<CKFetchRecordsOperation>();
  for (std::size_t i = 0; i < CKMostRecordsPerCall + 5; ++i) {
    operation->recordIDs.push_back(item(std::to_string(i)).recordID);
  }
  cloud->onCall(Call::fetchRecords, 2, failing(CKErrorCode::networkFailure));
  EXPECT_CODE(CKRunOperation(database, operation), partialFailure);
  EXPECT_EQ(operation->results().size(), CKMostRecordsPerCall + 5);
  EXPECT_EQ(cloud->count(Call::fetchRecords), 3);
}

TEST_F(CKRecordOperations, savesAreToldWithTheirNewTags) {
  const auto operation = saving({item("a"), item("b")});
  EXPECT_OK(CKRunOperation(database, operation));
  ASSERT_EQ(told.size(), 2U);
  EXPECT_EQ(told[1].record, fetch(*cloud, item("b").recordID).record);
  EXPECT_EQ(completions, 1);
}

TEST_F(CKRecordOperations, aLostReplyIsNoConflictWithOneself) {
  const CKRecord old = save(*cloud, item("old"));
  CKRecord changed = old;
  changed.fields["title"] = std::string("changed");
  dropNextReply();
  const auto operation = saving({item("new"), changed});
  EXPECT_OK(CKRunOperation(database, operation));
  EXPECT_EQ(operation->attempts(), 2);
  ASSERT_EQ(told.size(), 2U);
  EXPECT_EQ(told[0].record, fetch(*cloud, item("new").recordID).record);
  EXPECT_EQ(told[1].record.fields, changed.fields);
  EXPECT_EQ(completions, 1);
}

TEST_F(CKRecordOperations, aLostReplyDoesntHideAConflictWithOthers) {
  save(*world.open("two"), item("theirs"));
  FaultyCloud::Fault lost;
  lost.error = CKErrorMake(CKErrorCode::networkFailure, "never got there");
  cloud->onNextCall(Call::modifyRecords, lost);
  EXPECT_CODE(CKRunOperation(database, saving({item("theirs")})), partialFailure);
  ASSERT_EQ(told.size(), 1U);
  EXPECT_CODE(told[0].error, serverRecordChanged);
}

TEST_F(CKRecordOperations, withoutALostReplyAnEqualRecordOfThisDeviceIsAConflict) {
  save(*cloud, item("a"));
  EXPECT_CODE(CKRunOperation(database, saving({item("a")})), partialFailure);
  EXPECT_CODE(told.at(0).error, serverRecordChanged);
}

TEST_F(CKRecordOperations, whatACallThatIsNotAtomicCouldntDoIsToldBesideWhatItDid) {
  save(*world.open("two"), item("theirs"));
  const auto operation = saving({item("theirs"), item("mine")}, false);
  operation->request.recordsToDelete = {{item("gone").recordID, {}}};
  int deletions = 0;
  operation->perRecordDeleteBlock = [&](const CKDeleteResult &result) {
    EXPECT_OK(result.error);
    ++deletions;
  };
  EXPECT_CODE(CKRunOperation(database, operation), partialFailure);
  EXPECT_EQ(told.size(), 2U);
  EXPECT_EQ(deletions, 1);
  EXPECT_EQ(operation->reply().saved.size(), 2U);
}

TEST_F(CKRecordOperations, allPagesOfChangesAreToldInOrder) {
  for (int i = 0; i < 5; ++i) save(*cloud, item(std::to_string(i)));
  const auto first = make<CKFetchRecordZoneChangesOperation>();
  std::vector<std::string> log;
  first->zoneID = kZone;
  first->resultsLimit = 2;
  first->recordWasChangedBlock = [&](const CKRecord &record) { log.push_back(record.recordID.recordName); };
  first->serverChangeTokenUpdatedBlock = [&](const CKServerChangeToken &) { log.emplace_back("token"); };
  cloud->onCall(Call::fetchZoneChanges, 2, failing(CKErrorCode::networkFailure));
  EXPECT_OK(CKRunOperation(database, first));
  EXPECT_EQ(log, (std::vector<std::string>{"0", "1", "token", "2", "3", "token", "4", "token"}));
  EXPECT_FALSE(first->moreComing());

  EXPECT_OK(removeError(*cloud, item("3").recordID));
  const auto second = make<CKFetchRecordZoneChangesOperation>();
  std::vector<CKDeletedRecord> deleted;
  second->zoneID = kZone;
  second->previousServerChangeToken = first->serverChangeToken();
  second->recordWithIDWasDeletedBlock = [&](const CKDeletedRecord &record) { deleted.push_back(record); };
  EXPECT_OK(CKRunOperation(database, second));
  ASSERT_EQ(deleted.size(), 1U);
  EXPECT_EQ(deleted[0].recordID, item("3").recordID);
}

TEST_F(CKRecordOperations, anErrorBetweenPagesKeepsTheTokenOfWhatWasTold) {
  for (int i = 0; i < 4; ++i) save(*cloud, item(std::to_string(i)));
  const auto operation = make<CKFetchRecordZoneChangesOperation>();
  int records = 0;
  operation->zoneID = kZone;
  operation->resultsLimit = 2;
  operation->recordWasChangedBlock = [&](const CKRecord &) { ++records; };
  operation->fetchRecordZoneChangesCompletionBlock = [this](const auto &token, bool more,
                                                            const NSError &error) {
    ++completions;
    EXPECT_TRUE(token);
    EXPECT_TRUE(more);
    EXPECT_CODE(error, notAuthenticated);
  };
  cloud->onCall(Call::fetchZoneChanges, 2, failing(CKErrorCode::notAuthenticated));
  EXPECT_CODE(CKRunOperation(database, operation), notAuthenticated);
  EXPECT_EQ(records, 2);
  EXPECT_EQ(completions, 1);
  EXPECT_EQ(changes(*cloud, operation->serverChangeToken()).changedRecords.size(), 2U);
}

}  // namespace
}  // namespace droxa::contract
