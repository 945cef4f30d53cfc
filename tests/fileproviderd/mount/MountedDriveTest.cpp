#include <cerrno>
#include <fcntl.h>

#include "fileproviderd/mount/MountedDrive.h"
#include "tests/fileproviderd/mount/DriveFixture.h"

namespace droxa::testing {
namespace {

using MountedDriveTest = DriveFixture;

TEST_F(MountedDriveTest, filesAreFoundBelowTheRootAndBelowContainers) {
  std::filesystem::create_directories(documents + "/a/b");
  std::ofstream(replica + "/desktop/Documents/x") << "x";
  const NodeId below = lookUp(lookUp(kRootNode, "a"), "b");
  const NodeId onDesktop = lookUp(lookUp(kRootNode, "Desktop"), "x");
  EXPECT_EQ(drive->replicaPath(below), documents + "/a/b");
  EXPECT_EQ(drive->replicaPath(onDesktop), replica + "/desktop/Documents/x");
  struct stat status {};
  EXPECT_EQ(drive->statusOf(onDesktop, &status), 0);
  EXPECT_EQ(status.st_size, 1);
}

TEST_F(MountedDriveTest, aLinkIsNeverFollowed) {
  std::filesystem::create_symlink("/etc", documents + "/link");
  const NodeId link = lookUp(kRootNode, "link");
  ASSERT_NE(link, 0U);
  int error = 0;
  EXPECT_EQ(drive->folder(link, &error), nullptr);
  EXPECT_FALSE(drive->open(link, O_RDONLY, &error));
  EXPECT_EQ(error, ELOOP);
}

TEST_F(MountedDriveTest, aFolderThatALinkTookThePlaceOfIsStale) {
  std::filesystem::create_directories(documents + "/a/b");
  const NodeId below = lookUp(lookUp(kRootNode, "a"), "b");
  drive->folders.drop(lookUp(kRootNode, "a"));
  std::filesystem::remove_all(documents + "/a");
  std::filesystem::create_directory_symlink("/", documents + "/a");
  int error = 0;
  EXPECT_EQ(drive->folder(below, &error), nullptr);
  EXPECT_EQ(error, ESTALE);
}

TEST_F(MountedDriveTest, hiddenNamesAreNotFound) {
  std::filesystem::create_directory(documents + "/.droxa-replacement-1");
  EXPECT_EQ(lookUp(kRootNode, ".droxa-replacement-1"), 0U);
  EXPECT_TRUE(drive->isOwnName(kRootNode, "Desktop"));
  EXPECT_FALSE(drive->isOwnName(lookUp(kRootNode, "Desktop"), "Desktop"));
}

TEST_F(MountedDriveTest, anotherFileAtTheNameIsNotTheNodes) {
  write("a", "one");
  const NodeId node = lookUp(kRootNode, "a");
  write("other", "another");
  std::filesystem::rename(documents + "/other", documents + "/a");
  int error = 0;
  EXPECT_FALSE(drive->open(node, O_RDONLY, &error));
  EXPECT_EQ(error, ESTALE);
  struct stat status {};
  EXPECT_EQ(drive->statusOf(node, &status), ESTALE);
}

}  // namespace
}  // namespace droxa::testing
