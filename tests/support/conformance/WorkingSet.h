#pragma once

#include "tests/support/conformance/DaemonConformanceFixture.h"

// The rank, and the working set's changes.

namespace droxa {

// Follows the feed as a client does: from a token until it comes back unchanged.
class DaemonConformanceFeed {
 public:
  explicit DaemonConformanceFeed(std::shared_ptr<QVProtocol> daemon, std::uint64_t limit = 200)
      : daemon_(std::move(daemon)), limit_(limit) {}

  void drain() {
    updated.clear();
    deleted.clear();
    for (int batches = 0; batches < 10'000; ++batches)
      if (!step()) return;
    ADD_FAILURE() << "the feed doesn't end";
  }
  // One batch; false at the end.
  bool step() {
    Once<QVQueryItems, std::vector<QVFileObjectID>, NSData, NSError> answer("working set");
    daemon_->enumerateWorkingSetChangesFromChangeToken(token, limit_, answer.completion());
    EXPECT_EQ(answer.value<3>(), NSError());
    const QVQueryItems items = answer.value<0>();
    const std::vector<QVFileObjectID> dead = answer.value<1>();
    const NSData next = answer.value<2>();
    EXPECT_TRUE(next);
    EXPECT_LE(items.size() + dead.size(), limit_);
    if (next == token) {
      EXPECT_TRUE(items.empty());
      EXPECT_TRUE(dead.empty());
      return false;
    }
    updated.insert(updated.end(), items.begin(), items.end());
    deleted.insert(deleted.end(), dead.begin(), dead.end());
    token = next;
    return static_cast<bool>(next);
  }

  bool hasUpdate(const QVFileObjectID &fileObjectID) const { return updates(fileObjectID) > 0; }
  std::size_t updates(const QVFileObjectID &fileObjectID) const {
    std::size_t count = 0;
    for (const auto &item : updated)
      if (item->fileObjectID() == fileObjectID) ++count;
    return count;
  }
  bool hasDeath(const QVFileObjectID &fileObjectID) const {
    return std::find(deleted.begin(), deleted.end(), fileObjectID) != deleted.end();
  }

  NSData token;
  QVQueryItems updated;
  std::vector<QVFileObjectID> deleted;

 private:
  const std::shared_ptr<QVProtocol> daemon_;
  const std::uint64_t limit_;
};

TEST_P(DaemonConformance, theRankOnlyGrows) {
  settle();
  std::uint64_t last = rank();
  EXPECT_EQ(rank(), last);
  file("a");
  settle();
  EXPECT_GT(rank(), last);
  last = rank();
  EXPECT_EQ(item("a")->fields().changeRank, last);
  rename("a", "b");
  settle();
  EXPECT_GT(rank(), last);
  last = rank();
  remove("b");
  settle();
  EXPECT_GT(rank(), last);
}

TEST_P(DaemonConformance, theFeedFromTheStartTellsEveryItemOnce) {
  folder("f");
  file("f/a");
  file("b");
  settle();
  for (const std::uint64_t limit : {1U, 2U, 200U}) {
    DaemonConformanceFeed feed(daemon(), limit);
    feed.drain();
    for (const char *path : {"f", "f/a", "b"}) EXPECT_EQ(feed.updates(identifier(path)), 1U) << path << limit;
  }
}

TEST_P(DaemonConformance, theFeedEndsWithItsOwnToken) {
  file("a");
  settle();
  DaemonConformanceFeed feed(daemon());
  feed.drain();
  const NSData end = feed.token;
  feed.drain();
  EXPECT_EQ(feed.token, end);
  EXPECT_TRUE(feed.updated.empty());
}

TEST_P(DaemonConformance, theFeedTellsWhatChangedSince) {
  file("a");
  file("b");
  file("c");
  settle();
  DaemonConformanceFeed feed(daemon());
  feed.drain();
  const QVFileObjectID a = identifier("a");
  const QVFileObjectID b = identifier("b");
  const QVFileObjectID c = identifier("c");
  world_->changeFile(at("b"), 77, 5'000);
  rename("c", "d");
  remove("a");
  file("new");
  settle();
  feed.drain();
  EXPECT_EQ(feed.updates(b), 1U);
  EXPECT_EQ(feed.updates(c), 1U);
  EXPECT_EQ(feed.updates(identifier("new")), 1U);
  EXPECT_EQ(feed.deleted, std::vector<QVFileObjectID>({a}));
  for (const auto &one : feed.updated) {
    EXPECT_FALSE(one->isDead());
    if (one->fileObjectID() == b) {
      EXPECT_EQ(one->fields().documentSize, 77U);
    }
    if (one->fileObjectID() == c) {
      EXPECT_EQ(one->fields().filename, "d");
    }
  }
}

TEST_P(DaemonConformance, theFeedTellsTheOldestChangesFirst) {
  settle();
  DaemonConformanceFeed feed(daemon(), 1);
  feed.drain();
  for (const char *path : {"c", "a", "b"}) {
    file(path);
    settle();
  }
  feed.drain();
  std::vector<std::string> made;
  for (const std::string &name : names(feed.updated))
    if (name.size() == 1) made.push_back(name);
  EXPECT_EQ(made, std::vector<std::string>({"c", "a", "b"}));
}

TEST_P(DaemonConformance, anItemThatChangedTwiceIsToldOnceAsItIsNow) {
  file("a");
  settle();
  DaemonConformanceFeed feed(daemon());
  feed.drain();
  const QVFileObjectID a = identifier("a");
  world_->changeFile(at("a"), 2, 5'000);
  settle();
  world_->changeFile(at("a"), 3, 6'000);
  settle();
  feed.drain();
  EXPECT_EQ(feed.updates(a), 1U);
  for (const auto &one : feed.updated)
    if (one->fileObjectID() == a) {
      EXPECT_EQ(one->fields().documentSize, 3U);
    }
}

TEST_P(DaemonConformance, aFolderThatDiesTakesItsItemsAlong) {
  folder("f");
  file("f/a");
  settle();
  DaemonConformanceFeed feed(daemon());
  feed.drain();
  const QVFileObjectID f = identifier("f");
  const QVFileObjectID a = identifier("f/a");
  remove("f");
  settle();
  feed.drain();
  EXPECT_TRUE(feed.hasDeath(f));
  EXPECT_TRUE(feed.hasDeath(a));
}

TEST_P(DaemonConformance, aTokenOfAnotherDriveHasExpired) {
  settle();
  for (const NSData &token : {NSData::dataWithString("not a token"), NSData::dataWithString(""),
                              NSData::dataWithString(std::string(100'000, 'x'))}) {
    Once<QVQueryItems, std::vector<QVFileObjectID>, NSData, NSError> answer("working set");
    daemon()->enumerateWorkingSetChangesFromChangeToken(token, 200, answer.completion());
    EXPECT_EQ(tessalyCode(answer.value<3>()), QVErrorChangeTokenExpired) << token.length();
  }
}

}  // namespace droxa
