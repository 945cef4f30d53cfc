#include "platform/cloudkit/CKFetchRecordsOperation.h"
#include "platform/foundation/ReadFile.h"
#include "tests/platform/cloudkit/OperationFixture.h"

namespace droxa::contract {
namespace {

// Records whose assets are fetched along.
class CKFetchAssetsWithRecords : public OperationTest {
 protected:
  CKRecordID saveWithAsset(const std::string &name, const std::string &bytes) {
    CKRecord record = item(name);
    const int file = memfd_create("asset", MFD_CLOEXEC);
    EXPECT_EQ(write(file, bytes.data(), bytes.size()), static_cast<ssize_t>(bytes.size()));
    record.fields["asset"] = CKAsset::assetWithDescriptor(file, nullptr);
    close(file);
    return save(*cloud, record).recordID;
  }
  struct Told {
    CKRecordResult result;
    std::string bytes;  // of the asset's file, while the block had it
    NSURL url;
  };
  // In the order in which they were told.
  std::vector<Told> fetch(const std::vector<CKRecordID> &ids, std::uint64_t largest,
                          bool allowsRetry = true) {
    operation = make<CKFetchRecordsOperation>();
    operation->recordIDs = ids;
    operation->largestAssetToFetch = largest;
    operation->configuration.allowsRetry = allowsRetry;
    std::vector<Told> told;
    operation->perRecordCompletionBlock = [&told](const CKRecordResult &result) {
      Told one{result, {}, {}};
      if (const CKAsset *asset = result.record.get<CKAsset>("asset")) {
        one.url = asset->fileURL();
        if (one.url) one.bytes = ReadFile(one.url.path(), 1 << 20).bytes;
      }
      one.result.record = {};
      told.push_back(one);
    };
    outcome = CKRunOperation(database, operation);
    return told;
  }

  std::shared_ptr<CKFetchRecordsOperation> operation;
  NSError outcome;
};

TEST_F(CKFetchAssetsWithRecords, anAssetIsAFileForAsLongAsTheBlockHasIt) {
  const auto told = fetch({saveWithAsset("a", "the bytes")}, 100);
  EXPECT_OK(outcome);
  ASSERT_EQ(told.size(), 1U);
  EXPECT_EQ(told[0].bytes, "the bytes");
  const CKAsset *kept = operation->results()[0].record.get<CKAsset>("asset");
  ASSERT_TRUE(kept);
  EXPECT_TRUE(kept->isReference()) << "nothing is held open";
  EXPECT_FALSE(kept->fileURL());
}

TEST_F(CKFetchAssetsWithRecords, withoutBeingAskedForTheyStayReferences) {
  const CKRecordID id = saveWithAsset("a", "the bytes");
  operation = make<CKFetchRecordsOperation>();
  operation->recordIDs = {id};
  EXPECT_OK(CKRunOperation(database, operation));
  EXPECT_EQ(cloud->count(Call::readAsset), 0);
}

TEST_F(CKFetchAssetsWithRecords, aLargerAssetIsNotRead) {
  const auto told = fetch({saveWithAsset("a", "12345"), saveWithAsset("b", "1234")}, 4);
  ASSERT_EQ(told.size(), 2U);
  EXPECT_CODE(told[0].result.error, limitExceeded);
  EXPECT_FALSE(told[0].url);
  EXPECT_EQ(told[1].bytes, "1234");
  EXPECT_CODE(outcome, partialFailure);
  EXPECT_EQ(cloud->count(Call::readAsset), 1);
}

TEST_F(CKFetchAssetsWithRecords, onlyDesiredOnesAreRead) {
  const CKRecordID id = saveWithAsset("a", "the bytes");
  operation = make<CKFetchRecordsOperation>();
  operation->recordIDs = {id};
  operation->desiredKeys = {{"title"}};
  operation->largestAssetToFetch = 100;
  EXPECT_OK(CKRunOperation(database, operation));
  EXPECT_EQ(cloud->count(Call::readAsset), 0);
}

TEST_F(CKFetchAssetsWithRecords, whatBreaksOnTheWayIsFetchedAgain) {
  const CKRecordID id = saveWithAsset("a", "the bytes");
  cloud->onNextCall(Call::readAsset, failing(CKErrorCode::networkFailure));
  const auto told = fetch({id, saveWithAsset("b", "others")}, 100);
  EXPECT_OK(outcome);
  ASSERT_EQ(told.size(), 2U);
  EXPECT_EQ(told[0].bytes, "others");
  EXPECT_EQ(told[1].bytes, "the bytes");
}

TEST_F(CKFetchAssetsWithRecords, whereNothingIsTriedAgainItIsTheRecordsError) {
  const CKRecordID id = saveWithAsset("a", "the bytes");
  cloud->onNextCall(Call::readAsset, failing(CKErrorCode::networkFailure));
  const auto told = fetch({id}, 100, false);
  ASSERT_EQ(told.size(), 1U);
  EXPECT_CODE(told[0].result.error, networkFailure);
  EXPECT_CODE(outcome, partialFailure);
}

TEST_F(CKFetchAssetsWithRecords, otherBytesThanTheAssetsAreAnError) {
  const CKRecordID id = saveWithAsset("a", "the bytes");
  FaultyCloud::Fault wrong;
  wrong.wrongByteAt = 0;
  cloud->onNextCall(Call::readAsset, wrong);
  const auto told = fetch({id}, 100);
  ASSERT_EQ(told.size(), 1U);
  EXPECT_CODE(told[0].result.error, assetNotAvailable);
}

TEST_F(CKFetchAssetsWithRecords, cancellingEndsItInTheMiddleOfAnAsset) {
  const CKRecordID id = saveWithAsset("a", "the bytes");
  cloud->onNextCall(Call::readAsset, hanging());
  operation = make<CKFetchRecordsOperation>();
  operation->recordIDs = {id};
  operation->largestAssetToFetch = 100;
  int told = 0;
  operation->perRecordCompletionBlock = [&told](const CKRecordResult &) { ++told; };
  database.addOperation(operation);
  ASSERT_TRUE(eventually([&] { return cloud->hanging() == 1; }));
  operation->cancel();
  operation->waitUntilFinished();
  EXPECT_CODE(operation->error(), operationCancelled);
  EXPECT_EQ(told, 0);
}

TEST_F(CKFetchAssetsWithRecords, theContainerSaysForWhomOperationsRun) {
  CKDatabase own(cloud);
  own.setSourceApplicationBundleIdentifier("com.example");
  const auto unsaid = make<CKFetchRecordsOperation>(), said = make<CKFetchRecordsOperation>();
  said->configuration.sourceApplicationBundleIdentifier = "another";
  CKRunOperation(own, unsaid);
  CKRunOperation(own, said);
  EXPECT_EQ(unsaid->configuration.sourceApplicationBundleIdentifier, "com.example");
  EXPECT_EQ(said->configuration.sourceApplicationBundleIdentifier, "another");
}

}  // namespace
}  // namespace droxa::contract
