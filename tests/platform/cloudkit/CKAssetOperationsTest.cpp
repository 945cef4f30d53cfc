#include "platform/cloudkit/CKFetchAssetOperation.h"
#include "platform/cloudkit/CKUploadAssetOperation.h"
#include "tests/platform/cloudkit/OperationFixture.h"

namespace droxa::contract {
namespace {

class CKAssetOperations : public OperationTest {
 protected:
  std::shared_ptr<CKFetchAssetOperation> fetching() {
    auto operation = make<CKFetchAssetOperation>();
    operation->asset = upload(*cloud, bytes).asset.reference();
    operation->sink = [this](std::span<const std::uint8_t> part) {
      got.append(reinterpret_cast<const char *>(part.data()), part.size());
      return NSError();
    };
    operation->fetchAssetCompletionBlock = [this](std::uint64_t, const NSError &) { ++completions; };
    return operation;
  }
  // A transfer that ends there.
  static FaultyCloud::Fault endingAt(std::uint64_t offset, NSError error) {
    FaultyCloud::Fault fault;
    fault.endsAt = offset;
    fault.errorAtEnd = std::move(error);
    return fault;
  }
  const std::string bytes = noise(5 * 1024 * 1024);
  std::string got;
  int completions = 0;
};

TEST_F(CKAssetOperations, aBrokenTransferIsResumedAndEveryByteComesOnce) {
  const auto operation = fetching();
  cloud->onCall(Call::readAsset, 1, endingAt(1000, CKErrorMake(CKErrorCode::networkFailure, "broken")));
  cloud->onCall(Call::readAsset, 2,
                endingAt(3'000'000, CKErrorMake(CKErrorCode::serviceUnavailable, "busy")));
  cloud->onCall(Call::readAsset, 3, endingAt(4'000'000, {}));  // short, and said to be whole
  EXPECT_OK(CKRunOperation(database, operation));
  EXPECT_TRUE(got == bytes);
  EXPECT_EQ(operation->attempts(), 4);
  EXPECT_EQ(operation->endOffset(), bytes.size());
  EXPECT_EQ(completions, 1);
}

TEST_F(CKAssetOperations, aTransferThatStandsStillIsGivenUpAndOneThatMovesIsNot) {
  const auto operation = fetching();
  FaultyCloud::Fault still = endingAt(2'000'000, {});
  still.hangsAtEnd = true;
  cloud->onNextCall(Call::readAsset, still);
  operation->configuration.timeoutIntervalForRequest = std::chrono::milliseconds(300);
  EXPECT_OK(CKRunOperation(database, operation));
  EXPECT_TRUE(got == bytes);
  EXPECT_GE(operation->attempts(), 2);
}

TEST_F(CKAssetOperations, wrongBytesAreToldAtTheEnd) {
  const auto operation = fetching();
  FaultyCloud::Fault wrong;
  wrong.wrongByteAt = 4'000'000;
  cloud->onNextCall(Call::readAsset, wrong);
  EXPECT_CODE(CKRunOperation(database, operation), assetNotAvailable);
  EXPECT_EQ(completions, 1);
}

TEST_F(CKAssetOperations, aTransferFromWithinIsVerifiedWithTheDigestOfWhatCameBefore) {
  for (const bool isRight : {true, false}) {
    got = bytes.substr(0, 1'000'000);
    CKDigest before;
    const std::string earlier = isRight ? got : std::string(got.size(), 'x');
    before.update({reinterpret_cast<const std::uint8_t *>(earlier.data()), earlier.size()});
    const auto operation = fetching();
    operation->offset = got.size();
    operation->digestBeforeOffset = before;
    const NSError error = CKRunOperation(database, operation);
    EXPECT_TRUE(got == bytes);
    EXPECT_TRUE(isRight ? !error : CKErrorIs(error, CKErrorCode::assetNotAvailable)) << error.description();
  }
}

TEST_F(CKAssetOperations, theSinksErrorIsFinalWhateverItIs) {
  for (const NSError &refused :
       {NSError("Disk", 28), CKErrorMake(CKErrorCode::networkFailure, "the sink's")}) {
    const auto operation = fetching();
    operation->sink = [&](std::span<const std::uint8_t>) { return refused; };
    EXPECT_EQ(CKRunOperation(database, operation), refused);
    EXPECT_EQ(operation->attempts(), 1);
    EXPECT_EQ(operation->endOffset(), 0U);
  }
}

TEST_F(CKAssetOperations, aTransferIsCancelledInItsMiddle) {
  const auto operation = fetching();
  FaultyCloud::Fault still = endingAt(1'000'000, {});
  still.hangsAtEnd = true;
  cloud->onNextCall(Call::readAsset, still);
  database.addOperation(operation);
  EXPECT_TRUE(eventually([&] { return cloud->hanging() == 1; }));
  operation->cancel();
  operation->waitUntilFinished();
  EXPECT_CODE(operation->error(), operationCancelled);
  EXPECT_EQ(operation->endOffset(), 1'000'000U);
  EXPECT_TRUE(got == bytes.substr(0, 1'000'000));
}

TEST_F(CKAssetOperations, anUploadIsRetriedAndAnswersAReference) {
  const MemoryFile file(bytes);
  const auto operation = make<CKUploadAssetOperation>();
  operation->file = CKAsset::assetWithDescriptor(file.descriptor(), nullptr);
  operation->uploadAssetCompletionBlock = [this](const CKAsset &, const NSError &) { ++completions; };
  FaultyCloud::Fault lost;
  lost.dropsReply = true;
  cloud->onNextCall(Call::uploadAsset, lost);
  EXPECT_OK(CKRunOperation(database, operation));
  EXPECT_EQ(operation->attempts(), 2);
  EXPECT_EQ(operation->uploadedAsset().reference(), (CKAssetReference{bytes.size(), digestOf(bytes)}));
  EXPECT_EQ(completions, 1);
}

TEST_F(CKAssetOperations, anUploadOfAnotherSizeOrOfNothingIsToldSo) {
  const MemoryFile file(bytes);
  const auto wrongSize = make<CKUploadAssetOperation>();
  wrongSize->file = CKAsset::assetWithDescriptor(file.descriptor(), nullptr);
  wrongSize->expectedSize = bytes.size() + 1;
  EXPECT_CODE(CKRunOperation(database, wrongSize), assetFileModified);
  EXPECT_FALSE(wrongSize->uploadedAsset());
  const auto nothing = make<CKUploadAssetOperation>();
  nothing->file = CKAsset::assetWithFileAtPath(world.folder() + "/nothing");
  EXPECT_CODE(CKRunOperation(database, nothing), assetFileNotFound);
}

}  // namespace
}  // namespace droxa::contract
