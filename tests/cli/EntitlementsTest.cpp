#include <cstdlib>
#include <filesystem>
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include "cli/Commands.h"
#include "tests/cli/ScriptedHost.h"
#include "tests/sharing/Entitled.h"

namespace droxa::testing {
namespace {

class EntitlementsCommand : public ::testing::Test, protected CommandFixture {
 protected:
  int show(std::optional<std::int32_t> process, bool json = false) {
    return run([&](CommandContext &made) { return runEntitlements(made, process, json); });
  }
  bool printed(const std::string &text) const { return out.str().find(text) != std::string::npos; }

  const EntitledScope entitled;
  const std::string program = EntitledScope::ownProgram();
};

TEST_F(EntitlementsCommand, aProcessIsShownWithTheFileThatEntitlesIt) {
  entitled.grant(program, {"com.example.one", "com.example.two"});
  EXPECT_EQ(show(getpid()), 0);
  EXPECT_EQ(out.str(), "process " + std::to_string(getpid()) + " is " + program + "\nexecutable " + program +
                           ", by " + entitled.folder() +
                           "/grants.json:\n  com.example.one\n  com.example.two\n");
}

TEST_F(EntitlementsCommand, aProcessWithoutAnySaysSoAndWhichFilesWereIgnored) {
  entitled.write("bad.json", "{");
  EXPECT_EQ(show(getpid()), 0);
  EXPECT_TRUE(printed("no file grants it anything\n"));
  EXPECT_TRUE(printed("ignored: " + entitled.folder() + "/bad.json: it isn't JSON\n"));
}

TEST_F(EntitlementsCommand, jsonHasTheSame) {
  entitled.grant(program, {"one"});
  entitled.write("bad.json", "{");
  EXPECT_EQ(show(getpid(), true), 0);
  const auto object = nlohmann::json::parse(out.str());
  EXPECT_EQ(object["process"], getpid());
  EXPECT_EQ(object["flatpak"], nullptr);
  EXPECT_EQ(object["executable"], program);
  EXPECT_EQ(object["grants"][0]["executable"], program);
  EXPECT_EQ(object["grants"][0]["entitlements"][0], "one");
  EXPECT_EQ(object["problems"][0]["ignored"], "it isn't JSON");
}

TEST_F(EntitlementsCommand, withoutAProcessAllGrantsAreShown) {
  entitled.write("a.json", R"({"applications": [{"flatpak": "org.example.Writer", "entitlements": []}]})");
  EXPECT_EQ(show(std::nullopt), 0);
  EXPECT_TRUE(printed("flatpak org.example.Writer, by " + entitled.folder() + "/a.json:\n  nothing\n"));
  EXPECT_EQ(show(std::nullopt, true), 0);
  const auto object = nlohmann::json::parse(out.str());
  EXPECT_EQ(object["folder"], entitled.folder());
  EXPECT_EQ(object["grants"][0]["flatpak"], "org.example.Writer");
}

TEST_F(EntitlementsCommand, aProcessThatHasEndedIsAnError) {
  const pid_t child = fork();
  if (child == 0) _exit(0);
  waitpid(child, nullptr, 0);
  EXPECT_EQ(show(child), 66);
  EXPECT_EQ(err.str(), "droxa: process " + std::to_string(child) + ": there is no such process\n");
}

}  // namespace
}  // namespace droxa::testing
