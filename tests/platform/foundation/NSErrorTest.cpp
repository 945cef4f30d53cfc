#include <cerrno>
#include <gtest/gtest.h>

#include "platform/foundation/NSError.h"

namespace droxa {
namespace {

NSError withInfo(const std::string &key, NSUserInfoValue value) {
  NSUserInfo info;
  info[key] = std::move(value);
  return {"Domain", 7, std::move(info)};
}

TEST(NSError, nilIsNoError) {
  const NSError nil;
  EXPECT_FALSE(nil);
  EXPECT_EQ(nil.domain(), "");
  EXPECT_EQ(nil.code(), 0);
  EXPECT_TRUE(nil.userInfo().empty());
  EXPECT_FALSE(nil.underlyingError());
  EXPECT_EQ(nil.localizedDescription(), "");
  EXPECT_EQ(nil.description(), "(null)");
  EXPECT_FALSE(nil.is("", 0));
}

TEST(NSError, comparesByDomainCodeAndUserInfo) {
  EXPECT_EQ(NSError("Domain", 7), NSError("Domain", 7));
  EXPECT_NE(NSError("Domain", 7), NSError("Domain", 8));
  EXPECT_NE(NSError("Domain", 7), NSError("Other", 7));
  EXPECT_NE(NSError("Domain", 7), NSError());
  EXPECT_NE(NSError("Domain", 7), withInfo("key", "value"));
  EXPECT_EQ(withInfo("key", "value"), withInfo("key", "value"));
  EXPECT_EQ(withInfo(NSUnderlyingErrorKey, NSError("A", 1)), withInfo(NSUnderlyingErrorKey, NSError("A", 1)));
  EXPECT_NE(withInfo(NSUnderlyingErrorKey, NSError("A", 1)), withInfo(NSUnderlyingErrorKey, NSError("A", 2)));
}

TEST(NSError, anEqualErrorIsNotTheSameObject) {
  const NSError error("Domain", 7);
  const NSError copy = error;
  EXPECT_TRUE(copy.isSameObject(error));
  EXPECT_FALSE(NSError("Domain", 7).isSameObject(error));
}

TEST(NSError, findsItsUnderlyingError) {
  EXPECT_EQ(withInfo(NSUnderlyingErrorKey, NSError("A", 1)).underlyingError(), NSError("A", 1));
  EXPECT_FALSE(withInfo(NSUnderlyingErrorKey, "a text").underlyingError());
  EXPECT_FALSE(NSError("Domain", 7).underlyingError());
}

TEST(NSError, isFoundByDomainAndCode) {
  const NSError error = NSError::errorWithPOSIXCode(EINVAL);
  EXPECT_TRUE(error.is(NSPOSIXErrorDomain, 22));
  EXPECT_FALSE(error.is(NSCocoaErrorDomain, 22));
  EXPECT_FALSE(error.is(NSPOSIXErrorDomain, 2));
}

TEST(NSError, aPOSIXErrorSaysWhatTheSystemSays) {
  EXPECT_EQ(NSError::errorWithPOSIXCode(EINVAL).localizedDescription(), "Invalid argument");
  EXPECT_TRUE(NSError::errorWithPOSIXCode(EINVAL).userInfo().empty());
  EXPECT_EQ(NSError::errorWithPOSIXCode(ENOENT, "no \"x\"").localizedDescription(), "no \"x\"");
}

TEST(NSError, isDescribedWithItsUserInfo) {
  EXPECT_EQ(NSError::errorWithPOSIXCode(EINVAL).description(),
            "Error Domain=NSPOSIXErrorDomain Code=22 \"Invalid argument\"");
  EXPECT_EQ(NSError("D", -3).description(),
            "Error Domain=D Code=-3 \"The operation couldn't be completed (D error -3).\"");
  NSUserInfo info;
  info["count"] = std::int64_t{3};
  info["object"] = std::shared_ptr<const NSObject>();
  info["url"] = NSURL::fileURLWithPath("/a b");
  info[NSLocalizedDescriptionKey] = "broken";
  info[NSUnderlyingErrorKey] = NSError::errorWithPOSIXCode(ENOENT);
  EXPECT_EQ(NSError("D", 1, info).description(),
            "Error Domain=D Code=1 \"broken\" UserInfo={NSLocalizedDescription=broken, "
            "NSUnderlyingError=Error Domain=NSPOSIXErrorDomain Code=2 \"No such file or directory\", "
            "count=3, object=(null), url=file:///a%20b}");
}

}  // namespace
}  // namespace droxa
