#include "platform/cloudkit/CKContainer.h"
#include "platform/cloudkit/CKFetchShareParticipantsOperation.h"
#include "platform/cloudkit/CKModifyRecordsOperation.h"
#include "platform/cloudkit/CKShareURLsOperation.h"
#include "tests/platform/cloudkit/OperationFixture.h"
#include "tests/platform/cloudkit/contract/ShareCalls.h"

namespace droxa::contract {
namespace {

// The fixture's account shares with Bob.
class CKShareOperations : public OperationTest {
 protected:
  CKShare sharedWithBob(const std::string &root) {
    save(*cloud, item(root));
    return saveShare(*cloud, shareOf(root, {named("bob")}));
  }
  template <class Operation>
  std::shared_ptr<Operation> at(std::vector<NSURL> urls) {
    auto operation = make<Operation>();
    operation->shareURLs = std::move(urls);
    operation->perShareCompletionBlock = [this](const auto &) { ++told; };
    operation->sharesCompletionBlock = [this](const auto &, const NSError &) { ++completions; };
    return operation;
  }
  const std::shared_ptr<FaultyCloud> bob = std::make_shared<FaultyCloud>(world.openAs("bob", "bobs device"));
  CKDatabase bobs{bob};
  int told = 0;
  int completions = 0;
};

TEST_F(CKShareOperations, aModificationCarriesARootAndItsShareThroughALostReply) {
  const auto operation = make<CKModifyRecordsOperation>();
  operation->request.recordsToSave = {item("root"), shareOf("root", {named("bob")}).record()};
  FaultyCloud::Fault lost;
  lost.dropsReply = true;
  cloud->onNextCall(Call::modifyRecords, lost);
  EXPECT_OK(CKRunOperation(database, operation));
  ASSERT_EQ(operation->reply().saved.size(), 2U);
  const auto share = CKShare::shareWithRecord(operation->reply().saved[1].record);
  ASSERT_TRUE(share);
  EXPECT_TRUE(share->URL);
  EXPECT_EQ(cloud->count(Call::modifyRecords), 2);
}

TEST_F(CKShareOperations, sharesAreLookedAtAndAcceptedAgainAfterAFailure) {
  const CKShare one = sharedWithBob("one");
  const CKShare two = sharedWithBob("two");
  bob->onNextCall(Call::fetchShareMetadata, failing(CKErrorCode::networkFailure));
  const auto fetching = at<CKFetchShareMetadataOperation>({one.URL, NSURL::URLWithString("none:0"), two.URL});
  EXPECT_CODE(CKRunOperation(bobs, fetching), partialFailure);
  ASSERT_EQ(fetching->results().size(), 3U);
  EXPECT_EQ(fetching->results()[0].metadata.participant.acceptanceStatus, Acceptance::pending);
  EXPECT_CODE(fetching->results()[1].error, unknownItem);
  EXPECT_EQ(fetching->results()[2].metadata.share.rootRecordID->recordName, "two");
  EXPECT_EQ(told, 3);
  FaultyCloud::Fault lost;
  lost.dropsReply = true;
  bob->onNextCall(Call::acceptShare, lost);
  const auto accepting = at<CKAcceptSharesOperation>({one.URL, two.URL});
  EXPECT_OK(CKRunOperation(bobs, accepting));
  ASSERT_EQ(accepting->results().size(), 2U);
  EXPECT_EQ(accepting->results()[0].metadata.participant.acceptanceStatus, Acceptance::accepted);
  EXPECT_EQ(completions, 2);
}

TEST_F(CKShareOperations, acceptingEndsWhereTheCloudCantBeReachedOrItIsCancelled) {
  const CKShare one = sharedWithBob("one");
  bob->onEveryCall(Call::acceptShare, failing(CKErrorCode::networkUnavailable));
  const auto unreachable = at<CKAcceptSharesOperation>({one.URL, one.URL});
  unreachable->configuration.allowsRetry = false;
  EXPECT_CODE(CKRunOperation(bobs, unreachable), networkUnavailable);
  EXPECT_TRUE(unreachable->results().empty());
  bob->onEveryCall(Call::acceptShare, hanging());
  const auto cancelled = at<CKAcceptSharesOperation>({one.URL});
  bobs.addOperation(cancelled);
  EXPECT_TRUE(eventually([&] { return bob->hanging() == 1; }));
  cancelled->cancel();
  cancelled->waitUntilFinished();
  EXPECT_CODE(cancelled->error(), operationCancelled);
  EXPECT_EQ(completions, 2);
}

TEST_F(CKShareOperations, participantsAreFoundInAsManyCallsAsItTakes) {
  const auto operation = make<CKFetchShareParticipantsOperation>();
  operation->namesOrHandles.assign(CKMostShareParticipants, "bob");
  operation->namesOrHandles.emplace_back("nobody");
  operation->perShareParticipantCompletionBlock = [this](const auto &) { ++told; };
  operation->fetchShareParticipantsCompletionBlock = [this](const auto &results, const NSError &error) {
    EXPECT_EQ(results.size(), CKMostShareParticipants + 1);
    EXPECT_CODE(error, partialFailure);
    ++completions;
  };
  cloud->onCall(Call::lookUpShareParticipants, 2, failing(CKErrorCode::zoneBusy));
  EXPECT_CODE(CKRunOperation(database, operation), partialFailure);
  EXPECT_EQ(cloud->count(Call::lookUpShareParticipants), 3);
  EXPECT_EQ(operation->results()[0].participant.userIdentity.accountName, "bob");
  EXPECT_CODE(operation->results().back().error, unknownItem);
  EXPECT_EQ(told, static_cast<int>(CKMostShareParticipants + 1));
  EXPECT_EQ(completions, 1);
}

TEST_F(CKShareOperations, aContainerHasBothDatabasesOfTheAccount) {
  const CKShare share = sharedWithBob("root");
  const CKContainer container("documents", bob);
  EXPECT_EQ(container.privateCloudDatabase()->databaseScope(), CKDatabaseScope::privateDatabase);
  EXPECT_EQ(container.sharedCloudDatabase()->databaseScope(), CKDatabaseScope::sharedDatabase);
  EXPECT_OK(CKRunOperation(*container.privateCloudDatabase(), at<CKAcceptSharesOperation>({share.URL})));
  CKCloud &shared = *container.sharedCloudDatabase()->cloud();
  EXPECT_EQ(shared.listZones(patiently()).zones, (std::vector<CKRecordZoneID>{{"documents", "account"}}));
}

}  // namespace
}  // namespace droxa::contract
