#pragma once

#include "tests/platform/cloudkit/contract/ShareCalls.h"

namespace droxa::contract {

// Making shares, accepting them, taking them back.
template <class World>
class CloudShares : public SharingTest<World> {};
TYPED_TEST_SUITE_P(CloudShares);

TYPED_TEST_P(CloudShares, savingMakesAURLAndStampsOwnerAndParticipants) {
  save(*this->alice, item("root"));
  const CKShare share = saveShare(*this->alice, shareOf("root", {named("bob", Permission::readOnly)}));
  EXPECT_TRUE(share.isKnownToServer());
  EXPECT_GE(share.URL.absoluteString().size(), 32U);
  ASSERT_TRUE(share.owner());
  EXPECT_EQ(share.owner()->userIdentity.accountName, "alice");
  EXPECT_EQ(share.owner()->acceptanceStatus, Acceptance::accepted);
  const CKShareParticipant *invited = share.participantWithAccountName("bob");
  ASSERT_TRUE(invited);
  EXPECT_EQ(invited->role, Role::privateUser);
  EXPECT_EQ(invited->permission, Permission::readOnly);
  EXPECT_EQ(invited->acceptanceStatus, Acceptance::pending);
  EXPECT_EQ(*share.template get<std::string>(CKShareTitleKey), "about root");
  EXPECT_EQ(fetchShare(*this->alice, share.recordID), share);
}

TYPED_TEST_P(CloudShares, rootAndShareMayComeInOneCallInAnyOrder) {
  const CKModifyReply reply = modify(*this->alice, {shareOf("root").record(), item("root")});
  EXPECT_OK(reply.error);
  EXPECT_CODE(saveShareError(*this->alice, shareOf("nothing")), unknownItem);
  EXPECT_CODE(fetch(*this->alice, shareOf("nothing").recordID).error, unknownItem);
}

TYPED_TEST_P(CloudShares, everyShareHasAURLOfItsOwnThatStaysUntilItIsDeleted) {
  std::set<std::string> urls;
  for (int i = 0; i < 20; ++i) {
    save(*this->alice, item(std::to_string(i)));
    CKShare share = saveShare(*this->alice, shareOf(std::to_string(i)));
    urls.insert(share.URL.absoluteString());
    const NSURL url = share.URL;
    share.URL = NSURL::URLWithString("droxa-share:chosen");
    EXPECT_EQ(saveShare(*this->alice, share).URL, url);
  }
  EXPECT_EQ(urls.size(), 20U);
  const CKShare old = fetchShare(*this->alice, shareOf("0").recordID);
  EXPECT_OK(removeError(*this->alice, old.recordID));
  EXPECT_FALSE(saveShare(*this->alice, shareOf("0")).URL == old.URL);
  EXPECT_CODE(this->alice->fetchShareMetadata(old.URL, patiently()).error, unknownItem);
}

TYPED_TEST_P(CloudShares, whatCantBeSharedIsRefused) {
  save(*this->alice, item("root"));
  CKShare nothing = shareOf("root");
  nothing.rootRecordID.reset();
  EXPECT_CODE(saveShareError(*this->alice, nothing), invalidArguments);
  CKShare elsewhere = shareOf("root");
  elsewhere.rootRecordID->zoneID.zoneName = "elsewhere";
  EXPECT_CODE(saveShareError(*this->alice, elsewhere), invalidArguments);
  CKRecord broken = shareOf("root").record();
  broken.fields["participants"] = std::vector<std::string>{"nobody"};
  EXPECT_CODE(saveError(*this->alice, broken), invalidArguments);
  saveShare(*this->alice, shareOf("root"));
  CKShare second = shareOf("root");
  second.recordID.recordName = "second";
  EXPECT_CODE(saveShareError(*this->alice, second), alreadyShared);
  save(*this->alice, item("other"));
  CKShare moved = fetchShare(*this->alice, shareOf("root").recordID);
  moved.rootRecordID->recordName = "other";
  EXPECT_CODE(saveShareError(*this->alice, moved), invalidArguments);
  CKShare ofAShare = shareOf("share of root");
  EXPECT_CODE(saveShareError(*this->alice, ofAShare), invalidArguments);
}

TYPED_TEST_P(CloudShares, participantsMustBeAccountsEachOnceAndNotTooMany) {
  save(*this->alice, item("root"));
  EXPECT_CODE(saveShareError(*this->alice, shareOf("root", {named("nobody")})), unknownItem);
  EXPECT_CODE(saveShareError(*this->alice, shareOf("root", {named("bob"), named("bob")})), invalidArguments);
  std::vector<CKShareParticipant> many;
  for (std::size_t i = 0; i < CKMostShareParticipants; ++i) {
    many.push_back(named("account " + std::to_string(i)));
    this->world.openAs(many.back().userIdentity.accountName, "device");
  }
  EXPECT_CODE(saveShareError(*this->alice, shareOf("root", many)), tooManyParticipants);
  many.pop_back();
  EXPECT_EQ(saveShare(*this->alice, shareOf("root", many)).participants.size(), CKMostShareParticipants);
}

TYPED_TEST_P(CloudShares, accountsAreFoundByNameAndByHandle) {
  this->world.setUserIdentity("bob", "Bob B.", "bob@droxa.test");
  const CKUserIdentity identity{"bob", "Bob B.", "bob@droxa.test"};
  EXPECT_EQ(this->bob->currentUserIdentity(patiently()).identity, identity);
  const CKShareParticipantsReply reply =
      this->alice->lookUpShareParticipants({"bob@droxa.test", "nobody", "bob", ""}, patiently());
  EXPECT_CODE(reply.error, partialFailure);
  ASSERT_EQ(reply.results.size(), 4U);
  EXPECT_EQ(reply.results[0].participant.userIdentity, identity);
  EXPECT_CODE(reply.results[1].error, unknownItem);
  EXPECT_EQ(reply.results[2].participant.userIdentity, identity);
  EXPECT_CODE(reply.results[3].error, unknownItem);
  save(*this->alice, item("root"));
  CKShareParticipant byHandle;
  byHandle.userIdentity.handle = "bob@droxa.test";
  const CKShare share = saveShare(*this->alice, shareOf("root", {byHandle}));
  ASSERT_EQ(share.participants.size(), 2U);
  EXPECT_EQ(share.participants[1].userIdentity, identity);
  const std::vector<std::string> tooMany(CKMostShareParticipants + 1, "bob");
  EXPECT_CODE(this->alice->lookUpShareParticipants(tooMany, patiently()).error, limitExceeded);
}

TYPED_TEST_P(CloudShares, aParticipantSeesMetadataAndAcceptsByTheURL) {
  this->makeTree();
  const CKShare share = saveShare(*this->alice, shareOf("folder", {named("bob"), named("eve")}));
  const CKShareMetadataReply before = this->bob->fetchShareMetadata(share.URL, patiently());
  EXPECT_OK(before.error);
  EXPECT_EQ(before.metadata.owner.userIdentity.accountName, "alice");
  EXPECT_EQ(before.metadata.participant.acceptanceStatus, Acceptance::pending);
  EXPECT_EQ(before.metadata.share.rootRecordID, idAtAlices("folder"));
  EXPECT_FALSE(before.metadata.share.participantWithAccountName("eve"));
  const CKShareMetadataReply after = this->bob->acceptShare(share.URL, patiently());
  EXPECT_OK(after.error);
  EXPECT_EQ(after.metadata.participant.acceptanceStatus, Acceptance::accepted);
  EXPECT_TRUE(after.metadata.share.participantWithAccountName("eve"));
  EXPECT_EQ(this->bobs->acceptShare(share.URL, patiently()).metadata, after.metadata);
  EXPECT_EQ(this->bobs->fetchShareMetadata(share.URL, patiently()).metadata, after.metadata);
  EXPECT_EQ(fetchShare(*this->bobs, after.metadata.share.recordID), after.metadata.share);
  const CKShare owners = fetchShare(*this->alice, share.recordID);
  EXPECT_EQ(owners.participantWithAccountName("bob")->acceptanceStatus, Acceptance::accepted);
  EXPECT_EQ(owners.participantWithAccountName("eve")->acceptanceStatus, Acceptance::pending);
}

TYPED_TEST_P(CloudShares, theOwnersOwnURLChangesNothing) {
  save(*this->alice, item("root"));
  const CKShare share = saveShare(*this->alice, shareOf("root"));
  const CKShareMetadataReply reply = this->alice->acceptShare(share.URL, patiently());
  EXPECT_OK(reply.error);
  EXPECT_EQ(reply.metadata.share, share);
  EXPECT_EQ(reply.metadata.participant.role, Role::owner);
  EXPECT_TRUE(this->alice->sharedDatabase()->listZones(patiently()).zones.empty());
}

TYPED_TEST_P(CloudShares, thePublicPermissionDecidesForWhoIsntNamed) {
  this->makeTree();
  CKShare share = saveShare(*this->alice, shareOf("folder", {named("bob", Permission::none)}));
  EXPECT_CODE(this->eve->fetchShareMetadata(share.URL, patiently()).error, participantMayNeedVerification);
  EXPECT_CODE(this->eve->acceptShare(share.URL, patiently()).error, participantMayNeedVerification);
  EXPECT_CODE(this->bob->acceptShare(share.URL, patiently()).error, permissionFailure);
  EXPECT_CODE(this->eve->acceptShare(NSURL::URLWithString("droxa-share:1234"), patiently()).error,
              unknownItem);
  EXPECT_CODE(this->eve->acceptShare({}, patiently()).error, unknownItem);
  share.publicPermission = Permission::readOnly;
  share = saveShare(*this->alice, share);
  EXPECT_EQ(this->eve->acceptShare(share.URL, patiently()).metadata.participant.role, Role::publicUser);
  EXPECT_CODE(saveError(*this->eves, atAlices(child("new", "folder"))), permissionFailure);
  share = fetchShare(*this->alice, share.recordID);
  share.publicPermission = Permission::readWrite;
  share = saveShare(*this->alice, share);
  EXPECT_OK(saveError(*this->eves, atAlices(child("new", "folder"))));
  share.publicPermission = Permission::none;
  share = saveShare(*this->alice, share);
  EXPECT_FALSE(share.participantWithAccountName("eve"));
  EXPECT_CODE(fetch(*this->eves, idAtAlices("a")).error, zoneNotFound);
}

TYPED_TEST_P(CloudShares, onlyTheOwnerChangesAShare) {
  CKShare share = this->shareFolderWithBob();
  CKShare mine = fetchShare(*this->bobs, {share.recordID.recordName, kAlices});
  mine.publicPermission = Permission::readWrite;
  EXPECT_CODE(saveShareError(*this->bobs, mine), permissionFailure);
  CKShare another = shareOf("a");
  another.recordID.zoneID = another.rootRecordID->zoneID = kAlices;
  EXPECT_CODE(saveShareError(*this->bobs, another), permissionFailure);
  EXPECT_EQ(fetchShare(*this->alice, share.recordID), share);
}

TYPED_TEST_P(CloudShares, whoIsLeftOutOfAShareHasLostItAtOnce) {
  CKShare share = this->shareFolderWithBob();
  EXPECT_OK(fetch(*this->bobs, idAtAlices("b")).error);
  share.participants.pop_back();
  saveShare(*this->alice, share);
  EXPECT_CODE(fetch(*this->bobs, idAtAlices("b")).error, zoneNotFound);
  EXPECT_TRUE(this->bobs->listZones(patiently()).zones.empty());
  EXPECT_CODE(this->bob->acceptShare(share.URL, patiently()).error, participantMayNeedVerification);
}

TYPED_TEST_P(CloudShares, deletingTheShareOrItsRootWithdrawsItFromEverybody) {
  const CKShare share = this->shareFolderWithBob();
  EXPECT_OK(removeError(*this->alice, share.recordID));
  EXPECT_CODE(changesAtAlices(*this->bobs).error, zoneNotFound);
  EXPECT_CODE(this->bob->acceptShare(share.URL, patiently()).error, unknownItem);
  EXPECT_OK(fetch(*this->alice, item("a").recordID).error);
  const CKShare again = saveShare(*this->alice, shareOf("folder", {named("bob")}));
  EXPECT_OK(this->bob->acceptShare(again.URL, patiently()).error);
  EXPECT_OK(removeError(*this->alice, item("folder").recordID));
  EXPECT_CODE(fetch(*this->alice, again.recordID).error, unknownItem);
  EXPECT_CODE(this->bob->acceptShare(again.URL, patiently()).error, unknownItem);
  EXPECT_CODE(fetch(*this->bobs, idAtAlices("a")).error, zoneNotFound);
}

TYPED_TEST_P(CloudShares, aParticipantLeavesByDeletingTheShareAndMayComeBack) {
  const CKShare share = this->shareFolderWithBob();
  EXPECT_OK(removeError(*this->bobs, {share.recordID.recordName, kAlices}));
  EXPECT_CODE(fetch(*this->bobs, idAtAlices("a")).error, zoneNotFound);
  const CKShare left = fetchShare(*this->alice, share.recordID);
  EXPECT_EQ(left.participantWithAccountName("bob")->acceptanceStatus, Acceptance::removed);
  EXPECT_OK(this->bob->acceptShare(share.URL, patiently()).error);
  EXPECT_OK(fetch(*this->bobs, idAtAlices("a")).error);
}

TYPED_TEST_P(CloudShares, aSaveCantSayThatSomebodyHasAccepted) {
  this->makeTree();
  CKShareParticipant invited = named("bob");
  invited.acceptanceStatus = Acceptance::accepted;
  const CKShare share = saveShare(*this->alice, shareOf("folder", {invited}));
  EXPECT_EQ(share.participantWithAccountName("bob")->acceptanceStatus, Acceptance::pending);
  EXPECT_TRUE(this->bobs->listZones(patiently()).zones.empty());
}

TYPED_TEST_P(CloudShares, aStaleShareIsAConflictAndALostReplyIsNot) {
  save(*this->alice, item("root"));
  const CKShare wanted = shareOf("root", {named("bob")});
  const CKShare share = saveShare(*this->alice, wanted);
  const NSError error = saveShareError(*this->alice, wanted);
  EXPECT_CODE(error, serverRecordChanged);
  ASSERT_TRUE(CKErrorServerRecord(error));
  EXPECT_TRUE(CKServerRecordIsOwnSave(wanted.record(), *CKErrorServerRecord(error), "alices device"));
  EXPECT_FALSE(CKServerRecordIsOwnSave(shareOf("root").record(), share.record(), "alices device"));
  EXPECT_FALSE(CKServerRecordIsOwnSave(shareOf("root", {named("bob", Permission::readOnly)}).record(),
                                       share.record(), "alices device"));
}

TYPED_TEST_P(CloudShares, tokensSayWhoMayReadWhatAndOnlyWhileItIsSo) {
  CKShare share = this->shareFolderWithBob(Permission::readOnly);
  const CKShareTokens tokens = this->bobs->shareTokens(idAtAlices("b"), patiently());
  EXPECT_OK(tokens.error);
  EXPECT_NE(tokens.shareToken, tokens.baseToken);
  const CKShareTokens owners = this->alice->shareTokens(item("b").recordID, patiently());
  EXPECT_NE(owners.baseToken, tokens.baseToken);
  const CKShareTokenReply verified = this->alice->verifyShareToken(tokens.shareToken, patiently());
  EXPECT_OK(verified.error);
  EXPECT_EQ(verified.kind, CKShareTokenKind::share);
  EXPECT_EQ(verified.recordID, item("b").recordID);
  EXPECT_EQ(verified.accountName, "bob");
  const CKShareTokenReply base = this->bob->verifyShareToken(owners.baseToken, patiently());
  EXPECT_OK(base.error);
  EXPECT_EQ(base.kind, CKShareTokenKind::base);
  EXPECT_EQ(base.recordID, idAtAlices("b"));
  EXPECT_EQ(base.accountName, "alice");
  EXPECT_CODE(this->eve->verifyShareToken(tokens.baseToken, patiently()).error, unknownItem);
  EXPECT_CODE(this->bobs->shareTokens(idAtAlices("outside"), patiently()).error, unknownItem);
  EXPECT_CODE(this->eves->shareTokens(idAtAlices("b"), patiently()).error, zoneNotFound);
  share.participants.pop_back();
  saveShare(*this->alice, share);
  EXPECT_CODE(this->alice->verifyShareToken(tokens.shareToken, patiently()).error, permissionFailure);
  EXPECT_CODE(this->alice->verifyShareToken(tokens.baseToken, patiently()).error, permissionFailure);
}

TYPED_TEST_P(CloudShares, everyAlteredTokenIsRefused) {
  save(*this->alice, item("root"));
  const CKShareTokens tokens = this->alice->shareTokens(item("root").recordID, patiently());
  const auto verify = [this](const std::string &token) {
    return this->alice->verifyShareToken(token, patiently()).error;
  };
  EXPECT_OK(verify(tokens.baseToken));
  EXPECT_OK(verify(tokens.shareToken));
  for (std::size_t i = 0; i < tokens.baseToken.size(); ++i) {
    std::string altered = tokens.baseToken;
    altered[i] = altered[i] == '1' ? '2' : '1';
    EXPECT_CODE(verify(altered), invalidArguments);
    EXPECT_CODE(verify(tokens.baseToken.substr(0, i)), invalidArguments);
  }
  EXPECT_CODE(verify(tokens.baseToken + "00"), invalidArguments);
  EXPECT_CODE(verify(std::string(100000, 'a')), invalidArguments);
  const auto elsewhere = this->world.openAnotherCloud("one");
  EXPECT_CODE(elsewhere->verifyShareToken(tokens.baseToken, patiently()).error, invalidArguments);
}

TYPED_TEST_P(CloudShares, aCancelledCallDoesNothing) {
  this->makeTree();
  const CKShare share = saveShare(*this->alice, shareOf("folder", {named("bob")}));
  CKCallContext cancelled = patiently();
  cancelled.cancellation = std::make_shared<CKCancellation>();
  cancelled.cancellation->cancel();
  EXPECT_CODE(this->bob->acceptShare(share.URL, cancelled).error, operationCancelled);
  EXPECT_CODE(this->bob->fetchShareMetadata(share.URL, cancelled).error, operationCancelled);
  EXPECT_CODE(this->bob->lookUpShareParticipants({"bob"}, cancelled).error, operationCancelled);
  EXPECT_CODE(this->bob->currentUserIdentity(cancelled).error, operationCancelled);
  EXPECT_CODE(this->alice->shareTokens(item("a").recordID, cancelled).error, operationCancelled);
  EXPECT_EQ(fetchShare(*this->alice, share.recordID), share);
}

REGISTER_TYPED_TEST_SUITE_P(
    CloudShares, savingMakesAURLAndStampsOwnerAndParticipants, rootAndShareMayComeInOneCallInAnyOrder,
    everyShareHasAURLOfItsOwnThatStaysUntilItIsDeleted, whatCantBeSharedIsRefused,
    participantsMustBeAccountsEachOnceAndNotTooMany, accountsAreFoundByNameAndByHandle,
    aParticipantSeesMetadataAndAcceptsByTheURL, theOwnersOwnURLChangesNothing,
    thePublicPermissionDecidesForWhoIsntNamed, onlyTheOwnerChangesAShare, whoIsLeftOutOfAShareHasLostItAtOnce,
    deletingTheShareOrItsRootWithdrawsItFromEverybody, aParticipantLeavesByDeletingTheShareAndMayComeBack,
    aSaveCantSayThatSomebodyHasAccepted, aStaleShareIsAConflictAndALostReplyIsNot,
    tokensSayWhoMayReadWhatAndOnlyWhileItIsSo, everyAlteredTokenIsRefused, aCancelledCallDoesNothing);

}  // namespace droxa::contract
