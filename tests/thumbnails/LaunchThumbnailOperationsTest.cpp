#include "tests/thumbnails/ThumbnailsFixture.h"
#include "thumbnails/QVThumbnailFetching.h"

namespace droxa {
namespace {

// The parts of a fetch by themselves.
class LaunchThumbnailOperations : public ThumbnailsTest {
 protected:
  static std::vector<CKRecordID> records(int count) {
    std::vector<CKRecordID> list;
    for (int i = 0; i < count; ++i) list.push_back({std::to_string(i), kDrive});
    return list;
  }
  std::vector<std::size_t> batches(int count) {
    std::vector<std::size_t> sizes;
    QVThumbnailFetching::batchRecordIDsToFetchThumbnails(
        records(count), [&sizes](const std::vector<CKRecordID> &batch) { sizes.push_back(batch.size()); });
    return sizes;
  }
  const std::shared_ptr<CKContainer> container = std::make_shared<CKContainer>("test", cloud);
};

TEST_F(LaunchThumbnailOperations, batchesHoldAtMostTheLimit) {
  setLimit(4);
  EXPECT_EQ(batches(0), std::vector<std::size_t>{});
  EXPECT_EQ(batches(3), std::vector<std::size_t>{3});
  EXPECT_EQ(count("batching request"), 0U);
  EXPECT_EQ(batches(4), std::vector<std::size_t>{4});
  EXPECT_EQ(count("batching request"), 1U);
  EXPECT_EQ(batches(5), (std::vector<std::size_t>{4, 1}));
  EXPECT_EQ(batches(8), (std::vector<std::size_t>{4, 4}));
}

TEST_F(LaunchThumbnailOperations, withoutAnOperationItEndsWithoutAnError) {
  const Once<NSError> done("completion");
  QVThumbnailFetching::launchNewFetchThumbnailOperationFrom(
      std::make_shared<QVThumbnailOperations>(), container, CKErrorMake(CKErrorCode::internalError, "before"),
      done.completion());
  EXPECT_EQ(done.value<0>(), NSError());
  EXPECT_EQ(logged(), Lines{"error: [ERROR] no new fetch thumbnail operation found, returning."});
}

TEST_F(LaunchThumbnailOperations, thePreviousErrorIsCarried) {
  const auto operations = std::make_shared<QVThumbnailOperations>();
  operations->append(std::make_shared<CKFetchRecordsOperation>(), kDrive);
  const NSError before = CKErrorMake(CKErrorCode::internalError, "before");
  const Once<NSError> done("completion");
  QVThumbnailFetching::launchNewFetchThumbnailOperationFrom(operations, container, before, done.completion());
  EXPECT_EQ(done.value<0>(), before);
}

TEST_F(LaunchThumbnailOperations, aZoneOfSomebodyElsesIsAskedOfTheSharedDatabase) {
  const auto operation = std::make_shared<CKFetchRecordsOperation>();
  operation->recordIDs = {{"a", {"drive", "alice"}}};
  const auto operations = std::make_shared<QVThumbnailOperations>();
  operations->append(operation, {"drive", "alice"});
  const Once<NSError> done("completion");
  QVThumbnailFetching::launchNewFetchThumbnailOperationFrom(operations, container, {}, done.completion());
  EXPECT_TRUE(done.value<0>());
  EXPECT_EQ(cloud->count(Call::fetchRecords), 0) << "the private database";
  const auto shared = std::dynamic_pointer_cast<FaultyCloud>(container->sharedCloudDatabase()->cloud());
  ASSERT_TRUE(shared);
  EXPECT_EQ(shared->count(Call::fetchRecords), 1);
}

}  // namespace
}  // namespace droxa
