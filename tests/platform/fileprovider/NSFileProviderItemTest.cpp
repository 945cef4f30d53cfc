#include <gtest/gtest.h>

#include "platform/fileprovider/NSFileProviderItem.h"

namespace droxa {
namespace {

TEST(NSFileProviderItem, theInitialPagesDifferFromEachOtherAndFromAnyToken) {
  EXPECT_TRUE(NSFileProviderInitialPageSortedByName());
  EXPECT_TRUE(NSFileProviderInitialPageSortedByDate());
  EXPECT_NE(NSFileProviderInitialPageSortedByName(), NSFileProviderInitialPageSortedByDate());
  EXPECT_NE(NSFileProviderInitialPageSortedByName().length(), 16U);
  EXPECT_NE(NSFileProviderInitialPageSortedByDate().length(), 16U);
}

TEST(NSFileProviderItem, aPlainItemIsItsFields) {
  NSFileProviderItemFields fields;
  fields.itemIdentifier = "d5";
  fields.parentItemIdentifier = "i2";
  fields.filename = "a.txt";
  fields.typeIdentifier = "text/plain";
  fields.changeRank = 9;
  const NSFileProviderPlainItem item(fields);
  EXPECT_EQ(item.fields(), fields);
  EXPECT_EQ(item.itemIdentifier(), "d5");
  EXPECT_EQ(item.description(), "<NSFileProviderPlainItem: d5 \"a.txt\" in i2, text/plain, rank 9>");
}

}  // namespace
}  // namespace droxa
