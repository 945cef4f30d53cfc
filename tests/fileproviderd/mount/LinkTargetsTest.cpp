#include <gtest/gtest.h>

#include "fileproviderd/mount/LinkTargets.h"

namespace droxa::testing {
namespace {

const ShownFolders kShown{{"", "/r/default/Documents"}, {"Desktop", "/r/desktop/Documents"}};

TEST(LinkTargets, aLinkIntoAnotherContainerLeadsToWhereThatIsShown) {
  EXPECT_EQ(shownLinkTarget("../../desktop/Documents/a b", "", "/r/default/Documents", kShown),
            "Desktop/a b");
  EXPECT_EQ(shownLinkTarget("../../../../desktop/Documents/a", "x/y", "/r/default/Documents/x/y", kShown),
            "../../Desktop/a");
  EXPECT_EQ(shownLinkTarget("../../default/Documents/z", "Desktop", "/r/desktop/Documents", kShown), "../z");
  EXPECT_EQ(shownLinkTarget("/r/default/Documents/z", "x", "/r/default/Documents/x", kShown), "../z");
}

TEST(LinkTargets, anyOtherIsAsItIs) {
  for (const char *target :
       {"a", "../a", "x/../a", "/etc/passwd", "../../../elsewhere", "../../../desktop2/a"})
    EXPECT_EQ(shownLinkTarget(target, "x", "/r/default/Documents/x", kShown), target);
}

}  // namespace
}  // namespace droxa::testing
