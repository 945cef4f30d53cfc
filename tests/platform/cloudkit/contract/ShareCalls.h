#pragma once

#include <algorithm>
#include <set>

#include "tests/platform/cloudkit/contract/Calls.h"

namespace droxa::contract {

using Permission = CKShareParticipantPermission;
using Role = CKShareParticipantRole;
using Acceptance = CKShareParticipantAcceptanceStatus;

// Alice's zone as others name it.
inline const CKRecordZoneID kAlices{"documents", "alice"};

inline CKRecord child(const std::string &name, const std::string &parent,
                      const std::string &title = "title") {
  CKRecord record = item(name, title);
  if (!parent.empty()) record.fields[CKRecordParentKey] = parent;
  return record;
}
inline CKRecord atAlices(CKRecord record) {
  record.recordID.zoneID = kAlices;
  return record;
}
inline CKRecordID idAtAlices(const std::string &name) {
  return {name, kAlices};
}

inline CKShareParticipant named(const std::string &account, Permission permission = Permission::readWrite) {
  CKShareParticipant participant;
  participant.userIdentity.accountName = account;
  participant.permission = permission;
  return participant;
}

inline CKShare shareOf(const std::string &root, std::vector<CKShareParticipant> participants = {},
                       Permission publicPermission = Permission::none) {
  CKShare share;
  share.recordID = {"share of " + root, kZone};
  share.rootRecordID = CKRecordID{root, kZone};
  share.participants = std::move(participants);
  share.publicPermission = publicPermission;
  share.fields[CKShareTitleKey] = "about " + root;
  return share;
}

// The share as saved; the test fails when it isn't.
inline CKShare saveShare(CKCloud &cloud, const CKShare &share) {
  const auto saved = CKShare::shareWithRecord(save(cloud, share.record()));
  EXPECT_TRUE(saved);
  return saved.value_or(CKShare());
}
inline NSError saveShareError(CKCloud &cloud, const CKShare &share) {
  return saveError(cloud, share.record());
}
inline CKShare fetchShare(CKCloud &cloud, const CKRecordID &id) {
  const CKRecordResult result = fetch(cloud, id);
  EXPECT_OK(result.error);
  return CKShare::shareWithRecord(result.record).value_or(CKShare());
}

inline CKZoneChanges changesAtAlices(CKCloud &cloud, const CKServerChangeToken &token = {},
                                     std::size_t limit = 100) {
  return cloud.fetchZoneChanges(kAlices, token, {}, limit, patiently());
}
inline std::set<std::string> changedNames(const CKZoneChanges &page) {
  std::set<std::string> names;
  for (const CKRecord &record : page.changedRecords) names.insert(record.recordID.recordName);
  return names;
}
inline std::set<std::string> deletedNames(const CKZoneChanges &page) {
  std::set<std::string> names;
  for (const CKDeletedRecord &record : page.deletedRecords) names.insert(record.recordID.recordName);
  return names;
}
using NameSet = std::set<std::string>;

// Alice, who shares, Bob and Eve.
template <class World>
class SharingTest : public testing::Test {
 protected:
  void SetUp() override { EXPECT_OK(alice->saveZone(kZone, patiently())); }

  // folder/{a, sub/b} and outside.
  void makeTree() {
    for (const CKRecord &record : {child("folder", ""), child("a", "folder"), child("sub", "folder"),
                                   child("b", "sub"), child("outside", "")}) {
      save(*alice, record);
    }
  }
  // The folder shared with Bob, who has accepted.
  CKShare shareFolderWithBob(Permission permission = Permission::readWrite) {
    makeTree();
    CKShare share = saveShare(*alice, shareOf("folder", {named("bob", permission)}));
    EXPECT_OK(bob->acceptShare(share.URL, patiently()).error);
    return fetchShare(*alice, share.recordID);
  }

  World world;
  const std::shared_ptr<CKCloud> alice = world.openAs("alice", "alices device");
  const std::shared_ptr<CKCloud> bob = world.openAs("bob", "bobs device");
  const std::shared_ptr<CKCloud> eve = world.openAs("eve", "eves device");
  const std::shared_ptr<CKCloud> bobs = bob->sharedDatabase();
  const std::shared_ptr<CKCloud> eves = eve->sharedDatabase();
};

}  // namespace droxa::contract
