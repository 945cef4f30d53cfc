#pragma once

#include <algorithm>
#include <atomic>
#include <condition_variable>
#include <set>
#include <sys/wait.h>
#include <thread>

#include "tests/platform/cloudkit/contract/Calls.h"

namespace droxa::contract {

template <class World>
class CloudChanges : public testing::Test {
 protected:
  void SetUp() override { EXPECT_OK(cloud->saveZone(kZone, patiently())); }

  static std::vector<std::string> names(const CKZoneChanges &page) {
    std::vector<std::string> names;
    for (const CKRecord &record : page.changedRecords) names.push_back(record.recordID.recordName);
    return names;
  }
  // Saves records of a prefix one call each; in its own process it opens its own device.
  static bool saveMany(CKCloud &device, const std::string &prefix, int count) {
    for (int i = 0; i < count; ++i) {
      if (modify(device, {item(prefix + std::to_string(i))}).error) return false;
    }
    return true;
  }
  // Follows the feed in small pages until it has seen so many records.
  static std::set<std::string> follow(CKCloud &device, std::size_t count) {
    std::set<std::string> seen;
    CKServerChangeToken token;
    eventually(
        [&] {
          const CKZoneChanges page = changes(device, token, 7);
          EXPECT_OK(page.error);
          token = page.token;
          for (const std::string &name : names(page)) seen.insert(name);
          return seen.size() >= count || page.error;
        },
        std::chrono::seconds(120));
    return seen;
  }

