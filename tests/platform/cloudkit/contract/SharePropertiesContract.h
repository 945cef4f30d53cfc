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
  static std::string record(int number) { return "r" + std::to_string(number); }
  std::string anyRecord() { return record(roll(kRecords)); }
  // Mostly one with a lower number, so that there are trees; sometimes any, so that there are circles.
  std::string anyParent(const std::string &name) {
    const int number = std::stoi(name.substr(1));
    const int way = roll(12);
    if (way == 0) return {};
    if (way == 1) return anyRecord();
    return number == 0 ? std::string() : record(roll(number));
  }
  // Mostly one that few lie below.
  std::string anyLowRecord() {
    return roll(4) == 0 ? anyRecord() : record(kRecords - 1 - roll(kRecords / 2));
  }
  Follower &anyFollower() { return followers[static_cast<std::size_t>(roll(2))]; }

  static CKShareMetadataReply accept(Follower &who, const NSURL &url) {
    return who.own->acceptShare(url, patiently());
  }
  static CKRecord unconditional(const std::string &name, const std::string &parent) {
    CKRecord saved = item(name, "saved " + name);
    saved.fields[CKRecordParentKey] = parent;
    return saved;
  }

  void ownerSaves() {
    const std::string name = anyRecord();
    const std::string parent = anyParent(name);
    save(*this->alice, unconditional(name, parent), CKRecordSavePolicy::allKeys);
    model.parents[name] = parent;
  }
  void ownerDeletes() {
    const std::string name = anyLowRecord();
    EXPECT_OK(removeError(*this->alice, item(name).recordID));
    model.remove(name);
  }
  void ownerShares() {
    const std::string root = record(roll(kRecords / 2));
    if (!model.parents.contains(root)) return;
    CKShare share = shareOf(root);
    ShareModel::Parts parts;
    for (const Follower &who : followers) {
      if (roll(5) == 0) continue;
      const auto permission = roll(3) == 0 ? static_cast<Permission>(roll(3)) : Permission::readWrite;
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
    const std::string parent = anyParent(name);
    const bool may = model.maySave(who.account, name, parent);
    const NSError error =
        saveError(*who.shared, atAlices(unconditional(name, parent)), CKRecordSavePolicy::allKeys);
    EXPECT_EQ(!error, may) << who.account << " saves " << name << " below " << parent << ": "
                           << error.description();
    if (error) return;
    if (model.parents.contains(name) && model.parents[name] != parent) ++moves;
    if (!model.parents.contains(name)) ++creations;
    model.parents[name] = parent;
  }
  void followerDeletes() {
    Follower &who = anyFollower();
    const std::string name = anyLowRecord();
    const bool isSeen = model.seenBy(who.account).contains(name);
    const bool may = model.mayDelete(who.account, name);
    const NSError error = removeError(*who.shared, idAtAlices(name));
    const bool isNothing = !isSeen && !model.seenBy(who.account).empty();
    EXPECT_EQ(!error, may || isNothing) << who.account << " deletes " << name;
    if (may && !error) {
      model.remove(name);
      ++deletions;
    }
  }

  void step() {
    const int kind = roll(40);
    if (kind < 3) return ownerDeletes();
    if (kind < 8) return ownerShares();
    if (kind < 9) return ownerWithdraws();
    if (kind < 14) return followerAccepts();
    if (kind < 15) return followerLeaves();
    if (kind < 25) return followerSaves();
    if (kind < 28) return followerDeletes();
    ownerSaves();
  }

  void follow(Follower &who) {
    bool isMore = true;
    while (isMore) {
      const CKZoneChanges page = changesAtAlices(*who.shared, who.token, 3);
      ASSERT_FALSE(page.error) << page.error.description();
      for (const CKRecord &changed : page.changedRecords) who.known[changed.recordID.recordName] = changed;
      for (const CKDeletedRecord &gone : page.deletedRecords) {
        EXPECT_EQ(who.known.erase(gone.recordID.recordName), 1U)
            << who.account << " never saw " << gone.recordID.recordName;
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
    for (const auto &entry : who.known) known.insert(entry.first);
    EXPECT_EQ(known, seen);
    for (int i = 0; i < kRecords; ++i) {
      const std::string name = record(i);
      const CKRecordResult result = fetch(*who.shared, idAtAlices(name));
      EXPECT_EQ(!result.error, seen.contains(name)) << who.account << " and " << name;
      if (!result.error) {
        EXPECT_EQ(result.record, who.known[name]);
      }
    }
  }

  void run(std::uint64_t seed) {
    random.seed(seed);
    for (int i = 0; i < kRecords; ++i) {
      const std::string name = record(i);
      model.parents[name] = i == 0 ? std::string() : record(roll(i));
      save(*this->alice, unconditional(name, model.parents[name]));
    }
    for (int i = 0; i < 200 && !this->HasFailure(); ++i) {
      step();
      for (Follower &who : followers) check(who);
      if (this->HasFailure()) ADD_FAILURE() << "step " << i << " of seed " << seed;
    }
    // Otherwise the history was about nothing.
    EXPECT_GT(creations + deletions, 0);
    EXPECT_GT(moves, 0);
  }

  std::mt19937_64 random;
  ShareModel model;
  std::map<std::string, NSURL> urls;  // by the root
  int creations = 0;                  // by those with whom something is shared
  int moves = 0;
  int deletions = 0;
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
