#pragma once

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "additions/QVLogSection.h"
#include "extension/QVFileProviderExtension.h"
#include "platform/featureflags/feature_flags.h"
#include "platform/foundation/NSNotificationCenter.h"
#include "platform/foundation/Paths.h"
#include "platform/usermanagement/UMUserManager.h"
#include "tessaly/QVAccount.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVNotifications.h"
#include "tessaly/QVPersona.h"
#include "tests/support/FakeDaemonConnection.h"
#include "tests/support/LogLines.h"
#include "tests/support/RecordingHostLink.h"

namespace droxa {

using Lines = std::vector<std::string>;

// A folder of the test's own, removed at the end.
class TemporaryFolder {
 public:
  TemporaryFolder() {
    std::string name = (std::filesystem::temp_directory_path() / "droxa-extension-XXXXXX").string();
    path_ = std::filesystem::canonical(mkdtemp(name.data())).string();
  }
  ~TemporaryFolder() {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
  }
  TemporaryFolder(const TemporaryFolder &) = delete;
  TemporaryFolder &operator=(const TemporaryFolder &) = delete;
  const std::string &path() const { return path_; }

 private:
  std::string path_;
};

// Makes the folder the process's home before the other members of a fixture ask for it.
class TemporaryHome {
 public:
  TemporaryHome() : before_(DroxaProcessHome()) {
    DroxaSetProcessHome(DroxaHome(folder_.path()));
    std::string problem;
    EXPECT_TRUE(DroxaProcessHome().create(&problem)) << problem;
    OSFeatureFlagsSetFolders(flags(), folder_.path() + "/no-system-flags");
  }
  ~TemporaryHome() { DroxaSetProcessHome(before_); }
  TemporaryHome(const TemporaryHome &) = delete;
  TemporaryHome &operator=(const TemporaryHome &) = delete;

  const std::string &path() const { return folder_.path(); }
  std::string configuration() const { return DroxaHome(path()).configuration(); }
  std::string flags() const { return configuration() + "/feature-flags"; }

 private:
  const TemporaryFolder folder_;
  const DroxaHome before_;
};

// The unique string of the calling thread's persona; "personal" for the default one.
inline std::string currentPersona() {
  return UMUserManager::sharedManager().currentPersona()->userPersonaUniqueString().value_or("personal");
}

// An extension on a home of its own, with a fake daemon, a recording line to the host and a signed-in
// account. Without personas, unless the test turns them on before it makes the extension.
class ExtensionTest : public testing::Test {
 protected:
  ExtensionTest() {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    UMSetConfiguration({});
    signIn(QVAccount("vera", "account-1"));
  }
  ~ExtensionTest() override {
    qvc_block_remember_persona = nullptr;
    qvc_activity_block_remember_persona = nullptr;
    UMSetConfiguration({});
    QVAccount::forgetCachedAccount();
  }

  void signIn(const QVAccount &account) {
    EXPECT_FALSE(QVAccountStoreWrite(home.configuration(), account));
    QVAccount::forgetCachedAccount();
  }
  void signOut() {
    EXPECT_FALSE(QVAccountStoreRemove(home.configuration()));
    QVAccount::forgetCachedAccount();
  }
  // Makes the account store unreadable.
  void spoilAccountStore() {
    std::ofstream(home.configuration() + "/account.json") << "not an account";
    QVAccount::forgetCachedAccount();
  }
  static NSError accountStoreError() {
    NSError error;
    QVAccount::currentCachedLoggedInAccountWithError(&error);
    EXPECT_TRUE(error);
    return error;
  }

  static void postAccountChange() {
    NSNotificationCenter::defaultCenter().postNotificationName(QVAccountTokenDidChangeNotification);
  }

  // An extension whose making is no part of what the test looks at.
  std::shared_ptr<QVFileProviderExtension> makeExtension() {
    auto extension = QVFileProviderExtension::init();
    clear();
    return extension;
  }
  void clear() {
    capture.clear();
    daemon.log().clear();
    lastTag_ = QVLogSectionCreate(false);
  }

  // What was logged since, with the tags as the test's: the first section's is <1>, the next one's <2>.
  Lines logged() const {
    Lines lines = logLines(capture);
    for (std::string &line : lines) renameTag(line);
    return lines;
  }
  Lines asked() const { return daemon.calls(); }

  const TemporaryHome home;
  FakeDaemonScope fake;
  FakeDaemon &daemon = *fake.daemon;
  const std::shared_ptr<RecordingHostLink> host = RecordingHostLink::install();
  OSLogCapture capture;

 private:
  // "┏1b " becomes "┏<n> ", where n counts the debug sections since clear().
  void renameTag(std::string &line) const {
    for (const std::string mark : {"┏", "┣", "┳", "┗"}) {
      const auto at = line.find(mark);
      if (at == std::string::npos) continue;
      const auto begin = at + mark.size();
      const auto end = line.find(' ', begin);
      const std::uint64_t tag = std::stoull(line.substr(begin, end - begin), nullptr, 16);
      EXPECT_EQ(tag % 2, 1u) << "lookup sections are debug sections: " << line;
      line.replace(begin, end - begin, "<" + std::to_string((tag - lastTag_) / 2) + ">");
      return;
    }
  }

  std::uint64_t lastTag_ = 0;
};

// An extension under managed personas: "work" and "school".
class ManagedExtensionTest : public ExtensionTest {
 protected:
  // The hooks stand, and this thread runs under `persona` (nullopt: the default one).
  void startUnder(const std::optional<std::string> &persona) {
    UMConfiguration configuration = managed();
    configuration.processPersona = persona;
    UMSetConfiguration(configuration);
    QVContainerCache::setManagedProviderForTesting(true);
    QVFileProviderExtension::initialize();
  }
  // A thread's persona changes, what else is configured stays.
  static void runThreadUnder(const std::optional<std::string> &persona,
                             const std::function<void(UMConfiguration &)> &change = {}) {
    UMConfiguration configuration = managed();
    configuration.processPersona = persona;
    if (change) change(configuration);
    UMSetConfiguration(configuration);
  }
  static UMConfiguration managed() {
    UMConfiguration configuration;
    configuration.personas = {{"work", true}, {"school", true}};
    return configuration;
  }
};

}  // namespace droxa
