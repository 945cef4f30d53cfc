// Pages, their cursors, and the names that the root shows.

#include "keld/Listing.h"
#include "tests/keld/KeldFixture.h"

namespace droxa::keld {

TEST(Listing, goesOnWhereThePageBeforeEndedWhateverHappenedMeanwhile) {
  KeldFixture drive;
  drive.folder("f");
  for (const char *name : {"b", "d", "f", "h"}) drive.write(std::string("f/") + name);
  drive.settle();
  EXPECT_EQ(NamesOf(drive.pageOf("f", 0, 2).items), (std::vector<std::string>{"b", "d"}));
  drive.write("f/a");
  drive.write("f/c");
  drive.settle();
  EXPECT_EQ(NamesOf(drive.pageOf("f", 2, 2).items), (std::vector<std::string>{"f", "h"}));
}

TEST(Listing, findsAnOffsetThatNoPageEndedAtByCounting) {
  KeldFixture drive;
  drive.folder("f");
  for (int i = 0; i < 30; ++i) drive.write("f/" + std::to_string(100 + i));
  drive.settle();
  for (const std::int64_t sortOrder : {0, 1})
    EXPECT_EQ(drive.pageOf("f", 25, 10, sortOrder).items.size(), 5U) << sortOrder;
  EXPECT_EQ(NamesOf(drive.pageOf("f", 25, 1).items), (std::vector<std::string>{"125"}));
}

TEST(Listing, mergesTheContainersIntoTheRootOnAnyPage) {
  KeldFixture drive;
  for (const char *name : {"A", "Da", "Dz", "Z"}) drive.write(name);
  drive.settle();
  const std::vector<std::string> expected{"A", "Da", "Desktop", "Documents", "Dz", "Z"};
  for (std::uint64_t limit = 1; limit <= 7; ++limit) {
    std::vector<std::string> names;
    std::uint64_t offset = 0;
    do {
      const auto page = drive.page(std::nullopt, offset, limit);
      for (const std::string &name : NamesOf(page.items)) names.push_back(name);
      offset = page.nextOffset;
    } while (offset != 0);
    EXPECT_EQ(names, expected) << limit;
  }
}

TEST(Listing, whileTheFirstScanRunsIsOfTheWholeFolder) {
  KeldFixture drive({}, false);
  for (int folder = 0; folder < 100; ++folder) {
    drive.folder("f" + std::to_string(folder));
    for (int file = 0; file < 20; ++file)
      drive.write("f" + std::to_string(folder) + "/" + std::to_string(file));
  }
  drive.start();
  ASSERT_TRUE(eventually([&] { return drive.knows("f99"); }));
  EXPECT_EQ(drive.namesIn("f99").size(), 20U);
  drive.waitForFirstScan();
  for (int folder = 0; folder < 100; ++folder)
    EXPECT_EQ(drive.namesIn("f" + std::to_string(folder)).size(), 20U) << folder;
}

TEST(ListingCursors, forgetTheLeastRecentlyUsed) {
  ListingCursors cursors(2);
  const ListingRequest request{false, 7, false};
  ListingKey key;
  key.atStart = false;
  for (const std::uint64_t offset : {1U, 2U}) {
    key.name = std::to_string(offset);
    cursors.remember(request, offset, key);
  }
  EXPECT_TRUE(cursors.find(request, 1));
  key.name = "3";
  cursors.remember(request, 3, key);
  EXPECT_EQ(cursors.size(), 2U);
  EXPECT_FALSE(cursors.find(request, 2));
  EXPECT_EQ(cursors.find(request, 1)->name, "1");
  EXPECT_EQ(cursors.find(request, 3)->name, "3");
  EXPECT_FALSE(cursors.find({false, 7, true}, 1));
  EXPECT_TRUE(cursors.find(request, 0)->atStart);
}

}  // namespace droxa::keld
