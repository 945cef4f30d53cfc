// What the daemon finds when it comes back.

#include <fcntl.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include "keld/HomeLock.h"
#include "tests/keld/KeldFixture.h"

namespace droxa::keld {

TEST(Restart, keepsIdentifiersAndFindsWhatChangedMeanwhile) {
  KeldFixture drive;
  drive.folder("f");
  drive.write("f/kept");
  drive.write("f/changed", "1");
  drive.write("f/moved");
  drive.write("f/removed");
  drive.settle();
  const ItemNumber kept = drive.number("f/kept"), changed = drive.number("f/changed"),
                   moved = drive.number("f/moved"), folder = drive.number("f");
  const std::uint64_t rank = drive.daemon().keeper().counters().rank;
  drive.stop();

  drive.write("f/changed", "longer than before");
  drive.folder("g");
  drive.rename("f/moved", "g/moved");
  drive.remove("f/removed");
  drive.write("g/new");
  drive.rename("f", "renamed");

  drive.start();
  drive.settle();
  EXPECT_EQ(drive.number("renamed"), folder);
  EXPECT_EQ(drive.number("renamed/kept"), kept);
  EXPECT_EQ(drive.number("renamed/changed"), changed);
  EXPECT_EQ(drive.record("renamed/changed")->facts.size, 18U);
  EXPECT_EQ(drive.number("g/moved"), moved);
  EXPECT_FALSE(drive.knows("renamed/removed"));
  EXPECT_TRUE(drive.knows("g/new"));
  EXPECT_GT(drive.daemon().keeper().counters().rank, rank);
}

TEST(Restart, listsAFolderAsItIsNowAtOnce) {
  KeldFixture drive;
  drive.folder("f");
  for (int i = 0; i < 50; ++i) drive.write("f/" + std::to_string(i));
  drive.settle();
  drive.stop();
  drive.remove("f/7");
  drive.write("f/new");
  drive.start();
  const std::vector<std::string> names = drive.namesIn("f");
  EXPECT_EQ(names.size(), 50U);
  EXPECT_EQ(std::count(names.begin(), names.end(), "new"), 1);
  EXPECT_EQ(std::count(names.begin(), names.end(), "7"), 0);
}

TEST(Restart, changesNothingWhenNothingChanged) {
  KeldFixture drive;
  drive.folder("f");
  drive.write("f/a");
  drive.settle();
  drive.stop();
  drive.start();
  drive.waitForFirstScan();
  const std::uint64_t rank = drive.daemon().keeper().counters().rank;
  drive.stop();
  drive.start();
  drive.waitForFirstScan();
  EXPECT_EQ(drive.daemon().keeper().counters().rank, rank);
}

TEST(Restart, afterAKillFindsAnIntactDatabase) {
  KeldFixture drive({}, false);
  for (int folder = 0; folder < 20; ++folder) {
    drive.folder("f" + std::to_string(folder));
    for (int file = 0; file < 50; ++file)
      drive.write("f" + std::to_string(folder) + "/" + std::to_string(file));
  }
  for (int round = 0; round < 5; ++round) {
    const pid_t child = ::fork();
    ASSERT_GE(child, 0);
    if (child == 0) {
      std::string problem;
      auto daemon = Keld::start(DroxaHome(drive.home().root()), {}, &problem);
      for (;;) ::pause();
    }
    // Killed at whatever it is doing, which is another thing each time.
    ::usleep(static_cast<useconds_t>(3000 + 9000 * round));
    ::kill(child, SIGKILL);
    int status = 0;
    ASSERT_EQ(::waitpid(child, &status, 0), child);
  }
  drive.start();
  drive.settle();
  std::size_t files = 0;
  for (int folder = 0; folder < 20; ++folder) files += drive.namesIn("f" + std::to_string(folder)).size();
  EXPECT_EQ(files, 1000U);
  drive.stop();
  SqlDatabase database(drive.databasePath(), SqlDatabase::Access::readOnly, 1000);
  EXPECT_EQ(database.text("PRAGMA integrity_check"), "ok");
  EXPECT_EQ(database.integer(
                "SELECT count(*) FROM items WHERE parent <> 0 AND parent NOT IN (SELECT id FROM items)"),
            0);
}

TEST(Restart, ofASecondDaemonForTheHomeIsRefused) {
  KeldFixture drive;
  std::string problem;
  EXPECT_FALSE(Keld::start(DroxaHome(drive.home().root()), {}, &problem));
  EXPECT_NE(problem.find("runs for this home already (process " + std::to_string(::getpid())),
            std::string::npos)
      << problem;
}

TEST(Restart, afterDamageBuildsTheDatabaseAnew) {
  KeldFixture drive;
  drive.write("a");
  drive.settle();
  drive.stop();
  std::ofstream(drive.databasePath(), std::ios::binary | std::ios::trunc)
      << "this is no database at all, by far";
  drive.start();
  drive.settle();
  EXPECT_TRUE(drive.knows("a"));
  bool kept = false;
  for (const auto &entry : std::filesystem::directory_iterator(DroxaHome(drive.home().root()).state()))
    kept = kept || entry.path().string().find("keld.sqlite.damaged-") != std::string::npos;
  EXPECT_TRUE(kept);
}

TEST(Restart, keepsWhoSignedOutSignedOut) {
  KeldFixture drive;
  EXPECT_TRUE(drive.daemon().account().isSignedIn());
  Once<NSError> out("sign out");
  drive.session()->signOut(out.completion());
  ASSERT_EQ(out.value<0>(), NSError());
  drive.stop();
  drive.start();
  EXPECT_FALSE(drive.daemon().account().isSignedIn());
}

TEST(Restart, givesAnAccountItsIdentifierAgain) {
  KeldFixture drive;
  const auto signIn = [&](const std::string &name) {
    Once<std::optional<QVAccountDescription>, NSError> answer("sign in");
    drive.session()->signIn(name, answer.completion());
    return answer.value<0>()->perAppAccountIdentifier.value();
  };
  const std::string anna = signIn("anna"), bert = signIn("bert");
  EXPECT_NE(anna, bert);
  drive.stop();
  drive.start();
  EXPECT_EQ(signIn("anna"), anna);
}

TEST(Restart, clearsAwayWhatActionsOfDeadProgramsHaveLeft) {
  KeldFixture keld;
  keld.stop();
  const std::string actions = keld.replica() + "/.droxa-private/actions";
  keld.folder(actions + "/.droxa-replacement-5F0C3A1E-7B7D-4C43-9D6A-2F8E1B0C4D5E/below");
  keld.write(actions + "/.droxa-replacement-5F0C3A1E-7B7D-4C43-9D6A-2F8E1B0C4D5E/below/a");
  keld.start();
  EXPECT_TRUE(std::filesystem::is_empty(actions));
}

}  // namespace droxa::keld
