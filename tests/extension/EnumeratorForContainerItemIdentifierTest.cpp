#include "enumeration/QVBaseWorkingSetEnumerator.h"
#include "enumeration/QVDirectoriesEnumerator.h"
#include "enumeration/QVFileEnumerator.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "tests/extension/ExtensionFixture.h"
#include "tests/support/Observers.h"

namespace droxa {
namespace {

const std::string kMethod = "-[QVFileProviderExtension enumeratorForContainerItemIdentifier:error:]";
const std::string kClosed = "debug: [DEBUG] ┗<1> ";

std::string opened(const std::string &identifier) {
  return "debug: [DEBUG] ┏<1> enumerator for " + identifier;
}

class EnumeratorForContainer : public ExtensionTest {
 protected:
  // The enumerator, which must be a T.
  template <class T>
  std::shared_ptr<NSFileProviderEnumerator> enumeratorFor(const std::string &identifier) {
    NSError error;
    auto enumerator = extension->enumeratorForContainerItemIdentifier(identifier, &error);
    EXPECT_TRUE(std::dynamic_pointer_cast<T>(enumerator)) << identifier;
    EXPECT_FALSE(error);
    return enumerator;
  }
  // The calls that a first page makes.
  Lines askedForFirstPage(NSFileProviderEnumerator &enumerator) {
    daemon.log().clear();
    listPage(enumerator, NSFileProviderInitialPageSortedByName());
    Lines calls = asked();
    enumerator.invalidate();
    return calls;
  }

  const std::shared_ptr<QVFileProviderExtension> extension = makeExtension();
};

TEST_F(EnumeratorForContainer, ofTheWorkingSetNeedsNoURL) {
  enumeratorFor<QVBaseWorkingSetEnumerator>(NSFileProviderWorkingSetContainerItemIdentifier);
  EXPECT_EQ(logged(), (Lines{opened(NSFileProviderWorkingSetContainerItemIdentifier), kClosed}));
  EXPECT_EQ(asked(), Lines{});
}

TEST_F(EnumeratorForContainer, ofAllDirectoriesNeedsNoURL) {
  enumeratorFor<QVDirectoriesEnumerator>(NSFileProviderAllDirectoriesContainerItemIdentifier);
  EXPECT_EQ(logged(), (Lines{opened(NSFileProviderAllDirectoriesContainerItemIdentifier), kClosed}));
  EXPECT_EQ(asked(), Lines{});
}

TEST_F(EnumeratorForContainer, ofTheRootListsWithoutAFileObjectIdentifier) {
  const auto enumerator = enumeratorFor<QVFileEnumerator>(NSFileProviderRootContainerItemIdentifier);
  EXPECT_EQ(
      logged(),
      (Lines{opened(NSFileProviderRootContainerItemIdentifier),
             std::string("debug: [DEBUG] ┏<2> asked url for ") + NSFileProviderRootContainerItemIdentifier,
             "debug: [DEBUG] returning " + daemon.url("").description(), "debug: [DEBUG] ┗<2> ", kClosed}));
  ASSERT_TRUE(enumerator);
  const Lines calls = askedForFirstPage(*enumerator);
  ASSERT_FALSE(calls.empty());
  EXPECT_EQ(calls.back(), "enumerateItemsInFolder(root, sort 0, offset 0, limit 200)");
}

TEST_F(EnumeratorForContainer, ofAFolderListsAndWatchesIt) {
  const std::string identifier = daemon.addFolder("Folder").asString();
  const auto enumerator = enumeratorFor<QVFileEnumerator>(identifier);
  ASSERT_TRUE(enumerator);
  const Lines calls = askedForFirstPage(*enumerator);
  ASSERT_FALSE(calls.empty());
  EXPECT_EQ(calls.back(), "enumerateItemsInFolder(" + identifier + ", sort 0, offset 0, limit 200)");
  bool watched = false;
  for (const std::string &call : calls) {
    watched |= call.find("watchItemAtURL(" + daemon.url("Folder").path() + ", options ") != std::string::npos;
  }
  EXPECT_TRUE(watched);
}

TEST_F(EnumeratorForContainer, theTrashIsAnOrdinaryFolder) {
  const std::string path = DroxaProcessHome().replica() + "/" + QVUbiquitousTrashContainerID + "/files";
  const auto trash = daemon.item(path);
  ASSERT_TRUE(trash);
  enumeratorFor<QVFileEnumerator>(trash->itemIdentifier());
}

TEST_F(EnumeratorForContainer, withoutALoginThereIsNone) {
  signOut();
  for (const std::string identifier :
       {NSFileProviderWorkingSetContainerItemIdentifier, NSFileProviderAllDirectoriesContainerItemIdentifier,
        NSFileProviderRootContainerItemIdentifier, "i12"}) {
    clear();
    NSError error;
    EXPECT_FALSE(extension->enumeratorForContainerItemIdentifier(identifier, &error));
    EXPECT_TRUE(error.is(NSFileProviderErrorDomain, -1000));
    EXPECT_EQ(
        logged(),
        (Lines{opened(identifier),
               "error: [ERROR] -[QVFileProviderExtension _isLoggedInOrError:]: (passed to caller) error: " +
                   error.description(),
               kClosed}));
  }
}

TEST_F(EnumeratorForContainer, withoutAURLThereIsNone) {
  for (const std::string identifier : {"i99", "nonsense"}) {
    clear();
    const NSError expected = fileProviderErrorForNonExistentItemWithIdentifier(identifier);
    NSError error;
    EXPECT_FALSE(extension->enumeratorForContainerItemIdentifier(identifier, &error));
    EXPECT_EQ(error, expected);
    Lines lines = logged();
    ASSERT_GE(lines.size(), 2u);
    EXPECT_EQ(lines.front(), opened(identifier));
    EXPECT_EQ(lines[lines.size() - 2],
              "error: [ERROR] " + kMethod + ": (passed to caller) error: " + expected.description());
    EXPECT_EQ(lines.back(), kClosed);

    EXPECT_FALSE(extension->enumeratorForContainerItemIdentifier(identifier, nullptr));
    lines = logged();
    EXPECT_EQ(lines[lines.size() - 2],
              "error: [ERROR] " + kMethod + ": (ignored by caller) error: " + expected.description());
  }
}

}  // namespace
}  // namespace droxa
