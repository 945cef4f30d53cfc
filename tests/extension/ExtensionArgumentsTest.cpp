#include <gtest/gtest.h>
#include <sys/socket.h>
#include <unistd.h>

#include "extension/ExtensionArguments.h"

namespace droxa {
namespace {

class ExtensionArgumentsTest : public testing::Test {
 protected:
  ExtensionArgumentsTest() { EXPECT_EQ(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, sockets), 0); }
  ~ExtensionArgumentsTest() override {
    close(sockets[0]);
    close(sockets[1]);
  }
  void expectProblem(const std::vector<std::string> &arguments, const std::string &expected) {
    std::string problem;
    EXPECT_FALSE(ExtensionArguments::parse(arguments, &problem));
    EXPECT_EQ(problem, expected);
  }
  std::string number() const { return std::to_string(sockets[0]); }

  int sockets[2];
};

TEST_F(ExtensionArgumentsTest, areAHomeAndADescriptor) {
  std::string problem;
  for (const std::vector<std::string> &arguments :
       {std::vector<std::string>{"--home", "/a b", "--host-descriptor", number()},
        std::vector<std::string>{"--host-descriptor=" + number(), "--home=/a b"}}) {
    const auto parsed = ExtensionArguments::parse(arguments, &problem);
    ASSERT_TRUE(parsed) << problem;
    EXPECT_EQ(parsed->home, "/a b");
    EXPECT_EQ(parsed->hostDescriptor, sockets[0]);
    EXPECT_FALSE(parsed->wantsHelp);
  }
}

TEST_F(ExtensionArgumentsTest, theHomeMayBeLeftOut) {
  std::string problem;
  const auto parsed = ExtensionArguments::parse({"--host-descriptor", number()}, &problem);
  ASSERT_TRUE(parsed);
  EXPECT_EQ(parsed->home, std::nullopt);
}

TEST_F(ExtensionArgumentsTest, helpNeedsNothingElse) {
  std::string problem;
  const auto parsed = ExtensionArguments::parse({"--help"}, &problem);
  ASSERT_TRUE(parsed);
  EXPECT_TRUE(parsed->wantsHelp);
}

TEST_F(ExtensionArgumentsTest, problemsNameTheArgument) {
  expectProblem({"--home", "/a"},
                "--host-descriptor is missing: this program is started by fileproviderd, not by hand");
  expectProblem({"--host-descriptor"}, "--host-descriptor needs a value");
  expectProblem({"--host-descriptor", number(), "--home"}, "--home needs a value");
  expectProblem({"--home=", "--host-descriptor", number()}, "--home needs a value");
  expectProblem({"--verbose"}, "unknown argument \"--verbose\"");
  expectProblem({"replica"}, "unknown argument \"replica\"");
  for (const char *text : {"x", "-1", "3x", "99999999999999999999"}) {
    expectProblem({"--host-descriptor", text},
                  "--host-descriptor: \"" + std::string(text) + "\" isn't a descriptor's number");
  }
}

TEST_F(ExtensionArgumentsTest, theDescriptorMustBeAnOpenSocket) {
  int pipe[2];
  ASSERT_EQ(::pipe(pipe), 0);
  expectProblem({"--host-descriptor", std::to_string(pipe[0])},
                "--host-descriptor: " + std::to_string(pipe[0]) + " isn't an open socket");
  close(pipe[0]);
  close(pipe[1]);
  expectProblem({"--host-descriptor", "1000000"}, "--host-descriptor: 1000000 isn't an open socket");
}

}  // namespace
}  // namespace droxa