  World world;
  const std::shared_ptr<CKCloud> cloud = world.open("one");
  const std::shared_ptr<CKCloud> other = world.open("two");
};
TYPED_TEST_SUITE_P(CloudChanges);

using Names = std::vector<std::string>;

TYPED_TEST_P(CloudChanges, theFeedTellsTheLatestStatesTheOldestChangeFirst) {
  CKRecord a = save(*this->cloud, item("a"));
  save(*this->cloud, item("b"));
  a.fields["title"] = std::string("later");
  a = save(*this->other, a);
  const CKZoneChanges page = changes(*this->cloud);
  EXPECT_OK(page.error);
  EXPECT_EQ(this->names(page), (Names{"b", "a"}));
  EXPECT_EQ(page.changedRecords.at(1), a);
  EXPECT_FALSE(page.moreComing);
  const CKZoneChanges nothing = changes(*this->cloud, page.token);
  EXPECT_TRUE(nothing.changedRecords.empty());
  EXPECT_EQ(nothing.token, page.token);
}

TYPED_TEST_P(CloudChanges, deletionsAreToldWithTheirTypesToThoseWhoHaveAToken) {
  save(*this->cloud, item("a"));
  save(*this->cloud, item("b"));
  const CKServerChangeToken token = changes(*this->cloud).token;
  EXPECT_OK(removeError(*this->other, item("a").recordID));
  const CKZoneChanges page = changes(*this->cloud, token);
  EXPECT_TRUE(page.changedRecords.empty());
  EXPECT_EQ(page.deletedRecords, (std::vector<CKDeletedRecord>{{item("a").recordID, "Item", "two"}}));
  EXPECT_TRUE(changes(*this->cloud).deletedRecords.empty());
  EXPECT_EQ(this->names(changes(*this->cloud)), Names{"b"});
}

TYPED_TEST_P(CloudChanges, aRecordThatCameBackIsChangedAndNotDeleted) {
  save(*this->cloud, item("a"));
  const CKServerChangeToken token = changes(*this->cloud).token;
  EXPECT_OK(removeError(*this->cloud, item("a").recordID));
  save(*this->cloud, item("a", "again"));
  const CKZoneChanges page = changes(*this->cloud, token);
  EXPECT_EQ(this->names(page), Names{"a"});
  EXPECT_TRUE(page.deletedRecords.empty());
}

TYPED_TEST_P(CloudChanges, pagesMeetWithoutGapOrOverlap) {
  for (const char *name : {"a", "b", "c", "d", "e"}) save(*this->cloud, item(name));
  CKZoneChanges page = changes(*this->cloud, {}, 2);
  EXPECT_EQ(this->names(page), (Names{"a", "b"}));
  EXPECT_TRUE(page.moreComing);
  page = changes(*this->cloud, page.token, 2);
  EXPECT_EQ(this->names(page), (Names{"c", "d"}));
  EXPECT_TRUE(page.moreComing);
  EXPECT_OK(removeError(*this->cloud, item("a").recordID));
  page = changes(*this->cloud, page.token, 2);
  EXPECT_EQ(this->names(page), Names{"e"});
  EXPECT_EQ(page.deletedRecords.size(), 1U);
  EXPECT_FALSE(page.moreComing);
}

TYPED_TEST_P(CloudChanges, largeRecordsAllComeHoweverPagesAreCut) {
  constexpr std::size_t kCount = 20;
  for (std::size_t i = 0; i < kCount; ++i) {
    save(*this->cloud, item(std::to_string(i), std::string(900 * 1024, 'x')));
  }
  EXPECT_EQ(this->follow(*this->other, kCount).size(), kCount);
  CKZoneChanges page = changes(*this->other);
  std::size_t told = page.changedRecords.size();
  while (page.moreComing) {
    page = changes(*this->other, page.token);
    told += page.changedRecords.size();
  }
  EXPECT_EQ(told, kCount);
}

TYPED_TEST_P(CloudChanges, changesHoldDesiredKeysOnly) {
  save(*this->cloud, item("a"));
  const CKZoneChanges page =
      this->cloud->fetchZoneChanges(kZone, {}, std::set<std::string>{}, 10, patiently());
  EXPECT_TRUE(page.changedRecords.at(0).fields.empty());
}

TYPED_TEST_P(CloudChanges, tokensOfAnotherCloudZoneOrOriginHaveExpired) {
  const CKServerChangeToken token = changes(*this->cloud).token;
  const auto another = this->world.openAnotherCloud("one");
  EXPECT_OK(another->saveZone(kZone, patiently()));
  EXPECT_CODE(changes(*another, token).error, changeTokenExpired);
  EXPECT_CODE(changes(*this->cloud, {NSData::dataWithString("no token")}).error, changeTokenExpired);
  EXPECT_CODE(changes(*this->cloud, {NSData::dataWithString("")}).error, changeTokenExpired);
  EXPECT_OK(this->cloud->deleteZone(kZone, patiently()));
  EXPECT_OK(this->cloud->saveZone(kZone, patiently()));
  EXPECT_CODE(changes(*this->cloud, token).error, changeTokenExpired);
}

TYPED_TEST_P(CloudChanges, limitsThatCantBeAreRefused) {
  EXPECT_CODE(changes(*this->cloud, {}, 0).error, invalidArguments);
  EXPECT_CODE(changes(*this->cloud, {}, CKMostRecordsPerCall + 1).error, invalidArguments);
}

TYPED_TEST_P(CloudChanges, twoDevicesAtOnceLoseNothingAndAFollowerSeesAll) {
  std::thread one([this] { EXPECT_TRUE(this->saveMany(*this->cloud, "one", 500)); });
  std::thread two([this] { EXPECT_TRUE(this->saveMany(*this->other, "two", 500)); });
  EXPECT_EQ(this->follow(*this->world.open("three"), 1000).size(), 1000U);
  one.join();
  two.join();
}

TYPED_TEST_P(CloudChanges, twoProcessesAtOnceLoseNothingAndAFollowerSeesAll) {
  std::vector<pid_t> children;
  for (const char *name : {"four", "five"}) {
    const pid_t child = fork();
    if (child == 0) {
      const auto device = this->world.open(name);
      _exit(device && this->saveMany(*device, name, 500) ? 0 : 1);
    }
    children.push_back(child);
  }
  EXPECT_EQ(this->follow(*this->world.open("three"), 1000).size(), 1000U);
  for (const pid_t child : children) {
    int status = -1;
    EXPECT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0);
  }
}

// Counts by zone what a subscription told.
class Told {
 public:
  CKZonesChangedHandler handler() {
    return [this](const std::vector<CKRecordZoneID> &zones) {
      const Lock lock(mutex_);
      for (const CKRecordZoneID &zone : zones) ++counts_[zone];
    };
  }
  int count(const CKRecordZoneID &zone = kZone) {
    const Lock lock(mutex_);
    return counts_[zone];
  }

