#include <gtest/gtest.h>

#include "fileproviderd/mount/HiddenNames.h"

namespace droxa::testing {
namespace {

TEST(HiddenNames, theSyncsOwnAreHidden) {
  for (const char *name : {".droxa-private", ".droxa-replacement-1", ".a.txt.droxafault"})
    EXPECT_TRUE(isHiddenName(name)) << name;
}

TEST(HiddenNames, whatPeopleCallTheirsIsNot) {
  for (const char *name : {"", ".", ".git", "droxa-private", ".droxa-privat", "a.droxafault", ".Trash-0"})
    EXPECT_FALSE(isHiddenName(name)) << name;
}

}  // namespace
}  // namespace droxa::testing
