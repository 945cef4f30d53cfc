#pragma once

#include <random>

#include "tests/platform/cloudkit/contract/ShareCalls.h"
#include "tests/platform/cloudkit/contract/ShareModel.h"

namespace droxa::contract {

// Random hierarchies, shares and changes: what each account sees and may do is what the rules say.
template <class World>
class CloudShareProperties : public SharingTest<World> {
 protected:
  static constexpr int kRecords = 10;

  // What an account knows from its feed alone.
  struct Follower {
    std::string account;
    std::shared_ptr<CKCloud> own;
    std::shared_ptr<CKCloud> shared;
    CKServerChangeToken token;
    std::map<std::string, CKRecord> known;
  };

  int roll(int below) { return static_cast<int>(random() % static_cast<std::uint64_t>(below)); }
  std::string anyRecord() { return "r" + std::to_string(roll(kRecords)); }
  std::string anyParent() { return roll(4) == 0 ? std::string() : anyRecord(); }
  Follower &anyFollower() { return followers[static_cast<std::size_t>(roll(2))]; }

  static CKShareMetadataReply accept(Follower &who, const NSURL &url) {
    return who.own->acceptShare(url, patiently());
  }
  static CKRecord unconditional(const std::string &name, const std::string &parent) {
    CKRecord record = item(name, "saved " + name);
    record.fields[CKRecordParentKey] = parent;
    return record;
  }

  void ownerSaves() {
    const std::string name = anyRecord();
    const std::string parent = anyParent();
    save(*this->alice, unconditional(name, parent), CKRecordSavePolicy::allKeys);
    model.parents[name] = parent;
  }
  void ownerDeletes() {
    const std::string name = anyRecord();
    EXPECT_OK(removeError(*this->alice, item(name).recordID));
    model.remove(name);
  }
  void ownerShares() {
    const std::string root = anyRecord();
    if (!model.parents.contains(root)) return;
    CKShare share = shareOf(root);
    ShareModel::Parts parts;
    for (const Follower &who : followers) {
      if (roll(3) == 0) continue;
      const auto permission = static_cast<Permission>(roll(3));
      share.participants.push_back(named(who.account, permission));
      const auto before = model.shares.find(root);
      const bool had = before != model.shares.end() && before->second.contains(who.account) &&
                       before->second.at(who.account).hasAccepted;
      parts[who.account] = {permission, had};
    }
    const CKModifyReply reply = modify(*this->alice, {share.record()}, CKRecordSavePolicy::changedKeys);
    ASSERT_FALSE(reply.error) << reply.saved.at(0).error.description();
    urls[root] = CKShare::shareWithRecord(reply.saved.at(0).record)->URL;
    model.shares[root] = parts;
  }
  void ownerWithdraws() {
    if (model.shares.empty()) return;
    const auto share = std::next(model.shares.begin(), roll(static_cast<int>(model.shares.size())));
    EXPECT_OK(removeError(*this->alice, shareOf(share->first).recordID));
    model.shares.erase(share);
  }
  void followerAccepts() {
    Follower &who = anyFollower();
    for (auto &[root, parts] : model.shares) {
      const auto part = parts.find(who.account);
      const bool isWelcome = part != parts.end() && part->second.permission != Permission::none;
      EXPECT_EQ(!accept(who, urls[root]).error, isWelcome) << root;
      if (isWelcome) part->second.hasAccepted = true;
    }
  }
  void followerLeaves() {
    Follower &who = anyFollower();
    for (auto &[root, parts] : model.shares) {
      if (model.inShare(who.account, root) == Permission::none) continue;
      EXPECT_OK(removeError(*who.shared, {"share of " + root, kAlices}));
      parts[who.account].hasAccepted = false;
      return;
    }
  }
  void followerSaves() {
    Follower &who = anyFollower();
    const std::string name = anyRecord();
    const std::string parent = anyParent();
    const bool may = model.maySave(who.account, name, parent);
    const NSError error =
        saveError(*who.shared, atAlices(unconditional(name, parent)), CKRecordSavePolicy::allKeys);
    EXPECT_EQ(!error, may) << who.account << " saves " << name << " below " << parent << ": "
                           << error.description();
    if (!error) model.parents[name] = parent;
  }
  void followerDeletes() {
    Follower &who = anyFollower();
    const std::string name = anyRecord();
    const bool isSeen = model.seenBy(who.account).contains(name);
    const bool may = model.mayDelete(who.account, name);
    const NSError error = removeError(*who.shared, idAtAlices(name));
    const bool isNothing = !isSeen && !model.seenBy(who.account).empty();
    EXPECT_EQ(!error, may || isNothing) << who.account << " deletes " << name;
    if (may && !error) model.remove(name);
  }

