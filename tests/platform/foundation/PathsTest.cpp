#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/foundation/NSFileHandle.h"
#include "platform/foundation/Paths.h"
#include "tests/platform/EnvironmentVariable.h"
#include "tests/platform/TemporaryFolder.h"

namespace droxa {
namespace {

mode_t modeOf(const std::string &path) {
  struct stat status {};
  EXPECT_EQ(stat(path.c_str(), &status), 0) << path;
  return status.st_mode & 07777;
}

TEST(DroxaHome, isTheFolderThatWasNamed) {
  const EnvironmentVariable environment("DROXA_HOME", "/from/environment");
  EXPECT_EQ(DroxaHome::resolve("/named/folder/").root(), "/named/folder");
  EXPECT_EQ(DroxaHome::resolve("/named/../other").root(), "/other");
}

TEST(DroxaHome, ofARelativeFolderIsAbsolute) {
  EXPECT_EQ(DroxaHome::resolve("named").root(), std::filesystem::current_path().string() + "/named");
}

TEST(DroxaHome, isTakenFromTheEnvironment) {
  const EnvironmentVariable droxa("DROXA_HOME", "/from/environment");
  const EnvironmentVariable data("XDG_DATA_HOME", "/data");
  EXPECT_EQ(DroxaHome::resolve(std::nullopt).root(), "/from/environment");
  const EnvironmentVariable none("DROXA_HOME", "");
  EXPECT_EQ(DroxaHome::resolve("").root(), "/data/droxa");
  const EnvironmentVariable relative("XDG_DATA_HOME", "data");
  NSSetHomeDirectory("/home/ada");
  EXPECT_EQ(DroxaHome::resolve(std::nullopt).root(), "/home/ada/.local/share/droxa");
  NSSetHomeDirectory(std::nullopt);
}

TEST(DroxaHome, keepsEverythingBelowItsRoot) {
  const DroxaHome home("/h");
  EXPECT_EQ(home.replica(), "/h/replica");
  EXPECT_EQ(home.state(), "/h/state");
  EXPECT_EQ(home.configuration(), "/h/config");
  EXPECT_EQ(home.run(), "/h/run");
  EXPECT_EQ(home.logs(), "/h/logs");
  EXPECT_EQ(home.daemonSocket(), "/h/run/keld.sock");
  EXPECT_EQ(home.hostSocket(), "/h/run/fileproviderd.sock");
}

TEST(DroxaHome, makesItsFoldersForItsOwnerOnly) {
  const TemporaryFolder folder;
  const DroxaHome home(folder.path() + "/deep/home");
  std::string problem;
  ASSERT_TRUE(home.create(&problem)) << problem;
  for (const std::string &made :
       {home.root(), home.replica(), home.state(), home.configuration(), home.run(), home.logs()}) {
    EXPECT_EQ(modeOf(made), 0700U) << made;
  }
}

TEST(DroxaHome, tightensFoldersThatStandOpen) {
  const TemporaryFolder folder;
  const DroxaHome home(folder.path());
  ASSERT_EQ(mkdir(home.run().c_str(), 0777), 0);
  ASSERT_EQ(chmod(home.run().c_str(), 0777), 0);
  EXPECT_TRUE(home.create(nullptr));
  EXPECT_EQ(modeOf(home.run()), 0700U);
  EXPECT_TRUE(home.create(nullptr));
}

TEST(DroxaHome, namesTheFolderThatCannotBeMade) {
  const TemporaryFolder folder;
  folder.write("file", "");
  std::string problem;
  EXPECT_FALSE(DroxaHome(folder.path() + "/file/home").create(&problem));
  EXPECT_EQ(problem, folder.path() + "/file: Not a directory");
  folder.write("home/state", "");
  EXPECT_FALSE(DroxaHome(folder.path() + "/home").create(&problem));
  EXPECT_EQ(problem, folder.path() + "/home/state: Not a directory");
  EXPECT_FALSE(DroxaHome(folder.path() + "/home").create(nullptr));
}

TEST(DroxaHome, ofTheProcessIsTheOneThatWasSet) {
  const DroxaHome before = DroxaProcessHome();
  DroxaSetProcessHome(DroxaHome("/first"));
  const DroxaHome &first = DroxaProcessHome();
  DroxaSetProcessHome(DroxaHome("/second"));
  EXPECT_EQ(DroxaProcessHome().root(), "/second");
  EXPECT_EQ(first.root(), "/first");
  DroxaSetProcessHome(before);
}

}  // namespace
}  // namespace droxa
