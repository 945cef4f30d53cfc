#include "additions/NSError+QVFPAdditions.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "tessaly/QVErrors.h"
#include "tests/extension/ExtensionFixture.h"

namespace droxa {
namespace {

const std::string kMethod = "-[QVFileProviderExtension _isLoggedInOrError:]";

class IsLoggedInOrError : public ExtensionTest {
 protected:
  void expectLoggedOut(const NSError &expected) {
    NSError error;
    EXPECT_FALSE(extension->_isLoggedInOrError(&error));
    EXPECT_EQ(error, expected);
    EXPECT_EQ(logged(),
              Lines{"error: [ERROR] " + kMethod + ": (passed to caller) error: " + expected.description()});
    clear();

    EXPECT_FALSE(extension->_isLoggedInOrError(nullptr));
    EXPECT_EQ(logged(),
              Lines{"error: [ERROR] " + kMethod + ": (ignored by caller) error: " + expected.description()});
  }
  static NSError notAuthenticated() {
    return NSError(NSFileProviderErrorDomain, -1000,
                   NSUserInfo{{NSUnderlyingErrorKey, qvc_errorLoggedOut()}});
  }

  const std::shared_ptr<QVFileProviderExtension> extension = makeExtension();
};

TEST_F(IsLoggedInOrError, saysYesAndWritesNoErrorWhenSomebodyIsSignedIn) {
  const NSError before(NSPOSIXErrorDomain, 1);
  NSError error = before;
  EXPECT_TRUE(extension->_isLoggedInOrError(&error));
  EXPECT_TRUE(error.isSameObject(before));
  EXPECT_TRUE(extension->_isLoggedInOrError(nullptr));
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(IsLoggedInOrError, asksNoDaemon) {
  fake.connection->setUnreachable(NSError(NSCocoaErrorDomain, NSXPCConnectionInvalid));
  EXPECT_TRUE(extension->_isLoggedInOrError(nullptr));
  EXPECT_EQ(asked(), Lines{});
}

TEST_F(IsLoggedInOrError, nobodySignedInIsNotAuthenticated) {
  signOut();
  expectLoggedOut(notAuthenticated());
}

TEST_F(IsLoggedInOrError, anAccountWithoutAnIdentifierCountsAsSignedOut) {
  signIn(QVAccount("vera", std::nullopt));
  expectLoggedOut(notAuthenticated());
}

TEST_F(IsLoggedInOrError, aStoreThatCantBeReadGivesItsOwnError) {
  spoilAccountStore();
  expectLoggedOut(qv_fileProviderError(accountStoreError()));
}

}  // namespace
}  // namespace droxa
