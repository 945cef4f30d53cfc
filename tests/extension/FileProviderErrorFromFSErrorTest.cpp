#include "platform/fileprovider/NSFileProviderError.h"
#include "tessaly/QVErrors.h"
#include "tests/extension/ExtensionFixture.h"

namespace droxa {
namespace {

class ErrorFromFSError : public ExtensionTest {
 protected:
  static NSError collisionAt(const NSURL &url) {
    return NSError(NSCocoaErrorDomain, NSFileWriteFileExistsError, NSUserInfo{{FPCollidingURLKey, url}});
  }
  void expectUnchanged(const NSError &error) {
    EXPECT_TRUE(extension->fileProviderErrorFromFSError(error).isSameObject(error)) << error.description();
  }

  const std::shared_ptr<QVFileProviderExtension> extension = makeExtension();
};

TEST_F(ErrorFromFSError, noErrorStaysNone) {
  EXPECT_FALSE(extension->fileProviderErrorFromFSError(NSError()));
}

TEST_F(ErrorFromFSError, aCollisionNamesTheItemInTheWay) {
  daemon.addDocument("a.txt", 5);
  const NSError error = extension->fileProviderErrorFromFSError(collisionAt(daemon.url("a.txt")));
  EXPECT_TRUE(error.is(NSFileProviderErrorDomain, -1001));
  EXPECT_EQ(error.description(), fileProviderErrorForCollisionWithItem(daemon.item("a.txt")).description());
}

TEST_F(ErrorFromFSError, aCollisionWithoutAURLIsUnchanged) {
  expectUnchanged(NSError(NSCocoaErrorDomain, 516));
  EXPECT_EQ(asked(), Lines{});
}

TEST_F(ErrorFromFSError, aCollisionWithWhatIsNoItemIsUnchanged) {
  expectUnchanged(collisionAt(daemon.url("").URLByAppendingPathComponent("missing")));
  expectUnchanged(collisionAt(NSURL::fileURLWithPath("/etc/passwd")));
}

TEST_F(ErrorFromFSError, everyOtherErrorIsUnchanged) {
  daemon.addDocument("a.txt");
  expectUnchanged(NSError(NSCocoaErrorDomain, 515, NSUserInfo{{FPCollidingURLKey, daemon.url("a.txt")}}));
  expectUnchanged(NSError(NSPOSIXErrorDomain, 516, NSUserInfo{{FPCollidingURLKey, daemon.url("a.txt")}}));
  expectUnchanged(NSError(NSFileProviderErrorDomain, 516));
  EXPECT_EQ(asked(), Lines{});
}

TEST_F(ErrorFromFSError, theTranslationTablesArentConsulted) {
  expectUnchanged(NSError(NSCocoaErrorDomain, 4354));
  expectUnchanged(NSError(QVTessalyErrorDomain, 14));
}

}  // namespace
}  // namespace droxa
