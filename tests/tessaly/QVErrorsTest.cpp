#include <gtest/gtest.h>

#include "platform/cloudkit/CKError.h"
#include "tessaly/QVErrors.h"

namespace droxa {

TEST(TessalyErrors, loggedOutIsCode2) {
  EXPECT_TRUE(qvc_errorLoggedOut().is(QVTessalyErrorDomain, 2));
  EXPECT_EQ(qvc_errorLoggedOut().localizedDescription(), "nobody is signed in");
}

TEST(TessalyErrors, noSuchItemNamesWhatWasAskedFor) {
  const NSError error = qvc_errorNoSuchItem("d12");
  EXPECT_TRUE(error.is(QVTessalyErrorDomain, 14));
  EXPECT_EQ(error.localizedDescription(), "there is no item d12");
}

TEST(TessalyErrors, anErrorSaysWhatItIsToldToSay) {
  const NSError error = qvc_error(QVErrorDatabase, "the database is damaged");
  EXPECT_TRUE(error.is(QVTessalyErrorDomain, 30));
  EXPECT_EQ(error.localizedDescription(), "the database is damaged");
}

TEST(TessalyErrors, notSupportedIsNumber45OfPOSIXWhateverTheSystemsIs) {
  const NSError error = qv_errorWithPOSIXCode(QVPOSIXErrorNotSupported);
  EXPECT_TRUE(error.is(NSPOSIXErrorDomain, 45));
  EXPECT_EQ(error.localizedDescription(), "operation not supported");
  EXPECT_EQ(qv_errorWithPOSIXCode(2, "nothing"), NSError::errorWithPOSIXCode(2, "nothing"));
}

TEST(TessalyErrors, codesCountInTheirOwnDomainAlone) {
  EXPECT_TRUE(qv_isTessalyErrorCode(qvc_error(QVErrorNoShare, "none"), 20));
  EXPECT_FALSE(qv_isTessalyErrorCode(NSError("Domain", 20), 20));
  EXPECT_FALSE(qv_isTessalyErrorCode(NSError(), 0));
  EXPECT_TRUE(qvc_isCloudKitUnknownItemError(NSError(CKErrorDomain, 11)));
  EXPECT_FALSE(qvc_isCloudKitUnknownItemError(NSError(CKErrorDomain, 10)));
  EXPECT_FALSE(qvc_isCloudKitUnknownItemError(NSError("Domain", 11)));
}

TEST(TessalyErrors, theCloudsErrorsAreFoundBeneathOthers) {
  const NSError unknown(CKErrorDomain, 11);
  const NSError wrapped("Outer", 1,
                        {{NSUnderlyingErrorKey, NSError("Inner", 2, {{NSUnderlyingErrorKey, unknown}})}});
  EXPECT_TRUE(qvc_checkErrorsFromCloudKit(unknown, qvc_isCloudKitUnknownItemError));
  EXPECT_TRUE(qvc_checkErrorsFromCloudKit(wrapped, qvc_isCloudKitUnknownItemError));
  EXPECT_FALSE(qvc_checkErrorsFromCloudKit(NSError("Outer", 11), qvc_isCloudKitUnknownItemError));
  EXPECT_FALSE(qvc_checkErrorsFromCloudKit(NSError(), [](const NSError &) { return true; }));
}

}  // namespace droxa
