#pragma once

#include <sys/wait.h>

#include "tests/platform/cloudkit/contract/ShareCalls.h"

namespace droxa::contract {

// What participants may do with the records of a share, and others not.
template <class World>
class CloudShareAccess : public SharingTest<World> {
 protected:
  NSError bobSaves(const CKRecord &record) { return saveError(*this->bobs, atAlices(record)); }
  // The record as Bob has it, with another parent.
  NSError bobMoves(const std::string &name, const std::string &parent) {
    CKRecord record = fetch(*this->bobs, idAtAlices(name)).record;
    record.fields[CKRecordParentKey] = parent;
    return saveError(*this->bobs, record);
  }
};
TYPED_TEST_SUITE_P(CloudShareAccess);

TYPED_TEST_P(CloudShareAccess, whoIsNoParticipantSeesNothingByAnyCall) {
  this->shareFolderWithBob();
  CKRecord document = child("document", "folder");
  document.fields["contents"] = upload(*this->alice, "secret").asset;
  const CKAssetReference contents =
      save(*this->alice, document).template get<CKAsset>("contents")->reference();
  EXPECT_OK(read(*this->bobs, contents).second);
  for (CKCloud *database : {this->eve.get(), this->eves.get()}) {
    EXPECT_TRUE(database->listZones(patiently()).zones.empty());
    for (const CKRecordZoneID &zone : {kZone, kAlices}) {
      EXPECT_CODE(fetch(*database, {"a", zone}).error, zoneNotFound);
      EXPECT_CODE(database->fetchZoneChanges(zone, {}, {}, 10, patiently()).error, zoneNotFound);
      CKRecord record = child("new", "folder");
      record.recordID.zoneID = zone;
      EXPECT_CODE(saveError(*database, record), zoneNotFound);
      EXPECT_CODE(saveError(*database, record, CKRecordSavePolicy::allKeys), zoneNotFound);
      EXPECT_CODE(removeError(*database, {"a", zone}), zoneNotFound);
      EXPECT_CODE(database->deleteZone(zone, patiently()), zoneNotFound);
      EXPECT_CODE(database->shareTokens({"a", zone}, patiently()).error, zoneNotFound);
    }
    EXPECT_CODE(read(*database, contents).second, unknownItem);
    EXPECT_FALSE(database->hasAsset(contents, patiently()).isPresent);
  }
}

TYPED_TEST_P(CloudShareAccess, knowingWhatContentsAreCalledGivesNoneOfThem) {
  CKRecord document = item("document");
  document.fields["contents"] = upload(*this->alice, "secret").asset;
  save(*this->alice, document);
  EXPECT_OK(this->eve->saveZone(kZone, patiently()));
  EXPECT_CODE(saveError(*this->eve, document), assetFileNotFound);
  EXPECT_OK(upload(*this->eve, "secret").error);
  EXPECT_OK(saveError(*this->eve, document));
}

TYPED_TEST_P(CloudShareAccess, aParticipantSeesTheSharedHierarchyAndNothingElseOfTheZone) {
  this->shareFolderWithBob();
  EXPECT_EQ(this->bobs->listZones(patiently()).zones, std::vector<CKRecordZoneID>{kAlices});
  EXPECT_TRUE(this->bob->listZones(patiently()).zones.empty());
  for (const char *name : {"folder", "a", "sub", "b"}) {
    const CKRecordResult result = fetch(*this->bobs, idAtAlices(name));
    EXPECT_OK(result.error);
    EXPECT_EQ(result.record.recordID, idAtAlices(name));
  }
  EXPECT_CODE(fetch(*this->bobs, idAtAlices("outside")).error, unknownItem);
  EXPECT_CODE(fetch(*this->bob, item("a").recordID).error, zoneNotFound);
  EXPECT_CODE(fetch(*this->bob, idAtAlices("a")).error, zoneNotFound);
  EXPECT_CODE(fetch(*this->bobs, item("a").recordID).error, zoneNotFound);
}

TYPED_TEST_P(CloudShareAccess, aPendingParticipantSeesNothing) {
  this->makeTree();
  saveShare(*this->alice, shareOf("folder", {named("bob")}));
  EXPECT_TRUE(this->bobs->listZones(patiently()).zones.empty());
  EXPECT_CODE(fetch(*this->bobs, idAtAlices("a")).error, zoneNotFound);
}

TYPED_TEST_P(CloudShareAccess, whoMayWriteChangesMakesMovesAndDeletesWithinTheShare) {
  this->shareFolderWithBob();
  CKRecord a = fetch(*this->bobs, idAtAlices("a")).record;
  a.fields["title"] = std::string("by bob");
  a = save(*this->bobs, a);
  EXPECT_EQ(a.modifiedByDevice, "bobs device");
  EXPECT_EQ(*fetch(*this->alice, item("a").recordID).record.template get<std::string>("title"), "by bob");
  EXPECT_OK(this->bobSaves(child("new", "sub")));
  EXPECT_OK(this->bobMoves("new", "folder"));
  EXPECT_OK(removeError(*this->bobs, idAtAlices("b")));
  EXPECT_CODE(fetch(*this->alice, item("b").recordID).error, unknownItem);
  EXPECT_OK(fetch(*this->alice, item("new").recordID).error);
}

TYPED_TEST_P(CloudShareAccess, aFolderAndItsDocumentsAreMadeAndDeletedInOneCall) {
  this->shareFolderWithBob();
  EXPECT_OK(
      modify(*this->bobs, {atAlices(child("made", "folder")), atAlices(child("within", "made"))}).error);
  const CKModifyReply reply = this->bobs->modifyRecords(
      {{}, {{idAtAlices("sub"), {}}, {idAtAlices("b"), {}}, {idAtAlices("outside"), {}}}}, patiently());
  EXPECT_OK(reply.error);
  EXPECT_CODE(fetch(*this->alice, item("sub").recordID).error, unknownItem);
  EXPECT_CODE(fetch(*this->alice, item("b").recordID).error, unknownItem);
  EXPECT_OK(fetch(*this->alice, item("outside").recordID).error);
  CKRecord within = fetch(*this->bobs, idAtAlices("within")).record;
  within.fields[CKRecordParentKey] = std::string("folder");
  EXPECT_OK(this->bobs->modifyRecords({{within}, {{idAtAlices("made"), {}}}}, patiently()).error);
  EXPECT_OK(fetch(*this->bobs, idAtAlices("within")).error);
}

TYPED_TEST_P(CloudShareAccess, whoMayReadOnlyWritesNothing) {
  this->shareFolderWithBob(Permission::readOnly);
  const CKRecord a = fetch(*this->bobs, idAtAlices("a")).record;
  for (const auto policy : {CKRecordSavePolicy::ifServerRecordUnchanged, CKRecordSavePolicy::changedKeys,
                            CKRecordSavePolicy::allKeys}) {
    EXPECT_CODE(saveError(*this->bobs, a, policy), permissionFailure);
    EXPECT_CODE(saveError(*this->bobs, atAlices(child("new", "folder")), policy), permissionFailure);
  }
  EXPECT_CODE(this->bobMoves("a", "sub"), permissionFailure);
  EXPECT_CODE(removeError(*this->bobs, idAtAlices("a")), permissionFailure);
  EXPECT_CODE(this->bobs->deleteZone(kAlices, patiently()), permissionFailure);
  EXPECT_CODE(this->bobs->saveZone(kAlices, patiently()), permissionFailure);
  EXPECT_EQ(fetch(*this->bobs, idAtAlices("a")).record, a);
}

TYPED_TEST_P(CloudShareAccess, aParticipantTakesNothingOutOfTheShare) {
  this->shareFolderWithBob();
  for (const std::string parent : {"", "outside", "nowhere"}) {
    EXPECT_CODE(this->bobMoves("a", parent), permissionFailure);
    EXPECT_CODE(this->bobMoves("folder", parent.empty() ? "outside" : parent), permissionFailure);
  }
  EXPECT_CODE(this->bobMoves("sub", "b"), permissionFailure);
  CKRecord a = fetch(*this->bobs, idAtAlices("a")).record;
  a.fields[CKRecordParentKey] = std::int64_t{1};
  EXPECT_CODE(saveError(*this->bobs, a), permissionFailure);
  a.fields = {{"title", std::string("without a parent")}};
  EXPECT_CODE(saveError(*this->bobs, a, CKRecordSavePolicy::allKeys), permissionFailure);
  EXPECT_CODE(removeError(*this->bobs, idAtAlices("folder")), permissionFailure);
  EXPECT_OK(fetch(*this->bobs, idAtAlices("a")).error);
}

TYPED_TEST_P(CloudShareAccess, aParticipantBringsNothingInFromElsewhere) {
  this->shareFolderWithBob();
  EXPECT_CODE(this->bobSaves(child("new", "")), permissionFailure);
  EXPECT_CODE(this->bobSaves(child("new", "outside")), permissionFailure);
  // A record of Alice's that Bob doesn't see: its name is taken, whatever else he says.
  for (const auto policy : {CKRecordSavePolicy::ifServerRecordUnchanged, CKRecordSavePolicy::changedKeys,
                            CKRecordSavePolicy::allKeys}) {
    EXPECT_CODE(saveError(*this->bobs, atAlices(child("outside", "folder")), policy), permissionFailure);
  }
  CKRecord guessed = atAlices(child("outside", "folder"));
  guessed.recordChangeTag = fetch(*this->alice, item("outside").recordID).record.recordChangeTag;
  EXPECT_CODE(saveError(*this->bobs, guessed), unknownItem);
  EXPECT_OK(removeError(*this->bobs, idAtAlices("outside")));
  EXPECT_OK(fetch(*this->alice, item("outside").recordID).error);
  EXPECT_CODE(fetch(*this->bobs, idAtAlices("outside")).error, unknownItem);
}

TYPED_TEST_P(CloudShareAccess, aRecordCantBeMadeUnderTheNameThatOthersHangFrom) {
  this->shareFolderWithBob();
  save(*this->alice, child("top", "a place without a record"));
  EXPECT_CODE(this->bobSaves(child("a place without a record", "folder")), permissionFailure);
  EXPECT_CODE(fetch(*this->bobs, idAtAlices("top")).error, unknownItem);
}

TYPED_TEST_P(CloudShareAccess, aParticipantsRecordRefersOnlyToContentsThatItMaySee) {
  this->shareFolderWithBob();
  CKRecord secret = item("secret");
  secret.fields["contents"] = upload(*this->alice, "secret").asset;
  save(*this->alice, secret);
  CKRecord record = child("new", "folder");
  record.fields["contents"] = secret.fields["contents"];
  EXPECT_CODE(this->bobSaves(record), assetFileNotFound);
  record.fields["contents"] = upload(*this->bobs, "bobs own").asset;
  EXPECT_OK(this->bobSaves(record));
  EXPECT_EQ(read(*this->alice, record.template get<CKAsset>("contents")->reference()).first, "bobs own");
}

TYPED_TEST_P(CloudShareAccess, theMostPermissiveOfSeveralSharesCounts) {
  this->shareFolderWithBob(Permission::readOnly);
  const CKShare inner = saveShare(*this->alice, shareOf("sub", {named("bob"), named("eve")}));
  EXPECT_OK(this->bob->acceptShare(inner.URL, patiently()).error);
  EXPECT_OK(this->eve->acceptShare(inner.URL, patiently()).error);
  EXPECT_OK(this->bobSaves(child("new", "sub")));
  EXPECT_CODE(this->bobSaves(child("new 2", "folder")), permissionFailure);
  EXPECT_CODE(this->bobMoves("new", "folder"), permissionFailure);
  EXPECT_CODE(this->bobMoves("a", "sub"), permissionFailure);
  EXPECT_CODE(removeError(*this->bobs, idAtAlices("sub")), permissionFailure);
  EXPECT_CODE(fetch(*this->eves, idAtAlices("a")).error, unknownItem);
  EXPECT_OK(fetch(*this->eves, idAtAlices("b")).error);
  EXPECT_OK(removeError(*this->alice, inner.recordID));
  EXPECT_CODE(fetch(*this->eves, idAtAlices("b")).error, zoneNotFound);
  EXPECT_OK(fetch(*this->bobs, idAtAlices("b")).error);
  EXPECT_CODE(this->bobSaves(child("new 3", "sub")), permissionFailure);
}

TYPED_TEST_P(CloudShareAccess, aRecordStaysInEveryShareThatItsMoverSees) {
  this->shareFolderWithBob();
  const CKShare other = saveShare(*this->alice, shareOf("outside", {named("bob")}));
  EXPECT_OK(this->bob->acceptShare(other.URL, patiently()).error);
  EXPECT_CODE(this->bobMoves("a", "outside"), permissionFailure);
  EXPECT_OK(this->bobMoves("a", "sub"));
}

TYPED_TEST_P(CloudShareAccess, theZonesOwnerPaysForAllThatIsInIt) {
  this->shareFolderWithBob();
  this->world.setQuotaOf("alice", 10);
  CKRecord record = child("new", "folder");
  record.fields["contents"] = upload(*this->bobs, std::string(20, 'x')).asset;
  EXPECT_CODE(this->bobSaves(record), quotaExceeded);
  this->world.setQuotaOf("alice", {});
  this->world.setQuotaOf("bob", 10);
  EXPECT_OK(this->bobSaves(record));
  EXPECT_OK(removeError(*this->alice, record.recordID));
  this->world.setQuotaOf("alice", 20);
  EXPECT_OK(this->bobSaves(record));
}

TYPED_TEST_P(CloudShareAccess, participantsWriteFromTheirOwnProcesses) {
  this->shareFolderWithBob();
  constexpr int kCount = 25;
  const pid_t process = fork();
  if (process == 0) {
    const auto shared = this->world.openAs("bob", "child")->sharedDatabase();
    for (int i = 0; i < kCount; ++i) {
      if (modify(*shared, {atAlices(child("bob " + std::to_string(i), "sub"))}).error) _exit(1);
    }
    _exit(0);
  }
  for (int i = 0; i < kCount; ++i) save(*this->alice, child("alice " + std::to_string(i), "sub"));
  int status = 0;
  ASSERT_EQ(waitpid(process, &status, 0), process);
  EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0);
  // folder, a, sub, b, the share and what both saved.
  EXPECT_EQ(changesAtAlices(*this->bobs).changedRecords.size(), 5U + 2 * kCount);
  EXPECT_EQ(changes(*this->alice).changedRecords.size(), 6U + 2 * kCount);
}

REGISTER_TYPED_TEST_SUITE_P(CloudShareAccess, whoIsNoParticipantSeesNothingByAnyCall,
                            knowingWhatContentsAreCalledGivesNoneOfThem,
                            aParticipantSeesTheSharedHierarchyAndNothingElseOfTheZone,
                            aPendingParticipantSeesNothing,
                            whoMayWriteChangesMakesMovesAndDeletesWithinTheShare,
                            aFolderAndItsDocumentsAreMadeAndDeletedInOneCall, whoMayReadOnlyWritesNothing,
                            aParticipantTakesNothingOutOfTheShare, aParticipantBringsNothingInFromElsewhere,
                            aRecordCantBeMadeUnderTheNameThatOthersHangFrom,
                            aParticipantsRecordRefersOnlyToContentsThatItMaySee,
                            theMostPermissiveOfSeveralSharesCounts, aRecordStaysInEveryShareThatItsMoverSees,
                            theZonesOwnerPaysForAllThatIsInIt, participantsWriteFromTheirOwnProcesses);

}  // namespace droxa::contract
