#include "additions/NSError+QVFPAdditions.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "tessaly/QVErrors.h"
#include "tests/thumbnails/ThumbnailsFixture.h"

namespace droxa {
namespace {

class FetchThumbnails : public ThumbnailsTest {
 protected:
  static FaultyCloud::Fault failing(CKErrorCode code) {
    FaultyCloud::Fault fault;
    fault.error = CKErrorMake(code, "scripted");
    return fault;
  }
  std::vector<std::string> addDocuments(int count, const CKRecordZoneID &zone = kDrive) {
    std::vector<std::string> identifiers;
    for (int i = 0; i < count; ++i) {
      const std::string name = zone.zoneName + std::to_string(i);
      identifiers.push_back(addDocument(name, 10, "thumbnail of " + name, zone));
    }
    return identifiers;
  }
  static void expectNoSuchItem(const ThumbnailAnswer &answer) {
    EXPECT_FALSE(answer.data);
    EXPECT_EQ(answer.contentType, std::nullopt);
    EXPECT_EQ(answer.error, fileProviderErrorForNonExistentItemWithIdentifier(answer.identifier));
  }
};

TEST_F(FetchThumbnails, foldersAreAnsweredWithNoImageAndNoErrorAndThenThereIsNothingLeft) {
  const std::string one = daemon.addFolder("one").asString();
  const std::string two = daemon.addFolder("two").asString();
  const auto answers = fetch({one, two});
  ASSERT_EQ(answers->all().size(), 2U);
  for (const ThumbnailAnswer &answer : answers->all()) {
    EXPECT_FALSE(answer.data);
    EXPECT_EQ(answer.contentType, std::nullopt);
    EXPECT_EQ(answer.error, NSError());
  }
  EXPECT_EQ(answers->all()[0].identifier, one);
  EXPECT_EQ(answers->all()[1].identifier, two);
  EXPECT_EQ(answers->done.value<0>(), NSError());
  EXPECT_EQ(told(), (Lines{"debug: [DEBUG] ┏<1> starting fetch thumbnail for (" + one + ", " + two + ")",
                           "debug: [DEBUG] no thumbnail left to fetch"}));
  EXPECT_FALSE(progress->isCancellable());
  EXPECT_EQ(progress->totalUnitCount(), 0);
}

TEST_F(FetchThumbnails, anAliasIsAnsweredLikeAFolder) {
  const std::string alias = daemon.addAlias("alias").asString();
  const auto answers = fetch({alias});
  EXPECT_FALSE(answers->of(alias).data);
  EXPECT_EQ(answers->of(alias).error, NSError());
}

TEST_F(FetchThumbnails, whatIsNoIdentifierIsNoSuchItem) {
  const auto answers = fetch({"bogus"});
  expectNoSuchItem(answers->of("bogus"));
  EXPECT_EQ(answers->done.value<0>(), NSError());
}

TEST_F(FetchThumbnails, noIdentifiersAreDoneAtOnce) {
  EXPECT_EQ(fetch({})->done.value<0>(), NSError());
  EXPECT_TRUE(asked().empty());
}

TEST_F(FetchThumbnails, aDocumentGetsTheThumbnailOfItsRecord) {
  const std::string identifier = addDocument("a.png", 1000, "the picture");
  const auto answers = fetch({identifier});
  const ThumbnailAnswer answer = answers->of(identifier);
  EXPECT_EQ(answer.data, NSData::dataWithString("the picture"));
  EXPECT_EQ(answer.contentType, std::nullopt);
  EXPECT_EQ(answer.error, NSError());
  EXPECT_EQ(answers->done.value<0>(), NSError());
  EXPECT_TRUE(progress->isCancellable());
  EXPECT_EQ(daemon.log().count("startDownload"), 0U);
}

TEST_F(FetchThumbnails, theStepsAreLoggedInTheirOrder) {
  const std::string identifier = addDocument("a.png", 1000, "12345");
  fetch({identifier});
  Lines lines = told();
  ASSERT_EQ(lines.size(), 7U) << testing::PrintToString(lines);
  EXPECT_TRUE(lines[2].starts_with("debug: [DEBUG] scheduling operation <CKFetchRecordsOperation "));
  EXPECT_TRUE(lines[2].ends_with(" for zone: " + kDrive.description()));
  lines.erase(lines.begin() + 2);
  // The first section is the request's, the second its lookup's, the third the fetch's.
  EXPECT_EQ(lines, (Lines{"debug: [DEBUG] ┏<1> starting fetch thumbnail for (" + identifier + ")",
                          "debug: [DEBUG] ┣<3> fetching the thumbnails for: (" + identifier + " = " +
                              CKRecordID{"record of a.png", kDrive}.description() + ")",
                          "debug: [DEBUG] ┳<3> received a thumbnail callback for " + identifier,
                          "debug: [DEBUG] received a thumbnail of 5 bytes for " + identifier,
                          "debug: [DEBUG] completed fetching thumbnail batch for " + kDrive.description(),
                          "debug: [DEBUG] finished fetching all thumbnail batches"}));
}

TEST_F(FetchThumbnails, aHandlerIsNotNeeded) {
  const std::string identifier = addDocument("a.png", 1000, "the picture");
  const std::string unresolved = daemon.addDocument("b").asString();
  const Once<NSError> done("completion");
  extension->fetchThumbnailsForItemIdentifiers(
      {"bogus", daemon.addFolder("f").asString(), unresolved, identifier}, {64, 64}, nullptr,
      done.completion());
  EXPECT_EQ(done.value<0>(), NSError());
}

TEST_F(FetchThumbnails, aDocumentThatIsNotInTheCloudIsNoSuchItem) {
  const std::string known = addDocument("a.png", 1000, "the picture");
  const std::string unknown = daemon.addDocument("b").asString();
  const auto answers = fetch({unknown, known});
  expectNoSuchItem(answers->of(unknown));
  EXPECT_TRUE(answers->of(known).data);
  EXPECT_EQ(count("default: [WARNING] Couldn't resolve file objectID " + unknown), 1U);
}

TEST_F(FetchThumbnails, whenNothingResolvesItIsDone) {
  const std::string unknown = daemon.addDocument("b").asString();
  const auto answers = fetch({unknown});
  expectNoSuchItem(answers->of(unknown));
  EXPECT_EQ(answers->done.value<0>(), NSError());
  EXPECT_EQ(told().back(),
            "default: [WARNING] No thumbnails left to fetch after attempting to resolve content record ids");
  EXPECT_EQ(cloud->count(Call::fetchRecords), 0);
}

TEST_F(FetchThumbnails, theDaemonsErrorIsTranslatedAndEndsTheRequest) {
  const std::string identifier = addDocument("a.png", 1000, "the picture");
  const NSError refused = qvc_errorLoggedOut();
  daemon.replies().failNext("resolveFileObjectIDsToContentRecordIDs", refused);
  const auto answers = fetch({identifier});
  EXPECT_TRUE(answers->all().empty());
  EXPECT_EQ(answers->done.value<0>(), qv_fileProviderError(refused));
  EXPECT_EQ(
      count("error: [ERROR] can't get the record ids for (" + identifier + "): " + refused.description()),
      1U);
}

TEST_F(FetchThumbnails, aDaemonThatCannotBeReachedEndsTheRequest) {
  const std::string identifier = addDocument("a.png", 1000, "the picture");
  const NSError gone(NSCocoaErrorDomain, NSXPCConnectionInterrupted);
  daemon.replies().failNextInTransport("resolveFileObjectIDsToContentRecordIDs", gone);
  EXPECT_EQ(fetch({identifier})->done.value<0>(), gone);
}

TEST_F(FetchThumbnails, exactlyTheLimitGoesAsOneLoggedBatch) {
  setLimit(3);
  const auto identifiers = addDocuments(3);
  const auto answers = fetch(identifiers);
  for (const std::string &identifier : identifiers) EXPECT_TRUE(answers->of(identifier).data);
  EXPECT_EQ(count("[DEBUG] fetching thumbnails for more than 3 item identifiers, batching request"), 1U);
  EXPECT_EQ(count("scheduling operation"), 1U);
  EXPECT_EQ(cloud->count(Call::fetchRecords), 1);
}

TEST_F(FetchThumbnails, oneMoreThanTheLimitGoesAsTwo) {
  setLimit(3);
  const auto identifiers = addDocuments(4);
  const auto answers = fetch(identifiers);
  for (const std::string &identifier : identifiers) EXPECT_TRUE(answers->of(identifier).data);
  EXPECT_EQ(count("batching request"), 1U);
  EXPECT_EQ(count("[DEBUG] fetching next thumbnail batch"), 1U);
  EXPECT_EQ(cloud->count(Call::fetchRecords), 2);
}

TEST_F(FetchThumbnails, eachZoneIsFetchedByItself) {
  const CKRecordZoneID other{"other"};
  EXPECT_FALSE(embedded->saveZone(other, {}));
  auto identifiers = addDocuments(2);
  const auto more = addDocuments(2, other);
  identifiers.insert(identifiers.end(), more.begin(), more.end());
  const auto answers = fetch(identifiers);
  for (const std::string &identifier : identifiers) EXPECT_TRUE(answers->of(identifier).data);
  EXPECT_EQ(count("scheduling operation"), 2U);
  EXPECT_EQ(count("completed fetching thumbnail batch for " + other.description()), 1U);
}

TEST_F(FetchThumbnails, theErrorOfAFirstBatchIsCarriedPastASecondThatSucceeds) {
  setLimit(2);
  const auto identifiers = addDocuments(3);
  cloud->onNextCall(Call::fetchRecords, failing(CKErrorCode::internalError));
  const auto answers = fetch(identifiers);
  EXPECT_EQ(answers->all().size(), 1U);
  EXPECT_EQ(answers->done.value<0>(), failing(CKErrorCode::internalError).error);
  EXPECT_EQ(count("error: [ERROR] error while fetching thumbnail batch for " + kDrive.description()), 1U);
}

TEST_F(FetchThumbnails, theLastBatchThatFailsWins) {
  setLimit(1);
  const auto identifiers = addDocuments(3);
  cloud->onCall(Call::fetchRecords, 1, failing(CKErrorCode::internalError));
  cloud->onCall(Call::fetchRecords, 2, failing(CKErrorCode::permissionFailure));
  EXPECT_EQ(fetch(identifiers)->done.value<0>(), failing(CKErrorCode::permissionFailure).error);
}

TEST_F(FetchThumbnails, aNetworkFailureIsNotRetried) {
  const auto identifiers = addDocuments(1);
  cloud->onNextCall(Call::fetchRecords, failing(CKErrorCode::networkFailure));
  EXPECT_EQ(fetch(identifiers)->done.value<0>(), failing(CKErrorCode::networkFailure).error);
  EXPECT_EQ(cloud->count(Call::fetchRecords), 1);
}

TEST_F(FetchThumbnails, aRecordThatIsGoneIsAnErrorOfItsItemAndOfTheBatch) {
  auto identifiers = addDocuments(1);
  const QVFileObjectID gone = daemon.addDocument("gone");
  resolveTo(gone, {"no such record", kDrive});
  identifiers.push_back(gone.asString());
  const auto answers = fetch(identifiers);
  EXPECT_TRUE(answers->of(identifiers[0]).data);
  EXPECT_TRUE(CKErrorIs(answers->of(gone.asString()).error, CKErrorCode::unknownItem));
  EXPECT_TRUE(CKErrorIs(answers->done.value<0>(), CKErrorCode::partialFailure));
  EXPECT_EQ(count("error: [ERROR] error when fetching thumbnail for " + gone.asString()), 1U);
}

TEST_F(FetchThumbnails, aThumbnailWhoseBytesHaveVanishedIsAnErrorOfItsItem) {
  const auto identifiers = addDocuments(2);
  cloud->onNextCall(Call::readAsset, failing(CKErrorCode::assetNotAvailable));
  const auto answers = fetch(identifiers);
  std::size_t whole = 0;
  for (const std::string &identifier : identifiers) {
    const ThumbnailAnswer answer = answers->of(identifier);
    whole += answer.data ? 1 : 0;
    EXPECT_NE(static_cast<bool>(answer.data), CKErrorIs(answer.error, CKErrorCode::assetNotAvailable));
  }
  EXPECT_EQ(whole, 1U);
}

TEST_F(FetchThumbnails, bytesOtherThanThoseOfTheThumbnailAreNotHandedOn) {
  const auto identifiers = addDocuments(1);
  FaultyCloud::Fault wrong;
  wrong.wrongByteAt = 3;
  cloud->onNextCall(Call::readAsset, wrong);
  const ThumbnailAnswer answer = fetch(identifiers)->of(identifiers[0]);
  EXPECT_FALSE(answer.data);
  EXPECT_TRUE(CKErrorIs(answer.error, CKErrorCode::assetNotAvailable));
}

TEST_F(FetchThumbnails, aThumbnailOfMoreThanAPictureNeedsIsRefused) {
  const std::string identifier = addDocument("a.png", 1000, std::string((16U << 20) + 1, 'x'));
  const ThumbnailAnswer answer = fetch({identifier})->of(identifier);
  EXPECT_FALSE(answer.data);
  EXPECT_TRUE(CKErrorIs(answer.error, CKErrorCode::limitExceeded));
  EXPECT_EQ(cloud->count(Call::readAsset), 0);
}

TEST_F(FetchThumbnails, aContainerThatCannotBeReachedIsTheFinalError) {
  const auto identifiers = addDocuments(1);
  const NSError unreachable = CKErrorMake(CKErrorCode::serviceUnavailable, "not there");
  CKContainer::registerContainer(QVUbiquitousCloudKitContainerIdentifier, [unreachable](NSError *error) {
    *error = unreachable;
    return std::shared_ptr<CKCloud>();
  });
  const auto answers = fetch(identifiers);
  EXPECT_TRUE(answers->all().empty());
  EXPECT_EQ(answers->done.value<0>(), unreachable);
}

TEST_F(FetchThumbnails, anItemThatIsAskedForTwiceIsFetchedOnce) {
  const std::string identifier = addDocument("a.png", 1000, "the picture");
  EXPECT_TRUE(fetch({identifier, identifier})->of(identifier).data);
}

}  // namespace
}  // namespace droxa
