#include "tessaly/QVSharingTopics.h"
#include "tests/keld/sharing/SharingDrive.h"

namespace droxa::keld {
namespace {

class SharingItemsTest : public SharingDrive {
 protected:
  std::string readAll(int descriptor) {
    std::string bytes(4096, '\0');
    const ssize_t count = ::pread(descriptor, bytes.data(), bytes.size(), 0);
    bytes.resize(count < 0 ? 0 : static_cast<std::size_t>(count));
    return bytes;
  }
};

TEST_F(SharingItemsTest, aFolderIsReadyWhenAllBelowItIsInTheCloud) {
  device.keld.folder("Plans/deep");
  for (int n = 0; n < 20; ++n) device.keld.write("Plans/deep/" + std::to_string(n), "x");
  const auto op = std::make_shared<RecordingOperation>();
  const NSError error = prepare(url("Plans"), op);
  ASSERT_FALSE(error) << error.description();
  EXPECT_EQ(device.status("Plans").unsent, 0U);
  EXPECT_GT(op->log.count(std::string("progress ") + QVSharingTopicUpload), 0U);
}

TEST_F(SharingItemsTest, aPreparationThatCantEndIsCancelled) {
  cloud->onEveryCall(Call::modifyRecords, failing(CKErrorCode::networkUnavailable));
  device.keld.folder("Plans");
  const auto op = std::make_shared<RecordingOperation>();
  Once<NSError> answer("preparation");
  session()->startOperation_toPrepFolderForSharingAt(op, url("Plans"), answer.completion());
  ASSERT_TRUE(op->log.waitFor("progress "));
  op->remote()->invalidate();
  EXPECT_TESSALY_ERROR(answer.value<0>(), QVErrorCancelled);
}

TEST_F(SharingItemsTest, tokensSayThatTheItemMayBeRead) {
  sentDocument("letter");
  shared("letter");
  const auto [share, again, error] = tokens(url("letter"));
  ASSERT_TRUE(share) << error.description();
  const CKShareTokenReply said = cloud->verifyShareToken(*share, {});
  EXPECT_EQ(said.kind, CKShareTokenKind::share) << said.error.description();
  EXPECT_EQ(said.recordID.recordName, recordOf("letter").recordName);
  EXPECT_EQ(cloud->verifyShareToken(*again, {}).kind, CKShareTokenKind::base);
  cloud->onNextCall(Call::shareTokens, failing(CKErrorCode::serviceUnavailable));
  const auto [first, second, refused] = tokens(url("letter"));
  EXPECT_CLOUD_ERROR(refused, serviceUnavailable);
  EXPECT_FALSE(first || second);
}

TEST_F(SharingItemsTest, sharesBelowAFolderAreFoundAndWithdrawn) {
  sentFolder("Plans");
  sentDocument("Plans/a");
  sentDocument("outside");
  const CKShare inside = shared("Plans/a");
  const CKShare outside = shared("outside");
  const CKShare folders = shared("Plans");
  EXPECT_FALSE(process(url("Plans"), 0, QVProcessCheckSubshares));
  EXPECT_TRUE(inCloud(inside));
  const auto op = std::make_shared<RecordingOperation>();
  EXPECT_FALSE(process(url("Plans"), 0, QVProcessWithdrawSubshares, op));
  EXPECT_FALSE(inCloud(inside));
  EXPECT_TRUE(inCloud(outside));
  EXPECT_TRUE(inCloud(folders)) << "the folder's own share isn't below it";
  EXPECT_TRUE(op->log.waitFor(std::string("progress ") + QVSharingTopicSubshares + " done=1 total=1"));
}

TEST_F(SharingItemsTest, moreFailuresThanAllowedAreAnErrorThatNamesTheFirst) {
  sentFolder("Plans");
  for (const char *path : {"Plans/a", "Plans/b"}) {
    sentDocument(path);
    shared(path);
  }
  cloud->onEveryCall(Call::modifyRecords, failing(CKErrorCode::serviceUnavailable));
  const NSError error = process(url("Plans"), 1, QVProcessWithdrawSubshares);
  EXPECT_CLOUD_ERROR(error, partialFailure);
  EXPECT_NE(error.localizedDescription().find("Plans/"), std::string::npos) << error.description();
  EXPECT_FALSE(process(url("Plans"), 2, QVProcessWithdrawSubshares)) << "two may fail";
}

TEST_F(SharingItemsTest, whatToProcessHasToBeAFolderAndAKnownProcess) {
  sentDocument("letter");
  EXPECT_TESSALY_ERROR(process(url("letter"), 0, QVProcessCheckSubshares), QVErrorInvalidArgument);
  EXPECT_TESSALY_ERROR(process(url(""), 0, 7), QVErrorInvalidArgument);
}

TEST_F(SharingItemsTest, aDocumentIsFoundByItsRecordAndOpenWithItsContents) {
  sentDocument("letter", "dear all");
  ASSERT_TRUE(eventually([&] { return !device.evict("letter"); }));
  const auto [wrapper, error] = document(recordOf("letter"), false);
  ASSERT_TRUE(wrapper) << error.description();
  EXPECT_EQ(wrapper->url(), url("letter"));
  EXPECT_EQ(readAll(wrapper->descriptor()), "dear all");
}

TEST_F(SharingItemsTest, aRecordThatCameToTheCloudAMomentAgoIsFoundBySyncing) {
  sentFolder("Plans");
  CKRecord record;
  record.recordType = kRecordType;
  record.recordID = RecordID(NewRecordName());
  DocumentRecord made;
  made.record = record.recordID.recordName;
  made.name = "Later";
  made.parent = recordOf("Plans").recordName;
  made.kind = NSFileProviderItemKind::folder;
  made.content.mode = 0755;
  CKModifyRequest request;
  request.recordsToSave.push_back(MakeRecord(made));
  ASSERT_FALSE(open("anna", "other")->modifyRecords(request, {}).error);
  NSURL found;
  ASSERT_TRUE(eventually([&] {
    const auto [wrapper, error] = document(record.recordID, true);
    if (wrapper) found = wrapper->url();
    return wrapper != nullptr;
  }));
  EXPECT_EQ(found, url("Plans/Later"));
}

TEST_F(SharingItemsTest, aRecordThatNobodyKnowsIsUnknown) {
  for (const bool syncs : {false, true}) {
    const auto [wrapper, error] = document(RecordID("nobody"), syncs);
    EXPECT_FALSE(wrapper);
    EXPECT_CLOUD_ERROR(error, unknownItem);
  }
  sentDocument("letter");
  CKRecordID others = recordOf("letter");
  others.zoneID.ownerName = "carl";
  EXPECT_CLOUD_ERROR(std::get<1>(document(others, false)), unknownItem);
}

TEST_F(SharingItemsTest, contentsThatCantBeFetchedAreTold) {
  sentDocument("letter", "dear all");
  ASSERT_TRUE(eventually([&] { return !device.evict("letter"); }));
  cloud->onEveryCall(Call::readAsset, failing(CKErrorCode::assetNotAvailable));
  const auto [wrapper, error] = document(recordOf("letter"), false);
  EXPECT_FALSE(wrapper);
  EXPECT_TRUE(error);
}

// --- People.

TEST_F(SharingItemsTest, theAccountIsToldByNameAndHandle) {
  ASSERT_FALSE(open("anna", "other")->setUserIdentity("Anna Maria Lind", "anna@example.org", {}));
  Once<std::optional<NSPersonNameComponents>, std::optional<std::string>, std::optional<std::string>,
       std::optional<std::string>, NSError>
      answer("user");
  session()->copyCurrentUserNameAndDisplayHandleWithReply(answer.completion());
  ASSERT_TRUE(answer.value<0>()) << answer.value<4>().description();
  EXPECT_EQ(answer.value<0>()->givenName, "Anna Maria");
  EXPECT_EQ(answer.value<0>()->familyName, "Lind");
  EXPECT_EQ(answer.value<1>(), "anna");
  EXPECT_EQ(answer.value<2>(), "anna@example.org");
  EXPECT_EQ(answer.value<3>(), "Anna Maria Lind");
}

TEST_F(SharingItemsTest, whoHasNoNameForPeopleHasNone) {
  Once<std::optional<NSPersonNameComponents>, std::optional<std::string>, std::optional<std::string>,
       std::optional<std::string>, NSError>
      answer("user");
  session()->copyCurrentUserNameAndDisplayHandleWithReply(answer.completion());
  EXPECT_FALSE(answer.value<0>());
  EXPECT_EQ(answer.value<1>(), "anna");
  EXPECT_FALSE(answer.value<2>() || answer.value<3>() || answer.value<4>());
}

TEST_F(SharingItemsTest, participantsAreFoundByAccountAndHandleAndTheOthersNamed) {
  ASSERT_FALSE(ben->setUserIdentity("Ben", "ben@example.org", {}));
  std::vector<CKShareParticipant> asked(3);
  asked[0].userIdentity.accountName = "ben";
  asked[0].permission = Permission::readWrite;
  asked[1].userIdentity.accountName = "nobody";
  asked[2].userIdentity.handle = "ben@example.org";
  const auto [found, error] = lookUp(asked);
  ASSERT_TRUE(found);
  ASSERT_EQ(found->size(), 2U);
  EXPECT_EQ((*found)[0].userIdentity.displayName, "Ben");
  EXPECT_EQ((*found)[0].permission, Permission::readWrite);
  EXPECT_EQ((*found)[1].userIdentity.accountName, "ben");
  EXPECT_CLOUD_ERROR(error, partialFailure);
  EXPECT_NE(error.localizedDescription().find("\"nobody\""), std::string::npos) << error.description();
  EXPECT_EQ(lookUp(std::vector<CKShareParticipant>{}),
            std::make_tuple(QVShareParticipants(std::in_place), NSError()));
  cloud->onNextCall(Call::lookUpShareParticipants, failing(CKErrorCode::networkUnavailable));
  EXPECT_CLOUD_ERROR(std::get<1>(lookUp(asked)), networkUnavailable);
}

}  // namespace
}  // namespace droxa::keld
