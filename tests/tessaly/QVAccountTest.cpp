#include <gtest/gtest.h>

#include "platform/foundation/NSNotificationCenter.h"
#include "tessaly/QVAccount.h"
#include "tessaly/QVNotifications.h"
#include "tests/support/FakeDaemonConnection.h"
#include "tests/support/ScratchHome.h"

namespace droxa {

namespace {

class Account : public testing::Test {
 protected:
  void signIn(const std::string &name) const {
    ASSERT_EQ(QVAccountStoreWrite(home_.configuration(), QVAccount(name, "account-" + name)), NSError());
  }
  static std::string currentName() {
    NSError error;
    const auto account = QVAccount::currentCachedLoggedInAccountWithError(&error);
    EXPECT_FALSE(error);
    return account ? account->name() : "nobody";
  }
  const ScratchHome home_;
};

}  // namespace

TEST_F(Account, nobodyIsSignedInWithoutAStore) {
  EXPECT_EQ(currentName(), "nobody");
}

TEST_F(Account, theAccountIsTheStores) {
  signIn("anna");
  const auto account = QVAccount::currentCachedLoggedInAccountWithError(nullptr);
  ASSERT_TRUE(account);
  EXPECT_EQ(account->name(), "anna");
  EXPECT_EQ(account->perAppAccountIdentifier(), "account-anna");
}

TEST_F(Account, theStoreIsReadAgainAfterAnAccountTokenChange) {
  signIn("anna");
  EXPECT_EQ(currentName(), "anna");
  signIn("bert");
  EXPECT_EQ(currentName(), "anna");
  NSNotificationCenter::defaultCenter().postNotificationName(QVAccountTokenDidChangeNotification);
  EXPECT_EQ(currentName(), "bert");
  ASSERT_EQ(QVAccountStoreRemove(home_.configuration()), NSError());
  NSNotificationCenter::defaultCenter().postNotificationName(QVAccountTokenDidChangeNotification);
  EXPECT_EQ(currentName(), "nobody");
}

TEST_F(Account, aStoreThatCannotBeReadIsAnErrorEachTime) {
  const std::string path = home_.write("config/account.json", "{");
  for (int i = 0; i < 2; ++i) {
    NSError error;
    EXPECT_FALSE(QVAccount::currentCachedLoggedInAccountWithError(&error));
    EXPECT_EQ(error.localizedDescription(), path + ": isn't a JSON object");
  }
  EXPECT_FALSE(QVAccount::currentCachedLoggedInAccountWithError(nullptr));
  signIn("anna");
  EXPECT_EQ(currentName(), "anna");
}

TEST_F(Account, anotherHomeHasAnotherAccount) {
  signIn("anna");
  EXPECT_EQ(currentName(), "anna");
  const ScratchHome other;
  EXPECT_EQ(currentName(), "nobody");
}

TEST_F(Account, theObserverSubscribesOnce) {
  const FakeDaemonScope scope;
  QVAccount::startAccountTokenChangeObserverIfNeeded();
  QVAccount::startAccountTokenChangeObserverIfNeeded();
  EXPECT_EQ(scope.daemon->calls(), std::vector<std::string>({"subscribeToNotifications()"}));
}

TEST_F(Account, anObserverOfTheChangeSeesTheNewAccount) {
  const FakeDaemonScope scope;
  signIn("anna");
  std::string seen;
  NSNotificationCenter::defaultCenter().addObserver(
      &seen, [&seen] { seen = currentName(); }, QVAccountTokenDidChangeNotification);
  EXPECT_EQ(currentName(), "anna");
  QVAccount::startAccountTokenChangeObserverIfNeeded();
  signIn("bert");
  scope.daemon->notify(QVAccountTokenDidChangeNotification);
  NSNotificationCenter::defaultCenter().removeObserver(&seen);
  EXPECT_EQ(seen, "bert");
}

}  // namespace droxa
