#include <cerrno>
#include <filesystem>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include "tessaly/QVAccount.h"
#include "tessaly/QVErrors.h"
#include "tests/support/ScratchHome.h"

namespace droxa {

namespace {

class AccountStore : public testing::Test {
 protected:
  std::shared_ptr<const QVAccount> read(NSError *error = nullptr) const {
    return QVAccountStoreRead(home_.configuration(), error);
  }
  // What reading the store with this text in it says.
  std::string problemWith(const std::string &text) const {
    home_.write("config/account.json", text);
    NSError error;
    EXPECT_FALSE(read(&error));
    EXPECT_EQ(error.domain(), QVTessalyErrorDomain);
    return error.localizedDescription();
  }
  const ScratchHome home_;
  const std::string path_ = home_.configuration() + "/account.json";
};

}  // namespace

TEST_F(AccountStore, anAccountIsReadBackAsItWasWritten) {
  for (const std::string &name : {std::string("anna"), std::string("J\xc3\xb6rg \"the second\" \\")}) {
    ASSERT_EQ(QVAccountStoreWrite(home_.configuration(), QVAccount(name, "account-1")), NSError());
    NSError error;
    const auto account = read(&error);
    ASSERT_TRUE(account);
    EXPECT_FALSE(error);
    EXPECT_EQ(account->name(), name);
    EXPECT_EQ(account->perAppAccountIdentifier(), "account-1");
  }
}

TEST_F(AccountStore, anAccountMayHaveNoPerAppIdentifier) {
  ASSERT_EQ(QVAccountStoreWrite(home_.configuration(), QVAccount("anna", std::nullopt)), NSError());
  EXPECT_EQ(read()->perAppAccountIdentifier(), std::nullopt);
  home_.write("config/account.json", R"({"name": "anna", "perAppAccountIdentifier": null})");
  EXPECT_EQ(read()->perAppAccountIdentifier(), std::nullopt);
}

TEST_F(AccountStore, noFileIsNobodyWithoutError) {
  NSError error;
  EXPECT_FALSE(read(&error));
  EXPECT_FALSE(error);
}

TEST_F(AccountStore, onlyItsOwnerMayReadIt) {
  ASSERT_EQ(QVAccountStoreWrite(home_.configuration(), QVAccount("anna", "1")), NSError());
  struct stat status {};
  ASSERT_EQ(stat(path_.c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777, 0600U);
}

TEST_F(AccountStore, writingLeavesNothingElseBehind) {
  ASSERT_EQ(QVAccountStoreWrite(home_.configuration(), QVAccount("anna", "1")), NSError());
  ASSERT_EQ(QVAccountStoreWrite(home_.configuration(), QVAccount("bert", "1")), NSError());
  std::size_t files = 0;
  for ([[maybe_unused]] const auto &file : std::filesystem::directory_iterator(home_.configuration()))
    ++files;
  EXPECT_EQ(files, 1U);
}

TEST_F(AccountStore, aFailedWriteKeepsTheOldAccount) {
  ASSERT_EQ(QVAccountStoreWrite(home_.configuration(), QVAccount("anna", "1")), NSError());
  const NSError error = QVAccountStoreWrite(home_.configuration(), QVAccount("not UTF-8: \xff", "1"));
  EXPECT_EQ(error.localizedDescription(), path_ + ": a value isn't valid UTF-8");
  EXPECT_EQ(read()->name(), "anna");
}

TEST_F(AccountStore, aFolderThatIsMissingIsAnErrorThatNamesTheFile) {
  const std::string missing = home_.root() + "/missing";
  const NSError error = QVAccountStoreWrite(missing, QVAccount("anna", "1"));
  EXPECT_TRUE(error.is(QVTessalyErrorDomain, QVErrorUnreadable));
  EXPECT_TRUE(error.underlyingError().is(NSPOSIXErrorDomain, ENOENT));
  EXPECT_NE(error.localizedDescription().find(missing + "/account.json can't be written"), std::string::npos);
}

TEST_F(AccountStore, aFileThatCannotBeReadIsAnErrorThatNamesIt) {
  std::filesystem::create_directory(path_);
  NSError error;
  EXPECT_FALSE(read(&error));
  EXPECT_TRUE(error.is(QVTessalyErrorDomain, QVErrorUnreadable));
  EXPECT_TRUE(error.underlyingError().is(NSPOSIXErrorDomain, EISDIR));
  EXPECT_NE(error.localizedDescription().find(path_ + " can't be read"), std::string::npos);
  EXPECT_FALSE(read(nullptr));
}

TEST_F(AccountStore, badContentsAreAnErrorThatSaysWhatIsWrong) {
  EXPECT_EQ(problemWith(""), path_ + ": isn't a JSON object");
  EXPECT_EQ(problemWith("[]"), path_ + ": isn't a JSON object");
  EXPECT_EQ(problemWith(R"({"name": "anna")"), path_ + ": isn't a JSON object");
  EXPECT_EQ(problemWith("{}"), path_ + ": name must be a text that isn't empty");
  EXPECT_EQ(problemWith(R"({"name": ""})"), path_ + ": name must be a text that isn't empty");
  EXPECT_EQ(problemWith(R"({"name": 7})"), path_ + ": name must be a text that isn't empty");
  EXPECT_EQ(problemWith(R"({"name": "anna", "perAppAccountIdentifier": 7})"),
            path_ + ": perAppAccountIdentifier must be a text or null");
}

TEST_F(AccountStore, removingSignsOut) {
  ASSERT_EQ(QVAccountStoreWrite(home_.configuration(), QVAccount("anna", "1")), NSError());
  EXPECT_EQ(QVAccountStoreRemove(home_.configuration()), NSError());
  EXPECT_FALSE(read());
  EXPECT_EQ(QVAccountStoreRemove(home_.configuration()), NSError());
}

TEST_F(AccountStore, aFileThatCannotBeRemovedIsAnErrorThatNamesIt) {
  std::filesystem::create_directory(path_);
  const NSError error = QVAccountStoreRemove(home_.configuration());
  EXPECT_NE(error.localizedDescription().find(path_ + " can't be removed"), std::string::npos);
}

}  // namespace droxa
