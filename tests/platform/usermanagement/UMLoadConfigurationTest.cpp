#include <cerrno>
#include <gtest/gtest.h>

#include "platform/usermanagement/UMUserManager.h"
#include "tests/platform/TemporaryFolder.h"

namespace droxa {
namespace {

class UMLoadConfiguration : public testing::Test {
 protected:
  ~UMLoadConfiguration() override { UMSetConfiguration({}); }

  NSError load(const std::string &contents) {
    folder_.write("personas.json", contents);
    return ::droxa::UMLoadConfiguration(folder_.path());
  }
  // The text of the error without the file's name, which it must start with.
  std::string problem(const std::string &contents) {
    const NSError error = load(contents);
    EXPECT_TRUE(error.is(NSPOSIXErrorDomain, EINVAL)) << error.description();
    const std::string file = folder_.path() + "/personas.json: ";
    EXPECT_TRUE(error.localizedDescription().starts_with(file)) << error.localizedDescription();
    return error.localizedDescription().substr(file.size());
  }

  const TemporaryFolder folder_;
};

TEST_F(UMLoadConfiguration, readsEveryField) {
  ASSERT_FALSE(load(R"({
    "personas": [{"uniqueString": "work"}, {"uniqueString": "guest", "isDataSeparated": false}],
    "processPersona": "work", "personalUniqueString": "me", "mayUseArbitraryPersonas": false})"));
  const UMConfiguration read = UMGetConfiguration();
  ASSERT_EQ(read.personas.size(), 2U);
  EXPECT_EQ(read.personas[0].uniqueString, "work");
  EXPECT_TRUE(read.personas[0].isDataSeparated);
  EXPECT_EQ(read.personas[1].uniqueString, "guest");
  EXPECT_FALSE(read.personas[1].isDataSeparated);
  EXPECT_EQ(read.processPersona, "work");
  EXPECT_EQ(read.personalUniqueString, "me");
  EXPECT_FALSE(read.mayUseArbitraryPersonas);
  EXPECT_EQ(UMUserManager::sharedManager().currentPersona()->userPersonaUniqueString(), "work");
}

TEST_F(UMLoadConfiguration, anEmptyObjectOrNullsAreTheDefaults) {
  EXPECT_FALSE(load("{}"));
  EXPECT_FALSE(load(R"({"processPersona": null, "personalUniqueString": null})"));
  EXPECT_EQ(UMGetConfiguration().processPersona, std::nullopt);
  EXPECT_TRUE(UMGetConfiguration().mayUseArbitraryPersonas);
}

TEST_F(UMLoadConfiguration, aMissingFileChangesNothing) {
  UMConfiguration before;
  before.personalUniqueString = "me";
  UMSetConfiguration(before);
  EXPECT_FALSE(::droxa::UMLoadConfiguration(folder_.path() + "/none"));
  EXPECT_EQ(UMGetConfiguration().personalUniqueString, "me");
}

TEST_F(UMLoadConfiguration, saysWhatIsWrong) {
  EXPECT_EQ(problem("[]"), "the file must hold an object");
  EXPECT_EQ(problem(R"({"persona": []})"), "unknown field \"persona\"");
  EXPECT_EQ(problem(R"({"personas": {}})"), "personas must be a list");
  EXPECT_EQ(problem(R"({"personas": ["work"]})"), "personas[0] must be an object");
  EXPECT_EQ(problem(R"({"personas": [{}]})"), "personas[0].uniqueString is missing");
  EXPECT_EQ(problem(R"({"personas": [{"uniqueString": 5}]})"),
            "personas[0].uniqueString must be a text that isn't empty");
  EXPECT_EQ(problem(R"({"personas": [{"uniqueString": "a"}, {"uniqueString": "b", "separated": 1}]})"),
            "personas[1] has an unknown field \"separated\"");
  EXPECT_EQ(problem(R"({"personas": [{"uniqueString": "a", "isDataSeparated": 1}]})"),
            "personas[0].isDataSeparated must be true or false");
  EXPECT_EQ(problem(R"({"personas": [{"uniqueString": "a"}, {"uniqueString": "a"}]})"),
            "persona \"a\" is listed twice");
  EXPECT_EQ(problem(R"({"processPersona": "a"})"), "processPersona \"a\" is not among the personas");
  EXPECT_EQ(problem(R"({"personalUniqueString": ""})"),
            "personalUniqueString must be a text that isn't empty");
  EXPECT_EQ(problem(R"({"mayUseArbitraryPersonas": "yes"})"),
            "mayUseArbitraryPersonas must be true or false");
}

TEST_F(UMLoadConfiguration, saysWhereTheTextBreaksOff) {
  EXPECT_NE(problem("{\"personas\": [").find("line 1, column 15"), std::string::npos);
  EXPECT_FALSE(problem("").empty());
  EXPECT_FALSE(problem("{\"personalUniqueString\": \"\xff\"}").empty());
}

TEST_F(UMLoadConfiguration, aBrokenFileChangesNothing) {
  ASSERT_FALSE(load(R"({"personalUniqueString": "me"})"));
  EXPECT_TRUE(load("{"));
  EXPECT_EQ(UMGetConfiguration().personalUniqueString, "me");
}

TEST_F(UMLoadConfiguration, namesAFileThatCannotBeRead) {
  std::filesystem::create_directory(folder_.path() + "/personas.json");
  const NSError error = ::droxa::UMLoadConfiguration(folder_.path());
  EXPECT_EQ(error.localizedDescription(), folder_.path() + "/personas.json: Is a directory");
}

}  // namespace
}  // namespace droxa
