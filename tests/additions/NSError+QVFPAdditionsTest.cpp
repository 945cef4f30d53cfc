#include <gtest/gtest.h>
#include <thread>
#include <vector>

#include "additions/NSError+QVFPAdditions.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "tessaly/QVErrors.h"

namespace droxa {
namespace {

void expectTranslation(const char *domain, std::int64_t code, std::int64_t translated) {
  const NSError error(domain, code);
  const NSError result = qv_fileProviderError(error);
  EXPECT_EQ(result.domain(), NSFileProviderErrorDomain);
  EXPECT_EQ(result.code(), translated);
  EXPECT_TRUE(result.underlyingError().isSameObject(error));
  EXPECT_EQ(result.userInfo().size(), 1u);

  long stored = 4711;
  EXPECT_TRUE(_qv_getFileProviderDomainErrorCode(error, &stored));
  EXPECT_EQ(stored, translated);
}

void expectUntouched(const NSError &error) {
  EXPECT_TRUE(qv_fileProviderError(error).isSameObject(error)) << error.description();
  long stored = 4711;
  EXPECT_FALSE(_qv_getFileProviderDomainErrorCode(error, &stored)) << error.description();
  EXPECT_EQ(stored, 4711) << "nothing may be stored without a translation";
}

TEST(FileProviderError, foundationErrorsAreTranslated) {
  expectTranslation(NSCocoaErrorDomain, 4354, -1003);
  expectTranslation(NSCocoaErrorDomain, 4355, -1004);
}

TEST(FileProviderError, errorsOfTheDaemonAreTranslated) {
  expectTranslation(QVTessalyErrorDomain, 2, -1000);
  expectTranslation(QVTessalyErrorDomain, 14, -1005);
}

TEST(FileProviderError, twoErrorsOfTheDaemonKeepTheirSmallPositiveCodes) {
  expectTranslation(QVTessalyErrorDomain, 60, 16);
  expectTranslation(QVTessalyErrorDomain, 59, 17);
}

TEST(FileProviderError, otherCodesOfBothDomainsPassThrough) {
  for (const std::int64_t code : {2, 14, 59, 60, 516, 0, -4354, 4353, 4356}) {
    expectUntouched(NSError(NSCocoaErrorDomain, code));
  }
  for (const std::int64_t code : {4354, 4355, 0, -2, 1, 13, 15, 58, 61}) {
    expectUntouched(NSError(QVTessalyErrorDomain, code));
  }
  expectUntouched(NSError(QVTessalyErrorDomain, (std::int64_t{1} << 32) + 14));
}

// The framework shows what it knows of them itself.
TEST(FileProviderError, errorsOfContentsPassThrough) {
  for (const std::int64_t code :
       {QVErrorCancelled, QVErrorChecksumMismatch, QVErrorUnsentChanges, QVErrorDocumentInUse, QVErrorPinned})
    expectUntouched(qvc_error(code, "of contents"));
  expectUntouched(NSError(NSCocoaErrorDomain, NSUserCancelledError));
}

TEST(FileProviderError, otherDomainsPassThrough) {
  expectUntouched(NSError(NSPOSIXErrorDomain, 2));
  expectUntouched(NSError(NSPOSIXErrorDomain, 14));
  expectUntouched(NSError(NSFileProviderErrorDomain, 14));
  expectUntouched(NSError("", 14));
  expectUntouched(NSError("QVTessalyErrorDomain ", 14));
}

TEST(FileProviderError, anErrorThatPassesThroughKeepsItsUserInfo) {
  const NSError error(NSPOSIXErrorDomain, 5, NSUserInfo{{NSLocalizedDescriptionKey, "disk"}});
  expectUntouched(error);
  EXPECT_EQ(qv_fileProviderError(error).localizedDescription(), "disk");
}

TEST(FileProviderError, aTranslatedErrorIsNotTranslatedAgain) {
  const NSError once = qv_fileProviderError(NSError(QVTessalyErrorDomain, 14));
  expectUntouched(once);
}

TEST(FileProviderError, noErrorStaysNone) {
  EXPECT_FALSE(qv_fileProviderError(NSError()));
  long stored = 4711;
  EXPECT_FALSE(_qv_getFileProviderDomainErrorCode(NSError(), &stored));
  EXPECT_EQ(stored, 4711);
}

TEST(FileProviderError, threadsMayAskForTheFirstTimeTogether) {
  std::vector<std::thread> threads;
  std::vector<NSError> results(8);
  for (NSError &result : results) {
    threads.emplace_back([&result] { result = qv_fileProviderError(NSError(QVTessalyErrorDomain, 14)); });
  }
  for (std::thread &thread : threads) thread.join();
  for (const NSError &result : results) EXPECT_EQ(result.code(), -1005);
}

}  // namespace
}  // namespace droxa
