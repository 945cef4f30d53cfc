#include <cerrno>
#include <gtest/gtest.h>

#include "keld/sync/CloudErrors.h"
#include "platform/cloudkit/CKError.h"
#include "tessaly/QVErrors.h"

namespace droxa::keld {
namespace {

NSError told(CKErrorCode code) {
  return ErrorForClients(CKErrorMake(code, "why"), "/drive/notes.txt");
}

TEST(CloudErrors, nothingStaysNothing) {
  EXPECT_FALSE(ErrorForClients(NSError(), "/drive/notes.txt"));
}

TEST(CloudErrors, aFullQuotaIsToldAsThat) {
  EXPECT_TRUE(told(CKErrorCode::quotaExceeded).is(NSCocoaErrorDomain, 4354));
}

TEST(CloudErrors, aCloudThatCantBeReachedIsToldAsThat) {
  for (const CKErrorCode code :
       {CKErrorCode::networkFailure, CKErrorCode::networkUnavailable, CKErrorCode::serviceUnavailable,
        CKErrorCode::requestRateLimited, CKErrorCode::zoneBusy, CKErrorCode::internalError})
    EXPECT_TRUE(told(code).is(NSCocoaErrorDomain, 4355)) << static_cast<int>(code);
}

TEST(CloudErrors, contentsThatArentThereAreWrongContents) {
  for (const CKErrorCode code : {CKErrorCode::assetNotAvailable, CKErrorCode::unknownItem})
    EXPECT_TRUE(told(code).is(QVTessalyErrorDomain, QVErrorChecksumMismatch));
}

TEST(CloudErrors, cancelledAndSignedOutAreToldAsThat) {
  EXPECT_TRUE(told(CKErrorCode::operationCancelled).is(QVTessalyErrorDomain, QVErrorCancelled));
  EXPECT_TRUE(told(CKErrorCode::notAuthenticated).is(QVTessalyErrorDomain, QVErrorLoggedOut));
}

TEST(CloudErrors, othersKeepTheirDomainAndCode) {
  const NSError error = ErrorForClients(NSError::errorWithPOSIXCode(ENOSPC), "/drive/notes.txt");
  EXPECT_TRUE(error.is(NSPOSIXErrorDomain, ENOSPC));
}

TEST(CloudErrors, eachNamesTheDocumentAndKeepsWhatWasUnderIt) {
  const NSError error = told(CKErrorCode::networkFailure);
  EXPECT_NE(error.localizedDescription().find("/drive/notes.txt"), std::string::npos);
  EXPECT_NE(error.localizedDescription().find("why"), std::string::npos);
  EXPECT_TRUE(CKErrorIs(error.underlyingError(), CKErrorCode::networkFailure));
}

}  // namespace
}  // namespace droxa::keld
