#include <gtest/gtest.h>

#include "tessaly/QVPhysicalURL.h"
#include "tests/support/ScratchHome.h"

namespace droxa {

namespace {

class PhysicalURL : public testing::Test {
 protected:
  NSURL at(const std::string &name) const { return NSURL::fileURLWithPath(home.root() + "/" + name); }
  static std::string promiseOf(const std::string &name) { return "droxa promise 1\n420\n5\nmarker\n" + name; }
  ScratchHome home;
};

}  // namespace

TEST_F(PhysicalURL, isTheURLItselfWhereItsFileIs) {
  home.write("a", "x");
  home.write(".a.droxafault", promiseOf("a"));
  EXPECT_EQ(QVPhysicalURL(at("a")), at("a"));
}

TEST_F(PhysicalURL, isThePromiseWhereThatStandsForTheDocument) {
  home.write(".a.droxafault", promiseOf("a"));
  EXPECT_EQ(QVPhysicalURL(at("a")), at(".a.droxafault"));
}

TEST_F(PhysicalURL, isTheURLItselfWhereNothingIs) {
  EXPECT_EQ(QVPhysicalURL(at("a")), at("a"));
  EXPECT_EQ(QVPhysicalURL(at("missing/a")), at("missing/a"));
  EXPECT_FALSE(QVPhysicalURL(NSURL()));
  const NSURL other = NSURL::URLWithString("https://example.org/a");
  EXPECT_EQ(QVPhysicalURL(other), other);
}

TEST_F(PhysicalURL, isNoLinkOrFolderThatIsCalledLikeAPromise) {
  home.makeSymbolicLink(".a.droxafault", "/etc/hostname");
  home.makeFolder(".b.droxafault");
  EXPECT_EQ(QVPhysicalURL(at("a")), at("a"));
  EXPECT_EQ(QVPhysicalURL(at("b")), at("b"));
}

TEST_F(PhysicalURL, ofALongNameIsThePromiseThatTellsIt) {
  const std::string name(250, 'x'), other = std::string(249, 'x') + "y";
  const std::string shortened = "." + std::string(226, 'x') + "~0123456789abcde";
  home.write(shortened + "0.droxafault", promiseOf(other));
  home.write(shortened + "1.droxafault", promiseOf(name));
  home.write(shortened + "2.droxafault", "no promise");
  EXPECT_EQ(QVPhysicalURL(at(name)), at(shortened + "1.droxafault"));
  EXPECT_EQ(QVPhysicalURL(at(other)), at(shortened + "0.droxafault"));
  const std::string missing(251, 'x');
  EXPECT_EQ(QVPhysicalURL(at(missing)), at(missing));
}

TEST(PromiseName, isToldWhereItFollowsFromTheNameAlone) {
  EXPECT_EQ(QVPromiseNameForName("a"), ".a.droxafault");
  EXPECT_TRUE(QVPromiseNameForName(std::string(243, 'x')));
  EXPECT_FALSE(QVPromiseNameForName(std::string(244, 'x')));
  EXPECT_FALSE(QVPromiseNameForName("x~0123456789abcdef"));
}

}  // namespace droxa
