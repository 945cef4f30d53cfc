#include <gtest/gtest.h>

#include "platform/fileprovider/NSFileProviderError.h"

namespace droxa {
namespace {

TEST(NSFileProviderError, aMissingItemIsNamed) {
  const NSError error = fileProviderErrorForNonExistentItemWithIdentifier("d5");
  EXPECT_TRUE(error.is(NSFileProviderErrorDomain, -1005));
  EXPECT_EQ(error.userInfo().at(NSFileProviderErrorNonExistentItemIdentifierKey), NSUserInfoValue("d5"));
}

TEST(NSFileProviderError, aCollisionCarriesTheItem) {
  NSFileProviderItemFields fields;
  fields.itemIdentifier = "d5";
  const auto item = std::make_shared<const NSFileProviderPlainItem>(fields);
  const NSError error = fileProviderErrorForCollisionWithItem(item);
  EXPECT_TRUE(error.is(NSFileProviderErrorDomain, -1001));
  EXPECT_EQ(
      std::get<std::shared_ptr<const NSObject>>(error.userInfo().at(NSFileProviderErrorCollidingItemKey)),
      item);
}

TEST(NSFileProviderError, aCollisionWithNothingCarriesNothing) {
  EXPECT_TRUE(fileProviderErrorForCollisionWithItem(nullptr).userInfo().empty());
}

TEST(NSFileProviderError, findsTheCollidingURL) {
  NSUserInfo info;
  info[FPCollidingURLKey] = NSURL::fileURLWithPath("/a");
  EXPECT_EQ(fp_collidingURL(NSError(NSCocoaErrorDomain, NSFileWriteFileExistsError, info)),
            NSURL::fileURLWithPath("/a"));
  info[FPCollidingURLKey] = "not a URL";
  EXPECT_FALSE(fp_collidingURL(NSError(NSCocoaErrorDomain, NSFileWriteFileExistsError, info)));
  EXPECT_FALSE(fp_collidingURL(NSError(NSCocoaErrorDomain, NSFileWriteFileExistsError)));
  EXPECT_FALSE(fp_collidingURL(NSError()));
}

}  // namespace
}  // namespace droxa
