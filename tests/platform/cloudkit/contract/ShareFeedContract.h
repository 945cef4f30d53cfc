#pragma once

#include <condition_variable>
#include <map>
#include <mutex>

#include "tests/platform/cloudkit/contract/ShareCalls.h"

namespace droxa::contract {

// The feed of changes of what others share.
template <class World>
class CloudShareFeed : public SharingTest<World> {
 protected:
  // What is told since the token that this account was given last.
  CKZoneChanges next() {
    CKZoneChanges page = changesAtAlices(*this->bobs, token);
    EXPECT_OK(page.error);
    if (!page.error) token = page.token;
    return page;
  }
  CKServerChangeToken token;
};
TYPED_TEST_SUITE_P(CloudShareFeed);

TYPED_TEST_P(CloudShareFeed, itTellsWhatIsSharedParentsFirstAndTheShare) {
  this->shareFolderWithBob();
  const CKZoneChanges page = this->next();
  EXPECT_EQ(changedNames(page), (NameSet{"folder", "a", "sub", "b", "share of folder"}));
  std::vector<std::string> order;
  for (const CKRecord &record : page.changedRecords) {
    EXPECT_EQ(record.recordID.zoneID, kAlices);
    EXPECT_EQ(fetch(*this->bobs, record.recordID).record, record);
    order.push_back(record.recordID.recordName);
  }
  const auto at = [&](const char *name) { return std::find(order.begin(), order.end(), name); };
  EXPECT_LT(at("folder"), at("sub"));
  EXPECT_LT(at("sub"), at("b"));
  EXPECT_TRUE(this->next().changedRecords.empty());
}

TYPED_TEST_P(CloudShareFeed, changesOfBothAreToldAndThoseElsewhereAreNot) {
  this->shareFolderWithBob();
  this->next();
  save(*this->alice, child("new", "sub"));
  save(*this->alice, child("elsewhere", "outside"));
  save(*this->bobs, atAlices(child("bobs", "folder")));
  EXPECT_EQ(changedNames(this->next()), (NameSet{"new", "bobs"}));
  EXPECT_OK(removeError(*this->alice, item("new").recordID));
  EXPECT_OK(removeError(*this->alice, item("elsewhere").recordID));
  const CKZoneChanges page = this->next();
  EXPECT_EQ(deletedNames(page), NameSet{"new"});
  EXPECT_EQ(page.deletedRecords.at(0), (CKDeletedRecord{idAtAlices("new"), "Item", "alices device"}));
  EXPECT_TRUE(page.changedRecords.empty());
}

TYPED_TEST_P(CloudShareFeed, whatLeavesTheShareGoesWithAllBelowItAndMayComeBack) {
  this->shareFolderWithBob();
  this->next();
  CKRecord sub = fetch(*this->alice, item("sub").recordID).record;
  sub.fields[CKRecordParentKey] = std::string("outside");
  sub = save(*this->alice, sub);
  CKZoneChanges page = this->next();
  EXPECT_EQ(deletedNames(page), (NameSet{"sub", "b"}));
  EXPECT_TRUE(page.changedRecords.empty());
  EXPECT_CODE(fetch(*this->bobs, idAtAlices("b")).error, unknownItem);
  save(*this->alice, child("late", "sub"));
  EXPECT_TRUE(this->next().changedRecords.empty());
  sub.fields[CKRecordParentKey] = std::string("folder");
  save(*this->alice, sub);
  EXPECT_EQ(changedNames(this->next()), (NameSet{"sub", "b", "late"}));
}

TYPED_TEST_P(CloudShareFeed, aDeletedFolderTakesWhatIsLeftBelowItOutOfSight) {
  this->shareFolderWithBob();
  this->next();
  EXPECT_OK(removeError(*this->alice, item("sub").recordID));
  EXPECT_EQ(deletedNames(this->next()), (NameSet{"sub", "b"}));
  save(*this->alice, child("sub", "folder"));
  EXPECT_EQ(changedNames(this->next()), (NameSet{"sub", "b"}));
}

TYPED_TEST_P(CloudShareFeed, aWithdrawnShareIsToldAsDeletedWhereAnotherStays) {
  const CKShare share = this->shareFolderWithBob();
  const CKShare other = saveShare(*this->alice, shareOf("outside", {named("bob")}));
  EXPECT_OK(this->bob->acceptShare(other.URL, patiently()).error);
  this->next();
  EXPECT_OK(removeError(*this->alice, share.recordID));
  const CKZoneChanges page = this->next();
  EXPECT_EQ(deletedNames(page), (NameSet{"folder", "a", "sub", "b", "share of folder"}));
  EXPECT_TRUE(page.changedRecords.empty());
  EXPECT_EQ(changedNames(changesAtAlices(*this->bobs)), (NameSet{"outside", "share of outside"}));
  EXPECT_TRUE(changesAtAlices(*this->bobs).deletedRecords.empty());
  EXPECT_OK(removeError(*this->alice, other.recordID));
  EXPECT_CODE(changesAtAlices(*this->bobs, this->token).error, zoneNotFound);
}

TYPED_TEST_P(CloudShareFeed, whoComesBackGoesOnFromTheOldToken) {
  CKShare share = this->shareFolderWithBob();
  this->next();
  CKShare without = share;
  without.participants.pop_back();
  without = saveShare(*this->alice, without);
  EXPECT_OK(removeError(*this->alice, item("a").recordID));
  save(*this->alice, child("new", "folder"));
  without.participants.push_back(named("bob"));
  saveShare(*this->alice, without);
  EXPECT_OK(this->bob->acceptShare(share.URL, patiently()).error);
  const CKZoneChanges page = this->next();
  EXPECT_EQ(changedNames(page), (NameSet{"folder", "sub", "b", "new", "share of folder"}));
  EXPECT_EQ(deletedNames(page), NameSet{"a"});
}

TYPED_TEST_P(CloudShareFeed, pagesMeetWithoutGapOrOverlap) {
  this->shareFolderWithBob();
  NameSet told;
  std::size_t count = 0;
  bool isMore = true;
  while (isMore) {
    const CKZoneChanges page = changesAtAlices(*this->bobs, this->token, 2);
    ASSERT_FALSE(page.error);
    ASSERT_LE(page.changedRecords.size(), 2U);
    told.merge(changedNames(page));
    count += page.changedRecords.size();
    this->token = page.token;
    isMore = page.moreComing;
  }
  EXPECT_EQ(told.size(), 5U);
  EXPECT_EQ(count, 5U);
}

TYPED_TEST_P(CloudShareFeed, tokensAreOfOneAccountAndOneDatabase) {
  CKShare share = this->shareFolderWithBob();
  share.participants.push_back(named("eve"));
  saveShare(*this->alice, share);
  EXPECT_OK(this->eve->acceptShare(share.URL, patiently()).error);
  const CKServerChangeToken ofBob = changesAtAlices(*this->bobs).token;
  const CKServerChangeToken ofAlice = changes(*this->alice).token;
  EXPECT_CODE(changesAtAlices(*this->eves, ofBob).error, changeTokenExpired);
  EXPECT_CODE(changesAtAlices(*this->bobs, ofAlice).error, changeTokenExpired);
  EXPECT_CODE(changes(*this->alice, ofBob).error, changeTokenExpired);
}

TYPED_TEST_P(CloudShareFeed, theOwnerIsToldOfAcceptedShares) {
  this->makeTree();
  const CKShare share = saveShare(*this->alice, shareOf("folder", {named("bob")}));
  const CKServerChangeToken before = changes(*this->alice).token;
  EXPECT_OK(this->bob->acceptShare(share.URL, patiently()).error);
  const CKZoneChanges page = changes(*this->alice, before);
  EXPECT_EQ(changedNames(page), NameSet{"share of folder"});
  EXPECT_EQ(page.changedRecords.at(0).modifiedByDevice, "bobs device");
}

TYPED_TEST_P(CloudShareFeed, subscribersAreToldOfTheirOwnAndNotOfOthersZones) {
  this->shareFolderWithBob();
  std::mutex mutex;
  std::condition_variable changed;
  std::map<std::string, std::set<CKRecordZoneID>> told;
  const auto telling = [&](const std::string &who) {
    return [&, who](const std::vector<CKRecordZoneID> &zones) {
      const std::lock_guard lock(mutex);
      told[who].insert(zones.begin(), zones.end());
      changed.notify_all();
    };
  };
  const auto first = this->bobs->subscribe(telling("bob's shared"), nullptr);
  const auto second = this->bob->subscribe(telling("bob's private"), nullptr);
  const auto third = this->eves->subscribe(telling("eve's shared"), nullptr);
  const auto fourth = this->alice->subscribe(telling("alice"), nullptr);
  save(*this->alice, child("new", "folder"));
  save(*this->bobs, atAlices(child("newer", "folder")));
  std::unique_lock lock(mutex);
  EXPECT_TRUE(changed.wait_for(lock, kTestDeadline, [&] { return told.size() == 2; }));
  EXPECT_EQ(told["bob's shared"], std::set<CKRecordZoneID>{kAlices});
  EXPECT_EQ(told["alice"], std::set<CKRecordZoneID>{kZone});
  told.clear();
  lock.unlock();
  EXPECT_OK(removeError(*this->alice, {"share of folder", kZone}));
  lock.lock();
  EXPECT_TRUE(changed.wait_for(lock, kTestDeadline, [&] { return told.contains("bob's shared"); }));
  EXPECT_EQ(told["bob's shared"], std::set<CKRecordZoneID>{kAlices});
  EXPECT_FALSE(told.contains("eve's shared"));
  EXPECT_FALSE(told.contains("bob's private"));
}

REGISTER_TYPED_TEST_SUITE_P(CloudShareFeed, itTellsWhatIsSharedParentsFirstAndTheShare,
                            changesOfBothAreToldAndThoseElsewhereAreNot,
                            whatLeavesTheShareGoesWithAllBelowItAndMayComeBack,
                            aDeletedFolderTakesWhatIsLeftBelowItOutOfSight,
                            aWithdrawnShareIsToldAsDeletedWhereAnotherStays,
                            whoComesBackGoesOnFromTheOldToken, pagesMeetWithoutGapOrOverlap,
                            tokensAreOfOneAccountAndOneDatabase, theOwnerIsToldOfAcceptedShares,
                            subscribersAreToldOfTheirOwnAndNotOfOthersZones);

}  // namespace droxa::contract
