#include "fileproviderd/mount/MountRoots.h"
#include "tests/fileproviderd/mount/DriveFixture.h"

namespace droxa::testing {
namespace {

using MountRootsTest = DriveFixture;

TEST_F(MountRootsTest, containersHaveTheNamesThatTheExtensionGivesThem) {
  EXPECT_TRUE(areRootsWhole);
  EXPECT_EQ(roots->root(), documents);
  EXPECT_EQ(roots->folderNamed("Desktop"), replica + "/desktop/Documents");
  EXPECT_EQ(roots->folderNamed("desktop"), std::nullopt);
  EXPECT_EQ(roots->folders().size(), 2U) << "and the trash";
}

TEST_F(MountRootsTest, theTrashIsThereForFileManagers) {
  const auto trash = roots->folderNamed(".Trash-1");
  ASSERT_TRUE(trash.has_value());
  EXPECT_TRUE(std::filesystem::is_directory(*trash + "/files"));
  EXPECT_TRUE(std::filesystem::is_directory(*trash + "/info"));
}

TEST_F(MountRootsTest, whatWasLearntStaysWhileTheExtensionIsAway) {
  extension->failure = NSError(NSPOSIXErrorDomain, EIO);
  std::filesystem::create_directories(replica + "/new/Documents");
  addContainer("i7", "new", "New");
  bool isWhole = true;
  roots->refresh([&](bool whole) { isWhole = whole; });
  EXPECT_FALSE(isWhole);
  EXPECT_TRUE(roots->folderNamed("Desktop").has_value());
  extension->failure = NSError();
  roots->refresh([&](bool whole) { isWhole = whole; });
  EXPECT_TRUE(isWhole);
  EXPECT_TRUE(roots->folderNamed("New").has_value());
}

TEST_F(MountRootsTest, aContainerThatWentIsShownNoMore) {
  std::filesystem::remove_all(replica + "/desktop");
  roots->refresh([](bool) {});
  EXPECT_FALSE(roots->folderNamed("Desktop").has_value());
}

}  // namespace
}  // namespace droxa::testing
