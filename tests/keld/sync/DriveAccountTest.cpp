#include "keld/sync/DriveAccount.h"
#include "tests/keld/sync/TwoDevices.h"

namespace droxa::keld {
namespace {

class DriveAccounts : public testing::Test {
 protected:
  KeldOptions as(const std::string &account) {
    KeldOptions options = DeviceOptions(folder.path() + "/cloud", account + "s");
    options.sync.account = account;
    return options;
  }
  const TemporaryFolder folder;
};

TEST_F(DriveAccounts, homesOfTwoAccountsOnOneCloudAreTwoPeoples) {
  Device anna(as("anna")), ben(as("ben"));
  anna.keld.write("annas", "x");
  ben.keld.write("bens", "x");
  ASSERT_FALSE(anna.waitForUploads());
  ASSERT_FALSE(ben.waitForUploads());
  Once<NSError> fetched("fetch");
  ben.keld.daemon().sync().fetchNow(fetched.completion());
  EXPECT_FALSE(fetched.value<0>());
  EXPECT_EQ(ben.names(), std::vector<std::string>{"bens"});
  EXPECT_EQ(anna.keld.daemon().account().account()->name, "anna");
}

TEST_F(DriveAccounts, aHomeKeepsToItsFirstAccount) {
  KeldFixture home(as("anna"));
  const DroxaHome where(home.home().root());
  home.stop();
  EXPECT_EQ(DriveAccount(where, ""), "anna");
  EXPECT_EQ(DriveAccount(where, "anna"), "anna");
  KeldOptions other = as("ben");
  std::string problem;
  EXPECT_FALSE(Keld::start(where, other, &problem));
  EXPECT_NE(problem.find("\"anna\""), std::string::npos) << problem;
  EXPECT_NE(problem.find("name another --home"), std::string::npos) << problem;
}

TEST_F(DriveAccounts, aNewHomeIsWhoeverIsNamedElseWhoRunsIt) {
  const DroxaHome where(folder.path() + "/home");
  EXPECT_EQ(DriveAccount(where, "anna"), "anna");
  EXPECT_EQ(DriveAccount(where, ""), AccountKeeper::localUserName());
  EXPECT_THROW(DriveAccount(where, "a\nb"), std::runtime_error);
}

}  // namespace
}  // namespace droxa::keld