  void step() {
    switch (roll(12)) {
      case 0:
        return ownerDeletes();
      case 1:
      case 2:
        return ownerShares();
      case 3:
        return ownerWithdraws();
      case 4:
      case 5:
        return followerAccepts();
      case 6:
        return followerLeaves();
      case 7:
      case 8:
        return followerSaves();
      case 9:
        return followerDeletes();
      default:
        return ownerSaves();
    }
  }

  void follow(Follower &who) {
    bool isMore = true;
    while (isMore) {
      const CKZoneChanges page = changesAtAlices(*who.shared, who.token, 3);
      ASSERT_FALSE(page.error) << page.error.description();
      for (const CKRecord &record : page.changedRecords) who.known[record.recordID.recordName] = record;
      for (const CKDeletedRecord &record : page.deletedRecords) {
        EXPECT_EQ(who.known.erase(record.recordID.recordName), 1U)
            << who.account << " never saw " << record.recordID.recordName;
      }
      who.token = page.token;
      isMore = page.moreComing;
    }
  }

  void check(Follower &who) {
    const NameSet seen = model.seenBy(who.account);
    EXPECT_EQ(who.shared->listZones(patiently()).zones.size(), seen.empty() ? 0U : 1U);
    if (seen.empty()) {
      EXPECT_CODE(changesAtAlices(*who.shared, who.token).error, zoneNotFound);
      return;
    }
    EXPECT_EQ(changedNames(changesAtAlices(*who.shared)), seen);
    follow(who);
    NameSet known;
    for (const auto &record : who.known) known.insert(record.first);
    EXPECT_EQ(known, seen);
    for (int i = 0; i < kRecords; ++i) {
      const std::string name = "r" + std::to_string(i);
      const CKRecordResult result = fetch(*who.shared, idAtAlices(name));
      EXPECT_EQ(!result.error, seen.contains(name)) << who.account << " and " << name;
      if (!result.error) {
        EXPECT_EQ(result.record, who.known[name]);
      }
    }
  }

  void run(std::uint64_t seed) {
    random.seed(seed);
    for (int i = 0; i < 80 && !this->HasFailure(); ++i) {
      step();
      for (Follower &who : followers) check(who);
      if (this->HasFailure()) ADD_FAILURE() << "step " << i << " of seed " << seed;
    }
  }

  std::mt19937_64 random;
  ShareModel model;
  std::map<std::string, NSURL> urls;  // by the root
  std::vector<Follower> followers{{"bob", this->bob, this->bobs, {}, {}},
                                  {"eve", this->eve, this->eves, {}, {}}};
};
TYPED_TEST_SUITE_P(CloudShareProperties);

TYPED_TEST_P(CloudShareProperties, whatAccountsSeeAndMayDoIsWhatTheRulesSay1) {
  this->run(1);
}
TYPED_TEST_P(CloudShareProperties, whatAccountsSeeAndMayDoIsWhatTheRulesSay2) {
  this->run(2);
}
TYPED_TEST_P(CloudShareProperties, whatAccountsSeeAndMayDoIsWhatTheRulesSay3) {
  this->run(3);
}
TYPED_TEST_P(CloudShareProperties, whatAccountsSeeAndMayDoIsWhatTheRulesSay4) {
  this->run(4);
}

REGISTER_TYPED_TEST_SUITE_P(CloudShareProperties, whatAccountsSeeAndMayDoIsWhatTheRulesSay1,
                            whatAccountsSeeAndMayDoIsWhatTheRulesSay2,
                            whatAccountsSeeAndMayDoIsWhatTheRulesSay3,
                            whatAccountsSeeAndMayDoIsWhatTheRulesSay4);

}  // namespace droxa::contract
