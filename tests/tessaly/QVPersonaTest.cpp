#include <cerrno>
#include <gtest/gtest.h>

#include "tessaly/QVPersona.h"

namespace droxa {

namespace {

class Persona : public testing::Test {
 protected:
  void TearDown() override { UMSetConfiguration({}); }
  // Makes a persona of that name the process's.
  static void beManaged(bool isDataSeparated) {
    UMConfiguration configuration;
    configuration.personas = {{"work", isDataSeparated}};
    configuration.processPersona = "work";
    UMSetConfiguration(configuration);
  }
  static std::optional<std::string> current() { return qv_currentPersonaIDWithIsDataSeparated(nullptr); }
};

}  // namespace

TEST_F(Persona, noHookIsSetUnlessTheExtensionSetsIt) {
  EXPECT_EQ(qvc_block_remember_persona, nullptr);
  EXPECT_EQ(qvc_activity_block_remember_persona, nullptr);
}

TEST_F(Persona, thePersonalPersonaIsTheDefaultOne) {
  bool isDataSeparated = true;
  EXPECT_EQ(qv_currentPersonaIDWithIsDataSeparated(&isDataSeparated), "__defaultPersonaID__");
  EXPECT_FALSE(isDataSeparated);
  EXPECT_EQ(qv_currentPersonaID(UMUserManager::sharedManager()), "__defaultPersonaID__");
}

TEST_F(Persona, aDataSeparatedPersonaIsItsUniqueString) {
  beManaged(true);
  bool isDataSeparated = false;
  EXPECT_EQ(qv_currentPersonaIDWithIsDataSeparated(&isDataSeparated), "work");
  EXPECT_TRUE(isDataSeparated);
  EXPECT_EQ(qv_currentPersonaID(UMUserManager::sharedManager()), "work");
  EXPECT_EQ(current(), "work");
}

TEST_F(Persona, aPersonaThatIsNotDataSeparatedIsTheDefaultOne) {
  beManaged(false);
  bool isDataSeparated = true;
  EXPECT_EQ(qv_currentPersonaIDWithIsDataSeparated(&isDataSeparated), "__defaultPersonaID__");
  EXPECT_FALSE(isDataSeparated);
}

TEST_F(Persona, aSavedPersonaIsRestoredAndForgotten) {
  beManaged(true);
  const auto persona = UMUserManager::sharedManager().currentPersona();
  NSError error;
  auto saved = persona->copyCurrentPersonaContextWithError(&error);
  ASSERT_EQ(persona->generateAndRestorePersonaContextWithPersonaUniqueString(std::nullopt), NSError());
  EXPECT_EQ(current(), QVDefaultPersonaID);
  _QVRestorePersona(&saved);
  EXPECT_EQ(current(), "work");
  EXPECT_FALSE(saved);
}

TEST_F(Persona, nothingSavedRestoresNothing) {
  beManaged(true);
  std::shared_ptr<UMPersonaContext> saved;
  _QVRestorePersona(&saved);
  _QVRestorePersona(nullptr);
  EXPECT_EQ(current(), "work");
}

}  // namespace droxa
