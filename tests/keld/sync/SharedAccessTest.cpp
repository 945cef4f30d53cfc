#include <gtest/gtest.h>

#include "keld/SharedContainer.h"
#include "keld/sync/SharedAccess.h"
#include "tests/platform/TemporaryFolder.h"

namespace droxa::keld {
namespace {

class SharedAccessTest : public testing::Test {
 protected:
  SharedAccessTest() {
    put("outer", scope.top());
    put("inner", "outer");
    put("deep", "inner");
  }
  void put(const std::string &record, const std::string &parent) {
    SyncRow row;
    row.record = record;
    row.parent = parent;
    row.name = record;
    row.kind = NSFileProviderItemKind::folder;
    row.tag = "tag";
    store.put(row);
  }

  const TemporaryFolder folder;
  SyncStore store{folder.path() + "/sync.sqlite"};
  const SyncScope scope{{"drive", "anna"}, SharedContainerOf("anna")};
  const SharedAccess access{store, scope};
};

TEST_F(SharedAccessTest, theMostPermissiveShareOnTheWayUpCounts) {
  store.putAccess({"share of outer", "outer", false});
  EXPECT_FALSE(access.isWritable("deep"));
  store.putAccess({"share of inner", "inner", true});
  EXPECT_TRUE(access.isWritable("deep"));
  EXPECT_TRUE(access.isWritable("new", "inner"));
  EXPECT_FALSE(access.isWritable("outer"));
  EXPECT_FALSE(access.isWritable("new", "outer"));
  store.dropAccess("share of inner");
  EXPECT_FALSE(access.isWritable("deep"));
}

TEST_F(SharedAccessTest, whereNoShareIsKnownTheCloudDecides) {
  EXPECT_TRUE(access.isWritable("deep"));
  store.putAccess({"share of outer", "outer", false});
  store.forgetAccesses();
  EXPECT_TRUE(access.isWritable("deep"));
}

TEST_F(SharedAccessTest, aCycleOfParentsEnds) {
  put("one", "two");
  put("two", "one");
  EXPECT_TRUE(access.isWritable("one"));
  EXPECT_FALSE(access.topOf(*store.byRecord("one")));
  EXPECT_EQ(access.topOf(*store.byRecord("deep"))->record, "outer");
}

TEST_F(SharedAccessTest, recordsHangAtTheTopUntilTheirParentsCome) {
  store.keepOrphan("child", "unseen");
  store.keepOrphan("other", "outer");
  store.hangOrphans();
  EXPECT_TRUE(store.isTop("child"));
  EXPECT_FALSE(store.isTop("other"));
  EXPECT_EQ(store.toFetch(10), std::vector<std::string>{"child"});
  store.fetched("child");
  store.fetchTopsOf("unseen");
  EXPECT_FALSE(store.isTop("child"));
  EXPECT_EQ(store.toFetch(10), std::vector<std::string>{"child"});
}

TEST_F(SharedAccessTest, whatIsRefusedWaitsUntilItOrAShareChanges) {
  const NSError error("domain", 1, {});
  store.enqueue(7, false, false);
  store.uploadRefused(*store.queued(7), error);
  EXPECT_TRUE(store.queued(7)->isRefused);
  EXPECT_TRUE(store.due(1'000'000, 10).empty());
  EXPECT_FALSE(store.nextRetry());
  store.retryAllNow();
  EXPECT_TRUE(store.due(1'000'000, 10).empty());
  store.retryRefused();
  EXPECT_EQ(store.due(1'000'000, 10).size(), 1U);
  store.uploadRefused(*store.queued(7), error);
  store.enqueue(7, false, false);
  EXPECT_EQ(store.due(1'000'000, 10).size(), 1U);
  EXPECT_FALSE(store.queued(7)->error);
}

}  // namespace
}  // namespace droxa::keld
