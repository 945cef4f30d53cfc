#include <cerrno>
#include <functional>
#include <gtest/gtest.h>
#include <thread>

#include "platform/usermanagement/UMUserManager.h"

namespace droxa {
namespace {

std::shared_ptr<UMPersona> current() {
  return UMUserManager::sharedManager().currentPersona();
}

std::optional<std::string> currentName() {
  return current()->userPersonaUniqueString();
}

NSError switchTo(const std::optional<std::string> &name) {
  return current()->generateAndRestorePersonaContextWithPersonaUniqueString(name);
}

std::shared_ptr<UMPersonaContext> save() {
  return current()->copyCurrentPersonaContextWithError(nullptr);
}

void onAnotherThread(const std::function<void()> &block) {
  std::thread(block).join();
}

class UMUserManagerTest : public testing::Test {
 protected:
  UMUserManagerTest() {
    UMConfiguration configuration;
    configuration.personas = {{"work", true}, {"school", true}, {"guest", false}};
    UMSetConfiguration(configuration);
  }
  ~UMUserManagerTest() override { UMSetConfiguration({}); }

  static void configure(const std::function<void(UMConfiguration &)> &change) {
    UMConfiguration configuration = UMGetConfiguration();
    change(configuration);
    UMSetConfiguration(configuration);
  }
};

TEST(UMUserManager, withoutConfigurationThereIsOnePersonalPersonaWithoutAName) {
  UMSetConfiguration({});
  EXPECT_EQ(currentName(), std::nullopt);
  EXPECT_FALSE(current()->isDataSeparatedPersona());
  EXPECT_FALSE(switchTo(std::nullopt));
  EXPECT_TRUE(switchTo("work").is(NSPOSIXErrorDomain, ENOENT));
  EXPECT_TRUE(voucher_process_can_use_arbitrary_personas());
}

TEST_F(UMUserManagerTest, switchesTheCallingThread) {
  EXPECT_FALSE(switchTo("work"));
  EXPECT_EQ(currentName(), "work");
  EXPECT_TRUE(current()->isDataSeparatedPersona());
  EXPECT_FALSE(switchTo("guest"));
  EXPECT_EQ(currentName(), "guest");
  EXPECT_FALSE(current()->isDataSeparatedPersona());
  EXPECT_FALSE(switchTo(std::nullopt));
  EXPECT_EQ(currentName(), std::nullopt);
}

TEST_F(UMUserManagerTest, aPersonaIsWhatItWasWhenItWasAsked) {
  const auto before = current();
  EXPECT_FALSE(switchTo("work"));
  EXPECT_EQ(before->userPersonaUniqueString(), std::nullopt);
  EXPECT_FALSE(before->isDataSeparatedPersona());
}

TEST_F(UMUserManagerTest, eachThreadHasAPersonaOfItsOwn) {
  EXPECT_FALSE(switchTo("work"));
  onAnotherThread([] {
    EXPECT_EQ(currentName(), std::nullopt);
    EXPECT_FALSE(switchTo("school"));
    EXPECT_EQ(currentName(), "school");
  });
  EXPECT_EQ(currentName(), "work");
}

TEST_F(UMUserManagerTest, threadsStartWithTheProcesssPersona) {
  configure([](UMConfiguration &configuration) { configuration.processPersona = "work"; });
  EXPECT_EQ(currentName(), "work");
  EXPECT_FALSE(switchTo(std::nullopt));
  onAnotherThread([] {
    EXPECT_EQ(currentName(), "work");
    EXPECT_TRUE(current()->isDataSeparatedPersona());
  });
  EXPECT_EQ(currentName(), std::nullopt);
}

TEST_F(UMUserManagerTest, thePersonalPersonaMayHaveAName) {
  configure([](UMConfiguration &configuration) { configuration.personalUniqueString = "me"; });
  EXPECT_EQ(currentName(), "me");
  EXPECT_FALSE(current()->isDataSeparatedPersona());
  EXPECT_FALSE(switchTo("work"));
  EXPECT_FALSE(switchTo("me"));
  EXPECT_EQ(currentName(), "me");
  EXPECT_FALSE(current()->isDataSeparatedPersona());
}

TEST_F(UMUserManagerTest, refusesAnUnknownPersonaByName) {
  EXPECT_FALSE(switchTo("work"));
  const NSError error = switchTo("nobody");
  EXPECT_TRUE(error.is(NSPOSIXErrorDomain, ENOENT));
  EXPECT_EQ(error.localizedDescription(), "There is no persona \"nobody\"");
  EXPECT_EQ(currentName(), "work");
}

TEST_F(UMUserManagerTest, restoresWhatWasSaved) {
  EXPECT_FALSE(switchTo("work"));
  const auto outer = save();
  EXPECT_FALSE(switchTo("school"));
  const auto inner = save();
  EXPECT_FALSE(switchTo(std::nullopt));
  EXPECT_FALSE(UMRestorePersonaContext(inner));
  EXPECT_EQ(currentName(), "school");
  EXPECT_FALSE(UMRestorePersonaContext(outer));
  EXPECT_EQ(currentName(), "work");
}

TEST_F(UMUserManagerTest, restoringNothingDoesNothing) {
  EXPECT_FALSE(switchTo("work"));
  EXPECT_FALSE(UMRestorePersonaContext(nullptr));
  EXPECT_EQ(currentName(), "work");
}

TEST_F(UMUserManagerTest, onlyTheThreadThatSavedRestores) {
  EXPECT_FALSE(switchTo("work"));
  const auto saved = save();
  onAnotherThread([&] {
    EXPECT_TRUE(UMRestorePersonaContext(saved).is(NSPOSIXErrorDomain, EINVAL));
    EXPECT_EQ(currentName(), std::nullopt);
  });
}

TEST_F(UMUserManagerTest, aNewConfigurationPutsEveryThreadBack) {
  EXPECT_FALSE(switchTo("work"));
  const auto saved = save();
  onAnotherThread([] {
    configure([](UMConfiguration &configuration) { configuration.processPersona = "school"; });
    EXPECT_EQ(currentName(), "school");
  });
  EXPECT_EQ(currentName(), "school");
  EXPECT_TRUE(UMRestorePersonaContext(saved).is(NSPOSIXErrorDomain, ESTALE));
  EXPECT_EQ(currentName(), "school");
}

TEST_F(UMUserManagerTest, survivesSwitchingWhileOthersConfigure) {
  std::vector<std::thread> threads;
  for (int t = 0; t < 3; ++t) {
    threads.emplace_back([] {
      for (int i = 0; i < 500; ++i) {
        const auto saved = save();
        EXPECT_FALSE(switchTo("work"));
        const auto name = currentName();
        EXPECT_TRUE(!name || name == "work");
        const NSError error = UMRestorePersonaContext(saved);
        EXPECT_TRUE(!error || error.is(NSPOSIXErrorDomain, ESTALE));
      }
    });
  }
  for (int i = 0; i < 200; ++i) UMSetConfiguration(UMGetConfiguration());
  for (std::thread &thread : threads) thread.join();
}

TEST_F(UMUserManagerTest, failsToSaveWhenToldSo) {
  configure([](UMConfiguration &c) { c.failSaving = NSError::errorWithPOSIXCode(ENOMEM); });
  NSError error;
  EXPECT_FALSE(current()->copyCurrentPersonaContextWithError(&error));
  EXPECT_TRUE(error.is(NSPOSIXErrorDomain, ENOMEM));
  EXPECT_FALSE(current()->copyCurrentPersonaContextWithError(nullptr));
}

TEST_F(UMUserManagerTest, savingLeavesTheErrorAloneWhenItSucceeds) {
  NSError error("Before", 1);
  EXPECT_TRUE(current()->copyCurrentPersonaContextWithError(&error));
  EXPECT_EQ(error, NSError("Before", 1));
}

TEST_F(UMUserManagerTest, failsToSwitchWhenToldSo) {
  configure([](UMConfiguration &c) { c.failSwitching = NSError::errorWithPOSIXCode(EIO); });
  EXPECT_TRUE(switchTo("work").is(NSPOSIXErrorDomain, EIO));
  EXPECT_EQ(currentName(), std::nullopt);
}

TEST_F(UMUserManagerTest, aProcessThatMayNotSwitchKeepsItsPersona) {
  configure([](UMConfiguration &c) { c.mayUseArbitraryPersonas = false; });
  EXPECT_FALSE(voucher_process_can_use_arbitrary_personas());
  EXPECT_TRUE(switchTo("work").is(NSPOSIXErrorDomain, EPERM));
  EXPECT_FALSE(switchTo(std::nullopt));
  EXPECT_EQ(currentName(), std::nullopt);
}

}  // namespace
}  // namespace droxa
