#include "tests/keld/sharing/SharingDrive.h"

namespace droxa::keld {
namespace {

class Shares : public SharingDrive {};

TEST_F(Shares, aNewShareBearsTheItemsNameAndKind) {
  sentFolder("Plans");
  const auto made = create(url("Plans"));
  ASSERT_TRUE(made.share) << made.error.description();
  EXPECT_FALSE(made.share->isKnownToServer());
  EXPECT_FALSE(made.share->URL);
  EXPECT_EQ(made.share->rootRecordID, recordOf("Plans"));
  ASSERT_TRUE(made.share->get<std::string>(CKShareTitleKey));
  EXPECT_EQ(*made.share->get<std::string>(CKShareTitleKey), "Plans");
  EXPECT_EQ(*made.share->get<std::string>(CKShareTypeKey), QVFolderShareType);
  EXPECT_FALSE(inCloud(*made.share)) << "it isn't saved";
  sentDocument("letter");
  EXPECT_EQ(*create(url("letter")).share->get<std::string>(CKShareTypeKey), QVDocumentShareType);
}

TEST_F(Shares, anItemThatIsntInTheCloudYetIsSentFirst) {
  device.keld.folder("New");
  device.keld.write("New/letter", "x");
  const auto made = create(url("New/letter"));
  ASSERT_TRUE(made.share) << made.error.description();
  EXPECT_TRUE(save(made.share).share);
}

TEST_F(Shares, aSavedShareIsFoundFromItsItemAndFromWhatIsBelow) {
  sentFolder("Plans");
  sentDocument("Plans/a");
  const CKShare saved = shared("Plans");
  EXPECT_TRUE(saved.isKnownToServer());
  EXPECT_TRUE(saved.URL);
  for (const char *path : {"Plans", "Plans/a"}) {
    const auto found = info(url(path));
    ASSERT_TRUE(found.share) << path << ": " << found.error.description();
    EXPECT_EQ(found.share->recordID, saved.recordID);
    EXPECT_EQ(found.share->rootRecordID, recordOf("Plans"));
    EXPECT_FALSE(found.url);
  }
}

TEST_F(Shares, anItemThatIsntSharedHasNoShare) {
  sentDocument("letter");
  const auto found = info(url("letter"));
  EXPECT_FALSE(found.share);
  EXPECT_TESSALY_ERROR(found.error, QVErrorNoShare);
}

TEST_F(Shares, aShareThatAnotherDeviceHasWithdrawnIsGoneAtOnce) {
  sentFolder("Plans");
  const CKShare saved = shared("Plans");
  CKModifyRequest request;
  request.recordsToDelete.push_back({saved.recordID, ""});
  ASSERT_FALSE(open("anna", "other")->modifyRecords(request, {}).error);
  EXPECT_TESSALY_ERROR(info(url("Plans")).error, QVErrorNoShare);
  EXPECT_TRUE(isShown("Plans", false));
}

TEST_F(Shares, whatTheCloudRefusesIsToldAsItIs) {
  sentFolder("Plans");
  cloud->onEveryCall(Call::fetchZoneChanges, failing(CKErrorCode::serviceUnavailable));
  EXPECT_CLOUD_ERROR(info(url("Plans")).error, serviceUnavailable);
  cloud->clearFaults();
  const auto made = create(url("Plans"));
  cloud->onNextCall(Call::modifyRecords, failing(CKErrorCode::quotaExceeded));
  EXPECT_CLOUD_ERROR(save(made.share).error, quotaExceeded);
  cloud->onNextCall(Call::modifyRecords, failing(CKErrorCode::networkUnavailable));
  const auto asked = shareURL(made.share);
  EXPECT_CLOUD_ERROR(asked.error, networkUnavailable);
  EXPECT_FALSE(asked.share);
  EXPECT_FALSE(asked.url);
}

TEST_F(Shares, aConflictComesWithTheCloudsRecord) {
  sentFolder("Plans");
  CKShare first = shared("Plans");
  CKShare second = first;
  second.publicPermission = Permission::readWrite;
  ASSERT_TRUE(save(second).share);
  first.fields[CKShareTitleKey] = std::string("Other");
  const NSError error = save(first).error;
  EXPECT_CLOUD_ERROR(error, serverRecordChanged);
  EXPECT_TRUE(CKErrorServerRecord(error));
}

TEST_F(Shares, aSaveWhoseReplyWasLostIsFoundDone) {
  sentFolder("Plans");
  const auto made = create(url("Plans"));
  FaultyCloud::Fault fault;
  fault.dropsReply = true;
  cloud->onNextCall(Call::modifyRecords, fault);
  EXPECT_CLOUD_ERROR(save(made.share).error, networkFailure);
  const auto again = save(made.share);
  ASSERT_TRUE(again.share) << again.error.description();
  EXPECT_TRUE(again.share->URL);
}

TEST_F(Shares, theURLOfAShareThatWasNeverSavedSavesIt) {
  sentDocument("letter");
  const auto made = create(url("letter"));
  const auto told = shareURL(made.share);
  ASSERT_TRUE(told.url) << told.error.description();
  EXPECT_EQ(told.share->URL, told.url);
  EXPECT_TRUE(inCloud(*told.share));
  const int saves = cloud->count(Call::modifyRecords);
  EXPECT_EQ(shareURL(told.share).url, told.url);
  EXPECT_EQ(cloud->count(Call::modifyRecords), saves) << "it was saved again";
}

TEST_F(Shares, theOwnerWithdrawsAShare) {
  sentFolder("Plans");
  const CKShare saved = shared("Plans");
  EXPECT_TRUE(isShown("Plans", true));
  const NSError error = unshare(saved, false);
  EXPECT_FALSE(error) << error.description();
  EXPECT_FALSE(inCloud(saved));
  EXPECT_TRUE(isShown("Plans", false));
}

TEST_F(Shares, aShareThatChangedMeanwhileIsWithdrawnByForceAlone) {
  sentFolder("Plans");
  const CKShare saved = shared("Plans");
  CKShare changed = saved;
  changed.publicPermission = Permission::readOnly;
  ASSERT_TRUE(save(changed).share);
  EXPECT_CLOUD_ERROR(unshare(saved, false), serverRecordChanged);
  EXPECT_TRUE(inCloud(saved));
  EXPECT_FALSE(unshare(saved, true));
  EXPECT_FALSE(inCloud(saved));
  EXPECT_FALSE(unshare(saved, true)) << "it is gone already";
}

TEST_F(Shares, aShareThatWasNeverSavedNeedsNoWithdrawal) {
  sentFolder("Plans");
  const int before = cloud->count(Call::modifyRecords);
  EXPECT_FALSE(unshare(create(url("Plans")).share, false));
  EXPECT_EQ(cloud->count(Call::modifyRecords), before);
}

TEST_F(Shares, everybodyWithTheURLIsLetInAndShutOut) {
  sentDocument("letter");
  const CKShare saved = shared("letter");
  const auto [data, text, error] = access(url("letter"), true);
  ASSERT_FALSE(error) << error.description();
  EXPECT_EQ(text, saved.URL.absoluteString());
  EXPECT_EQ(data, NSData::dataWithString(saved.URL.absoluteString()));
  EXPECT_EQ(inCloud(saved)->publicPermission, Permission::readOnly);
  EXPECT_FALSE(ben->acceptShare(saved.URL, {}).error);
  EXPECT_FALSE(std::get<2>(access(url("letter"), false)));
  EXPECT_EQ(inCloud(saved)->publicPermission, Permission::none);
}

TEST_F(Shares, moreThanReadingIsntTakenAwayByAllowingIt) {
  sentDocument("letter");
  const CKShare saved = shared("letter", Permission::readWrite);
  EXPECT_FALSE(std::get<2>(access(url("letter"), true)));
  EXPECT_EQ(inCloud(saved)->publicPermission, Permission::readWrite);
}

TEST_F(Shares, accessToAnItemWithoutAShareOfItsOwnIsRefused) {
  sentFolder("Plans");
  sentDocument("Plans/a");
  shared("Plans");
  const auto [data, text, error] = access(url("Plans/a"), true);
  EXPECT_TESSALY_ERROR(error, QVErrorNoShare);
  EXPECT_FALSE(text);
  EXPECT_FALSE(data);
}

TEST_F(Shares, aParticipantLeavesAShare) {
  sentFolder("Plans");
  const CKShare saved = shared("Plans", Permission::readOnly);
  ASSERT_FALSE(ben->acceptShare(saved.URL, {}).error);
  KeldOptions options;
  options.sync.cloud = ben;
  Device bens(options);
  CKShare asBenSeesIt = saved;
  asBenSeesIt.recordID.zoneID.ownerName = "anna";
  asBenSeesIt.rootRecordID->zoneID.ownerName = "anna";
  Once<NSError> answer("leaving");
  bens.keld.session()->startOperation_toUnshareShare(nullptr, asBenSeesIt, true, answer.completion());
  EXPECT_FALSE(answer.value<0>()) << answer.value<0>().description();
  const auto now = inCloud(saved);
  ASSERT_TRUE(now);
  EXPECT_FALSE(now->participantWithAccountName("ben"));
}

TEST_F(Shares, aParticipantCantSaveAShare) {
  sentFolder("Plans");
  CKShare saved = shared("Plans", Permission::readWrite);
  ASSERT_FALSE(ben->acceptShare(saved.URL, {}).error);
  KeldOptions options;
  options.sync.cloud = ben;
  Device bens(options);
  saved.recordID.zoneID.ownerName = "anna";
  Once<std::optional<CKShare>, NSError> answer("save");
  bens.keld.session()->startOperation_toSaveSharingInfo(nullptr, saved, answer.completion());
  EXPECT_CLOUD_ERROR(answer.value<1>(), permissionFailure);
}

}  // namespace
}  // namespace droxa::keld
