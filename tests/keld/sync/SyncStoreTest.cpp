#include <gtest/gtest.h>

#include "keld/sync/SyncStore.h"
#include "platform/cloudkit/CKError.h"
#include "tests/platform/TemporaryFolder.h"

namespace droxa::keld {
namespace {

class SyncStoreTest : public testing::Test {
 protected:
  SyncRow row(const std::string &record, ItemNumber item, const std::string &tag = "t1") {
    SyncRow made;
    made.record = record;
    made.item = item;
    made.tag = tag;
    made.parent = "container:c";
    made.name = record + ".txt";
    made.content = {5, -7, "digest", 0644};
    made.local = {11, 5, -7, 13};
    made.isDataless = true;
    made.metadata = {{"Red", "Work"}, -9, 12};
    made.newerTag = "t2";
    made.newer = {6, 8, "newer", 0600};
    return made;
  }
  std::vector<ItemNumber> due(std::int64_t now = 1000) {
    std::vector<ItemNumber> items;
    for (const QueuedUpload &each : store.due(now, 100)) items.push_back(each.item);
    return items;
  }
  using Items = std::vector<ItemNumber>;

  const TemporaryFolder folder;
  const std::string path = folder.path() + "/sync.sqlite";
  SyncStore store{path};
};

TEST_F(SyncStoreTest, aRowComesBackAsItWasPut) {
  const SyncRow put = row("r", 7);
  store.put(put);
  for (const auto &got : {store.byRecord("r"), store.byItem(7), store.byName("container:c", "r.txt")}) {
    ASSERT_TRUE(got);
    EXPECT_EQ(got->record, "r");
    EXPECT_EQ(got->item, 7U);
    EXPECT_EQ(got->tag, "t1");
    EXPECT_EQ(got->parent, "container:c");
    EXPECT_EQ(got->name, "r.txt");
    EXPECT_EQ(got->content, put.content);
    EXPECT_EQ(got->local, put.local);
    EXPECT_TRUE(got->isDataless);
    EXPECT_EQ(got->metadata, put.metadata);
    EXPECT_EQ(got->newerTag, "t2");
    EXPECT_EQ(got->newer, put.newer);
  }
  store.erase("r");
  EXPECT_FALSE(store.byRecord("r"));
}

TEST_F(SyncStoreTest, namesOfAnyBytesAreFound) {
  SyncRow odd = row("r", 1);
  odd.name = std::string("\xff\n'%_", 5);
  store.put(odd);
  ASSERT_TRUE(store.byName("container:c", odd.name));
  EXPECT_EQ(store.byName("container:c", odd.name)->name, odd.name);
}

TEST_F(SyncStoreTest, noItemIsAskedForByTheNumberOfNone) {
  store.put(row("r", 0));
  EXPECT_FALSE(store.byItem(0));
}

TEST_F(SyncStoreTest, anItemStandsForOneRecord) {
  store.put(row("first", 7));
  store.put(row("second", 7));
  EXPECT_EQ(store.byItem(7)->record, "second");
  EXPECT_EQ(store.byRecord("first")->item, 0U);
}

TEST_F(SyncStoreTest, uploadsAreDueInTheOrderOfTheirFirstChange) {
  for (const ItemNumber item : Items{3, 1, 2}) store.enqueue(item, false, false);
  store.enqueue(3, false, false);
  EXPECT_EQ(due(), (Items{3, 1, 2}));
  EXPECT_EQ(store.countQueued(), 3U);
}

TEST_F(SyncStoreTest, whatChangesWhileItIsSentStaysQueued) {
  store.enqueue(1, false, false);
  const QueuedUpload sent = *store.queued(1);
  store.enqueue(1, false, false);
  store.uploaded(sent);
  ASSERT_TRUE(store.queued(1));
  EXPECT_EQ(store.queued(1)->generation, sent.generation + 1);
  store.uploaded(*store.queued(1));
  EXPECT_FALSE(store.queued(1));
}

TEST_F(SyncStoreTest, aFailedUploadWaitsAndKeepsItsError) {
  store.enqueue(1, false, false);
  const NSError error = CKErrorMake(CKErrorCode::quotaExceeded, "full");
  store.uploadFailed(*store.queued(1), error, 2000);
  EXPECT_EQ(due(1999), Items());
  EXPECT_EQ(due(2000), Items{1});
  const QueuedUpload failed = *store.queued(1);
  EXPECT_EQ(failed.attempts, 1);
  EXPECT_TRUE(CKErrorIs(failed.error, CKErrorCode::quotaExceeded));
  EXPECT_EQ(failed.error.localizedDescription(), "full");
  EXPECT_EQ(store.nextRetry(), 2000);
  EXPECT_EQ(store.countFailed(), 1U);
}

TEST_F(SyncStoreTest, whatOnlyWaitsForSomethingElseHasNotFailed) {
  store.enqueue(1, false, false);
  store.uploadFailed(*store.queued(1), NSError(), 2000);
  EXPECT_EQ(due(1999), Items());
  EXPECT_EQ(store.queued(1)->attempts, 0);
  EXPECT_FALSE(store.queued(1)->error);
  EXPECT_EQ(store.countFailed(), 0U);
}

TEST_F(SyncStoreTest, aFailureOfAnOlderStateIsNotOneOfTheNewer) {
  store.enqueue(1, false, false);
  const QueuedUpload old = *store.queued(1);
  store.enqueue(1, false, false);
  store.uploadFailed(old, CKErrorMake(CKErrorCode::internalError, ""), 2000);
  EXPECT_FALSE(store.queued(1)->error);
  EXPECT_EQ(due(), Items{1});
}

TEST_F(SyncStoreTest, anotherChangeForgetsTheFailure) {
  store.enqueue(1, false, false);
  store.uploadFailed(*store.queued(1), CKErrorMake(CKErrorCode::internalError, ""), 2000);
  store.enqueue(1, false, false);
  EXPECT_FALSE(store.queued(1)->error);
  EXPECT_EQ(store.queued(1)->attempts, 0);
  EXPECT_EQ(due(), Items{1});
}

TEST_F(SyncStoreTest, retriesCanBeMadeDueAtOnce) {
  for (const ItemNumber item : Items{1, 2}) {
    store.enqueue(item, false, false);
    store.uploadFailed(*store.queued(item), CKErrorMake(CKErrorCode::internalError, ""), 2000);
  }
  store.retryNow(2);
  EXPECT_EQ(due(), Items{2});
  store.retryAllNow();
  EXPECT_EQ(due(), (Items{1, 2}));
}

TEST_F(SyncStoreTest, aRetryOfAnotherYearIsDue) {
  constexpr std::int64_t kYear = 31'536'000'000;
  store.enqueue(1, false, false);
  store.uploadFailed(*store.queued(1), NSError(), 1000 + kYear);
  EXPECT_EQ(due(1000), Items{1});
}

TEST_F(SyncStoreTest, heldDeletionsAreNotDueUntilTheyAreReleased) {
  store.enqueue(1, true, true);
  store.enqueue(2, true, false);
  store.enqueue(3, false, false);
  EXPECT_EQ(due(), (Items{2, 3}));
  EXPECT_EQ(store.countHeld(), 1U);
  EXPECT_EQ(store.countDeletions(0), 2U);
  store.holdDeletions(0);
  EXPECT_EQ(due(), Items{3});
  EXPECT_EQ(store.held(100).size(), 2U);
  store.releaseHeld();
  EXPECT_EQ(due(), (Items{1, 2, 3}));
}

TEST_F(SyncStoreTest, aDeletionCanBePutOff) {
  store.enqueue(1, true, false, 1500);
  EXPECT_EQ(due(1499), Items());
  EXPECT_EQ(store.nextRetry(), 1500);
  store.retryAllNow();
  EXPECT_EQ(due(1499), Items()) << "it waits to see whether more is deleted, not for the cloud";
  EXPECT_EQ(due(1500), Items{1});
}

TEST_F(SyncStoreTest, orphansAreFetchedWhenTheirParentCame) {
  store.keepOrphan("a", "p");
  store.keepOrphan("b", "p");
  store.keepOrphan("c", "q");
  EXPECT_EQ(store.countOrphans(), 3U);
  EXPECT_EQ(store.fetchOrphansOf("p"), 2U);
  EXPECT_EQ(store.toFetch(100), (std::vector<std::string>{"a", "b"}));
  EXPECT_EQ(store.toFetch(1).size(), 1U);
  store.fetched("a");
  store.fetchAgain("d");
  EXPECT_EQ(store.toFetch(100), (std::vector<std::string>{"b", "d"}));
  EXPECT_EQ(store.countOrphans(), 1U);
}

TEST_F(SyncStoreTest, aRecordThatLostItsParentAgainIsAnOrphanAndNotFetched) {
  store.fetchAgain("a");
  store.keepOrphan("a", "p");
  store.fetched("a");
  EXPECT_EQ(store.countOrphans(), 1U);
  EXPECT_TRUE(store.toFetch(100).empty());
}

TEST_F(SyncStoreTest, pinsStayWhileTheirItemsDo) {
  store.setPinned(5, true);
  store.setPinned(5, true);
  EXPECT_TRUE(store.isPinned(5));
  EXPECT_EQ(store.pins(), Items{5});
  store.setPinned(5, false);
  EXPECT_FALSE(store.isPinned(5));
}

TEST_F(SyncStoreTest, afterUnbindingRowsHaveNoItemsAndNothingIsQueued) {
  store.put(row("r", 7));
  store.put(row("unsent", 8, ""));
  store.enqueue(7, false, false);
  store.unbindAll();
  EXPECT_EQ(store.byRecord("r")->item, 0U);
  EXPECT_FALSE(store.byRecord("unsent")) << "its item is sent again, with a record of its own";
  EXPECT_EQ(store.countQueued(), 0U);
  EXPECT_EQ(store.unboundInCloud(), std::vector<std::string>{"r"});
}

TEST_F(SyncStoreTest, pinsFollowTheirRecordsToOtherItems) {
  store.put(row("r", 7));
  store.setPinned(7, true);
  store.setPinned(9, true);  // nothing in the cloud
  store.unbindAll();
  EXPECT_TRUE(store.pins().empty()) << "the numbers belong to other items now";
  SyncRow found = *store.byRecord("r");
  found.item = 70;
  store.put(found);
  EXPECT_EQ(store.pins(), Items{70});
  store.unbindAll();
  found.item = 71;
  store.put(found);
  EXPECT_EQ(store.pins(), Items{71});
}

TEST_F(SyncStoreTest, savesOfUnknownOutcomeAreRemembered) {
  EXPECT_FALSE(store.wasSent("r", "one"));
  store.noteSent("r", "one");
  store.noteSent("r", "one");
  store.noteSent("r", "two");
  EXPECT_TRUE(store.wasSent("r", "one"));
  EXPECT_TRUE(store.wasSent("r", "two"));
  EXPECT_FALSE(store.wasSent("other", "two"));
  store.forgetSent("r");
  EXPECT_FALSE(store.wasSent("r", "one"));
}

TEST_F(SyncStoreTest, aTransactionThatThrowsLeavesNothing) {
  EXPECT_THROW(store.transaction([&] {
    store.put(row("r", 7));
    store.transaction([&] { store.enqueue(7, false, false); });
    throw SqlError(1, "no");
  }),
               SqlError);
  EXPECT_FALSE(store.byRecord("r"));
  EXPECT_FALSE(store.queued(7));
  store.transaction([&] { store.put(row("r", 7)); });
  EXPECT_TRUE(store.byRecord("r"));
}

TEST_F(SyncStoreTest, everythingIsThereAfterOpeningItAgain) {
  store.put(row("r", 7));
  store.enqueue(7, true, true);
  store.setNumber("rank", 12);
  store.setText("token", std::string("\0\1", 2));
  SyncStore again(path);
  EXPECT_TRUE(again.byRecord("r"));
  EXPECT_EQ(again.countHeld(), 1U);
  EXPECT_EQ(again.number("rank"), 12U);
  EXPECT_EQ(again.text("token"), std::string("\0\1", 2));
}

TEST_F(SyncStoreTest, aDatabaseOfTheFirstVersionIsBroughtUpToDate) {
  const std::string old = folder.path() + "/old.sqlite";
  {
    SyncStore made(old);
    made.put(row("r", 7));
  }
  {
    SqlDatabase database(old, SqlDatabase::Access::readWrite, 100);
    database.execute(
        "DROP TABLE unfinished; DROP TABLE meant; DROP TABLE shares; DROP TABLE thumbnails;"
        "DROP TABLE accesses; DROP TABLE tops;"
        "ALTER TABLE uploads DROP COLUMN refused; ALTER TABLE rows DROP COLUMN tags;"
        "ALTER TABLE rows DROP COLUMN lastUsed; ALTER TABLE rows DROP COLUMN favoriteRank;"
        "PRAGMA user_version = 1");
  }
  for (int time = 0; time < 2; ++time) {
    SyncStore again(old);
    const auto got = again.byRecord("r");
    ASSERT_TRUE(got);
    EXPECT_EQ(got->newer, row("r", 7).newer);
    EXPECT_TRUE(got->metadata.isEmpty());
    again.allowDeletions({7}, 1000, 2000);
    EXPECT_TRUE(again.isDeletionAllowed(7, 1000));
    EXPECT_TRUE(again.unfinished().empty());
    again.wantThumbnail({"r", "digest", "", {}});
    EXPECT_EQ(again.countThumbnails(), 1U);
  }
}

TEST_F(SyncStoreTest, aThumbnailIsDueWhenTheCloudHasTheContentsItIsOf) {
  SyncRow document = row("r", 7);
  document.newerTag.clear();
  document.newer = {};
  const WantedThumbnail wanted{"r", document.content.digest, "/source", {1, 2, 3, 0}};
  store.wantThumbnail(wanted);
  EXPECT_TRUE(store.dueThumbnails(10).empty()) << "there is no such record yet";
  store.put(document);
  ASSERT_EQ(store.dueThumbnails(10).size(), 1U);
  EXPECT_EQ(store.dueThumbnails(10)[0].source, "/source");
  EXPECT_EQ(store.dueThumbnails(10)[0].sourceFile, wanted.sourceFile);
  document.content.digest = "other";
  store.put(document);
  EXPECT_TRUE(store.dueThumbnails(10).empty());
  store.thumbnailSettled("r", "other");
  EXPECT_EQ(store.countThumbnails(), 1U) << "that was another one";
  store.enqueue(7, false, false);
  store.dropStaleThumbnails();
  EXPECT_EQ(store.countThumbnails(), 1U) << "its contents may still be on their way";
  store.dropQueued(7);
  store.dropStaleThumbnails();
  EXPECT_EQ(store.countThumbnails(), 0U);
}

TEST_F(SyncStoreTest, theLastWantOfAThumbnailCountsAndGoesWithItsRecord) {
  SyncRow document = row("r", 7);
  document.newerTag.clear();
  store.put(document);
  const std::uint64_t news = store.thumbnailNews();
  store.wantThumbnail({"r", "older", "", {}});
  store.wantThumbnail({"r", document.content.digest, "", {}});
  EXPECT_GT(store.thumbnailNews(), news);
  EXPECT_EQ(store.countThumbnails(), 1U);
  EXPECT_EQ(store.dueThumbnails(10).size(), 1U);
  store.erase("r");
  EXPECT_EQ(store.countThumbnails(), 0U);
}

TEST_F(SyncStoreTest, aDatabaseOfANewerVersionIsRefused) {
  const std::string newer = folder.path() + "/newer.sqlite";
  SqlDatabase(newer, SqlDatabase::Access::readWrite, 100).execute("PRAGMA user_version = 1000");
  EXPECT_THROW(SyncStore{newer}, SqlError);
}

TEST_F(SyncStoreTest, whatIsBeingMadeIsKnownUntilItIsFinished) {
  store.beginUnfinished({{"r", "container:c", "a\n", NSFileProviderItemKind::folder}, {"s", "r", "b", {}}});
  SyncStore again(path);
  EXPECT_EQ(again.unfinished().size(), 2U);
  ASSERT_TRUE(again.unfinished("r"));
  EXPECT_EQ(again.unfinished("r")->name, "a\n");
  EXPECT_EQ(again.unfinished("r")->kind, NSFileProviderItemKind::folder);
  EXPECT_THROW(store.transaction([&] {
    store.finished("r");
    throw SqlError(1, "killed");
  }),
               SqlError);
  EXPECT_TRUE(store.unfinished("r"));
  store.finished("r");
  EXPECT_FALSE(store.unfinished("r"));
  store.forgetUnfinished();
  EXPECT_TRUE(store.unfinished().empty());
}

TEST_F(SyncStoreTest, deletionsThatWereAskedForAreNotHeld) {
  store.enqueue(1, true, false);
  store.enqueue(2, true, false);
  store.allowDeletions({2, 3}, 1000, 2000);
  EXPECT_EQ(store.countDeletions(1000), 1U);
  store.holdDeletions(1000);
  EXPECT_EQ(store.countHeld(), 1U);
  EXPECT_EQ(due(), Items{2});
  store.forgetAllowedDeletion(2);
  EXPECT_FALSE(store.isDeletionAllowed(2, 1000));
  EXPECT_TRUE(store.isDeletionAllowed(3, 1000));
  store.unbindAll();
  EXPECT_FALSE(store.isDeletionAllowed(3, 1000)) << "numbers mean other items now";
}

TEST_F(SyncStoreTest, theWordForADeletionEndsWithItsTime) {
  store.enqueue(1, true, false);
  store.allowDeletions({1, 2}, 1000, 2000);
  EXPECT_TRUE(store.isDeletionAllowed(1, 1999));
  EXPECT_FALSE(store.isDeletionAllowed(1, 2000));
  EXPECT_FALSE(store.isDeletionAllowed(1, -10'000'000)) << "of another year";
  EXPECT_EQ(store.countDeletions(1999), 0U);
  EXPECT_EQ(store.countDeletions(2000), 1U);
  store.allowDeletions({2}, 1500, 2500);
  EXPECT_TRUE(store.isDeletionAllowed(2, 2400)) << "it was said again";
  SyncStore again(path);
  EXPECT_TRUE(again.isDeletionAllowed(2, 2400));
  EXPECT_FALSE(again.isDeletionAllowed(2, 2500)) << "over a restart, too";
  store.holdDeletions(2000);
  EXPECT_EQ(store.countHeld(), 1U);
}

TEST_F(SyncStoreTest, theWordForADeletionThatWasDoneInTimeStays) {
  store.enqueue(1, true, false);
  store.allowDeletions({1}, 1000, 2000);
  store.keepAllowedDeletion(1);
  store.keepAllowedDeletion(2);
  store.allowDeletions({1, 3}, 5000, 6000);
  EXPECT_TRUE(store.isDeletionAllowed(1, 9000));
  EXPECT_FALSE(store.isDeletionAllowed(2, 1000)) << "nobody asked for that";
  EXPECT_EQ(store.countDeletions(9000), 0U);
  store.holdDeletions(9000);
  EXPECT_EQ(store.countHeld(), 0U);
}

TEST_F(SyncStoreTest, onlyRecordsWithATagAreInTheCloud) {
  store.put(row("sent", 1));
  store.put(row("unsent", 2, ""));
  EXPECT_EQ(store.recordsInCloud(), std::vector<std::string>{"sent"});
  EXPECT_EQ(store.countRows(), 2U);
}

TEST_F(SyncStoreTest, sharesAreFoundByTheirRootsAndSurviveANewItemDatabase) {
  const KnownShare own{{"s1", {"drive"}}, "root", "anna"};
  const KnownShare others{{"s1", {"drive", "ben"}}, "other", "ben"};
  store.putShare(own);
  store.putShare(others);
  store.unbindAll();
  EXPECT_EQ(store.share(own.record), own);
  EXPECT_EQ(store.shareOfRoot("other"), others);
  EXPECT_EQ(store.shares().size(), 2U);
  KnownShare moved = own;
  moved.root = "elsewhere";
  store.putShare(moved);
  EXPECT_FALSE(store.shareOfRoot("root"));
  store.eraseShare(own.record);
  EXPECT_EQ(store.shares(), std::vector<KnownShare>{others});
}

TEST_F(SyncStoreTest, aDatabaseThatHasPassedOverSharesReadsEverythingOnceMore) {
  store.setText("changeToken", "t");
  store.transaction([] {});
  SqlDatabase(path, SqlDatabase::Access::readWrite, 100)
      .execute(
          "DROP TABLE shares; DROP TABLE thumbnails; DROP TABLE accesses; DROP TABLE tops;"
          "ALTER TABLE uploads DROP COLUMN refused; PRAGMA user_version = 4");
  SyncStore upgraded(path);
  EXPECT_EQ(upgraded.text("changeToken"), "");
  EXPECT_TRUE(upgraded.shares().empty());
}

}  // namespace
}  // namespace droxa::keld
