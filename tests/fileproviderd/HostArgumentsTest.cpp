#include <gtest/gtest.h>

#include "fileproviderd/HostArguments.h"

namespace droxa::testing {
namespace {

TEST(HostArguments, bothFormsOfAValueAreTaken) {
  std::string problem;
  const auto arguments = HostArguments::parse({"--home", "/h", "--extension=/x"}, &problem);
  ASSERT_TRUE(arguments) << problem;
  EXPECT_EQ(arguments->home, "/h");
  EXPECT_EQ(arguments->extension, "/x");
  EXPECT_FALSE(arguments->wantsHelp);
}

TEST(HostArguments, whatMakesNoSenseIsNamed) {
  std::string problem;
  EXPECT_FALSE(HostArguments::parse({"--hom", "/h"}, &problem));
  EXPECT_EQ(problem, "unknown argument --hom; --help lists what there is");
  EXPECT_FALSE(HostArguments::parse({"--home"}, &problem));
  EXPECT_EQ(problem, "--home needs a path");
  EXPECT_FALSE(HostArguments::parse({"--home="}, &problem));
}

TEST(HostArguments, helpIsAsked) {
  std::string problem;
  EXPECT_TRUE(HostArguments::parse({"-h"}, &problem)->wantsHelp);
}

}  // namespace
}  // namespace droxa::testing
