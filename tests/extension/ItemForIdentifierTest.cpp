#include "platform/fileprovider/NSFileProviderError.h"
#include "tessaly/QVErrors.h"
#include "tests/extension/ExtensionFixture.h"

namespace droxa {
namespace {

const std::string kMethod = "-[QVFileProviderExtension itemForIdentifier:error:]";

std::string opened(const std::string &identifier) {
  return "debug: [DEBUG] ┏<1> asked properties for " + identifier;
}
const std::string kClosed = "debug: [DEBUG] ┗<1> ";

class ItemForIdentifier : public ExtensionTest {
 protected:
  const std::shared_ptr<QVFileProviderExtension> extension = makeExtension();
};

TEST_F(ItemForIdentifier, isTheItemAtItsURL) {
  const std::string identifier = daemon.addDocument("a.txt", 5).asString();
  const NSURL url = daemon.url("a.txt");
  NSError error;
  const auto item = extension->itemForIdentifier(identifier, &error);
  ASSERT_TRUE(item);
  EXPECT_FALSE(error);
  EXPECT_EQ(item->fields(), daemon.item("a.txt")->fields());
  const std::string returned = "debug: [DEBUG] returning " + item->description();
  EXPECT_EQ(logged(), (Lines{opened(identifier), "debug: [DEBUG] ┏<2> asked url for " + identifier,
                             "debug: [DEBUG] returning " + url.description(), "debug: [DEBUG] ┗<2> ",
                             "debug: [DEBUG] ┏<3> asked properties for " + url.path(), returned,
                             "debug: [DEBUG] ┗<3> ", returned, kClosed}));
}

TEST_F(ItemForIdentifier, theRootIsAnItemToo) {
  EXPECT_TRUE(extension->itemForIdentifier(NSFileProviderRootContainerItemIdentifier, nullptr));
}

TEST_F(ItemForIdentifier, withoutALoginThereIsNone) {
  const std::string identifier = daemon.addDocument("a.txt").asString();
  signOut();
  NSError error;
  EXPECT_FALSE(extension->itemForIdentifier(identifier, &error));
  EXPECT_TRUE(error.is(NSFileProviderErrorDomain, -1000));
  EXPECT_EQ(
      logged(),
      (Lines{opened(identifier),
             "error: [ERROR] -[QVFileProviderExtension _isLoggedInOrError:]: (passed to caller) error: " +
                 error.description(),
             kClosed}));
  EXPECT_EQ(asked(), Lines{});
}

TEST_F(ItemForIdentifier, whatIsNoIdentifierHasNone) {
  const NSError expected = fileProviderErrorForNonExistentItemWithIdentifier("nonsense");
  NSError error;
  EXPECT_FALSE(extension->itemForIdentifier("nonsense", &error));
  EXPECT_EQ(error, expected);
  EXPECT_EQ(logged(),
            (Lines{opened("nonsense"), "debug: [DEBUG] ┏<2> asked url for nonsense",
                   "error: [ERROR] returning nil, there was an error: (null)", "debug: [DEBUG] ┗<2> ",
                   "error: [ERROR] " + kMethod + ": (passed to caller) error: " + expected.description(),
                   kClosed}));
}

TEST_F(ItemForIdentifier, aMissingItemIsLoggedAsIgnoredWithoutAnOutPointer) {
  EXPECT_FALSE(extension->itemForIdentifier("d99", nullptr));
  const Lines lines = logged();
  ASSERT_GE(lines.size(), 2u);
  EXPECT_EQ(lines[lines.size() - 2],
            "error: [ERROR] " + kMethod + ": (ignored by caller) error: " +
                fileProviderErrorForNonExistentItemWithIdentifier("d99").description());
  EXPECT_EQ(lines.back(), kClosed);
}

TEST_F(ItemForIdentifier, anItemThatVanishesInBetweenHasTheDaemonsError) {
  const std::string identifier = daemon.addDocument("a.txt").asString();
  const NSError failure(QVTessalyErrorDomain, QVErrorNoSuchItem);
  daemon.replies().failNext("getQueryItemForURL", failure);
  NSError error;
  EXPECT_FALSE(extension->itemForIdentifier(identifier, &error));
  EXPECT_TRUE(error.is(NSFileProviderErrorDomain, -1005));
  EXPECT_EQ(error.underlyingError(), failure);
  const Lines lines = logged();
  ASSERT_GE(lines.size(), 2u);
  EXPECT_EQ(lines[lines.size() - 2], "debug: [DEBUG] returning (null)");
  EXPECT_EQ(lines.back(), kClosed);
}

}  // namespace
}  // namespace droxa