 private:
  Mutex mutex_;
  std::map<CKRecordZoneID, int> counts_ GUARDED_BY(mutex_);
};

TYPED_TEST_P(CloudChanges, aSubscriberIsSoonToldOfTheChangesOfOthers) {
  Told told;
  NSError error;
  const auto subscription = this->cloud->subscribe(told.handler(), &error);
  ASSERT_TRUE(subscription) << error.description();
  std::vector<std::chrono::steady_clock::duration> waits;
  for (int i = 0; i < 15; ++i) {
    const int before = told.count();
    save(*this->other, item(std::to_string(i)));
    const auto start = std::chrono::steady_clock::now();
    EXPECT_TRUE(eventually([&] { return told.count() > before; }));
    waits.push_back(std::chrono::steady_clock::now() - start);
  }
  std::sort(waits.begin(), waits.end());
  // Generous for a loaded machine; far below the time in which watchers look by themselves.
  EXPECT_LT(waits[waits.size() / 2], std::chrono::milliseconds(500));
}

TYPED_TEST_P(CloudChanges, aSubscriberIsToldOfZonesThatOthersMakeAndDelete) {
  Told told;
  const auto subscription = this->cloud->subscribe(told.handler(), nullptr);
  ASSERT_TRUE(subscription);
  EXPECT_OK(this->other->saveZone({"new"}, patiently()));
  EXPECT_TRUE(eventually([&] { return told.count({"new"}) == 1; }));
  EXPECT_OK(this->other->deleteZone({"new"}, patiently()));
  EXPECT_TRUE(eventually([&] { return told.count({"new"}) == 2; }));
}

TYPED_TEST_P(CloudChanges, anEndedSubscriptionIsSilent) {
  Told ended;
  Told told;
  auto first = this->cloud->subscribe(ended.handler(), nullptr);
  const auto second = this->cloud->subscribe(told.handler(), nullptr);
  first.reset();
  save(*this->other, item("a"));
  EXPECT_TRUE(eventually([&] { return told.count() > 0; }));
  EXPECT_EQ(ended.count(), 0);
}

TYPED_TEST_P(CloudChanges, aSubscriptionMayBeEndedInItsOwnHandler) {
  struct Shared {
    Mutex mutex;
    std::unique_ptr<CKSubscription> subscription GUARDED_BY(mutex);
    std::atomic<int> calls{0};
  };
  const auto shared = std::make_shared<Shared>();
  {
    const Lock lock(shared->mutex);
    shared->subscription = this->cloud->subscribe(
        [shared](const std::vector<CKRecordZoneID> &) {
          const Lock inner(shared->mutex);
          shared->subscription.reset();
          ++shared->calls;
        },
        nullptr);
  }
  save(*this->other, item("a"));
  EXPECT_TRUE(eventually([&] { return shared->calls > 0; }));
  Told told;
  const auto another = this->cloud->subscribe(told.handler(), nullptr);
  save(*this->other, item("b"));
  EXPECT_TRUE(eventually([&] { return told.count() > 0; }));
  EXPECT_EQ(shared->calls, 1);
}

REGISTER_TYPED_TEST_SUITE_P(CloudChanges, theFeedTellsTheLatestStatesTheOldestChangeFirst,
                            deletionsAreToldWithTheirTypesToThoseWhoHaveAToken,
                            aRecordThatCameBackIsChangedAndNotDeleted, pagesMeetWithoutGapOrOverlap,
                            changesHoldDesiredKeysOnly, largeRecordsAllComeHoweverPagesAreCut,
                            tokensOfAnotherCloudZoneOrOriginHaveExpired, limitsThatCantBeAreRefused,
                            twoDevicesAtOnceLoseNothingAndAFollowerSeesAll,
                            twoProcessesAtOnceLoseNothingAndAFollowerSeesAll,
                            aSubscriberIsSoonToldOfTheChangesOfOthers,
                            aSubscriberIsToldOfZonesThatOthersMakeAndDelete, anEndedSubscriptionIsSilent,
                            aSubscriptionMayBeEndedInItsOwnHandler);

}  // namespace droxa::contract
