#include <cerrno>
#include <thread>

#include "tessaly/NSURL+Tessaly.h"
#include "tests/extension/ExtensionFixture.h"
#include "tests/support/Eventually.h"

namespace droxa {
namespace {

const std::string kRoot = NSFileProviderRootContainerItemIdentifier;

std::string opened(const std::string &identifier) {
  return "debug: [DEBUG] ┏<1> asked url for " + identifier;
}
std::string returning(const NSURL &url) {
  return "debug: [DEBUG] returning " + url.description();
}
std::string returningNothing(const NSError &error) {
  return "error: [ERROR] returning nil, there was an error: " + error.description();
}
const std::string kClosed = "debug: [DEBUG] ┗<1> ";
const std::string kBookmark = "debug: [DEBUG] we have a bookmark, returning its target";
std::string detected(const NSURL &url, const std::string &identifier) {
  return "default: [WARNING] Detected url in private or excluded location " + url.path() +
         " -- Fetching URL from daemon for " + identifier;
}

class URLForIdentifier : public ExtensionTest {
 protected:
  // A document or folder that is on disk too.
  std::string addOnDisk(const std::string &path) {
    const std::string identifier = daemon.addDocument(path).asString();
    const std::filesystem::path file = daemon.url(path).path();
    std::filesystem::create_directories(file.parent_path());
    std::ofstream(file) << "contents";
    daemon.log().clear();
    return identifier;
  }
  std::string addAliasOnDisk(const std::string &path, const std::string &target) {
    const std::string identifier = daemon.addAlias(path).asString();
    const std::filesystem::path link = daemon.url(path).path();
    std::filesystem::create_directories(link.parent_path());
    std::filesystem::create_symlink(target, link);
    daemon.log().clear();
    return identifier;
  }
  // A file of the default container that isn't one of its documents.
  NSURL makePrivateFile(const std::string &name) {
    const std::filesystem::path file =
        std::filesystem::path(daemon.url("").path()).parent_path() / "Private" / name;
    std::filesystem::create_directories(file.parent_path());
    std::ofstream(file) << "private";
    return NSURL::fileURLWithPath(file.string());
  }

  const std::shared_ptr<QVFileProviderExtension> extension = makeExtension();
};

TEST_F(URLForIdentifier, theRootIsTheDefaultContainersDocumentsFolder) {
  const NSURL url = extension->URLForItemWithPersistentIdentifier(kRoot);
  EXPECT_EQ(url, daemon.url(""));
  EXPECT_EQ(logged(), (Lines{opened(kRoot), returning(url), kClosed}));
  EXPECT_EQ(asked(), Lines{"getContainers()"});
}

TEST_F(URLForIdentifier, theRootNeedsNotBeASyncedLocation) {
  const NSURL root = daemon.url("");
  DroxaSetProcessHome(DroxaHome(home.path() + "/elsewhere"));
  EXPECT_EQ(extension->URLForItemWithPersistentIdentifier(kRoot), root);
}

TEST_F(URLForIdentifier, theRootIsNeverMarkedPhysical) {
  EXPECT_FALSE(extension->_URLForItemWithPersistentIdentifier(kRoot, true, true).hasPhysicalProperty());
}

TEST_F(URLForIdentifier, withoutContainersThereIsNoRoot) {
  fake.connection->setUnreachable(NSError(NSCocoaErrorDomain, NSXPCConnectionInvalid));
  EXPECT_FALSE(extension->URLForItemWithPersistentIdentifier(kRoot));
  const Lines lines = logged();
  ASSERT_GE(lines.size(), 3u);
  EXPECT_EQ(lines.front(), opened(kRoot));
  EXPECT_EQ(lines[lines.size() - 2], "debug: [DEBUG] returning (null)");
  EXPECT_EQ(lines.back(), kClosed);
}

TEST_F(URLForIdentifier, aDocumentIsWhereTheDaemonSays) {
  const std::string identifier = daemon.addDocument("a b.txt").asString();
  const NSURL url = extension->URLForItemWithPersistentIdentifier(identifier);
  EXPECT_EQ(url, daemon.url("a b.txt"));
  EXPECT_FALSE(url.hasPhysicalProperty());
  EXPECT_EQ(logged(), (Lines{opened(identifier), returning(url), kClosed}));
  EXPECT_EQ(asked(), Lines{"getURLForFileObjectID(" + identifier + ")"});
}

TEST_F(URLForIdentifier, aFolderIsWhereTheDaemonSays) {
  const std::string identifier = daemon.addFolder("Folder").asString();
  EXPECT_EQ(extension->URLForItemWithPersistentIdentifier(identifier), daemon.url("Folder"));
}

TEST_F(URLForIdentifier, theURLIsMarkedPhysicalWhenAskedFor) {
  const std::string identifier = daemon.addDocument("a.txt").asString();
  EXPECT_TRUE(extension->_URLForItemWithPersistentIdentifier(identifier, true, true).hasPhysicalProperty());
  EXPECT_FALSE(extension->_URLForItemWithPersistentIdentifier(identifier, true, false).hasPhysicalProperty());
  EXPECT_FALSE(extension->_URLForItemWithPersistentIdentifier(identifier, true).hasPhysicalProperty());
}

TEST_F(URLForIdentifier, whatIsNoIdentifierHasNoURLAndNoError) {
  for (const std::string identifier :
       {"", "x1", "d", "d0", "d01", "d-1", "i99999999999999999999", "d1 ", "NSFileProviderRootContainer",
        "NSFileProviderWorkingSetContainerItemIdentifier"}) {
    clear();
    EXPECT_FALSE(extension->URLForItemWithPersistentIdentifier(identifier)) << identifier;
    EXPECT_EQ(logged(), (Lines{opened(identifier), returningNothing(NSError()), kClosed}));
    EXPECT_EQ(asked(), Lines{});
  }
}

TEST_F(URLForIdentifier, anItemThatIsNoMoreHasNoURL) {
  const std::string identifier = daemon.addDocument("a.txt").asString();
  daemon.remove("a.txt");
  EXPECT_FALSE(extension->URLForItemWithPersistentIdentifier(identifier));
  EXPECT_EQ(logged(),
            (Lines{opened(identifier), returningNothing(qvc_errorNoSuchItem(identifier)), kClosed}));
}

TEST_F(URLForIdentifier, aDaemonThatCantBeReachedHasNoURL) {
  const std::string identifier = daemon.addDocument("a.txt").asString();
  const NSError failure(NSCocoaErrorDomain, NSXPCConnectionInterrupted);
  daemon.replies().failNextInTransport("getURLForFileObjectID", failure);
  EXPECT_FALSE(extension->URLForItemWithPersistentIdentifier(identifier));
  EXPECT_EQ(logged(), (Lines{opened(identifier), returningNothing(failure), kClosed}));
}

TEST_F(URLForIdentifier, aURLOutsideTheSyncedLocationsIsNotReturned) {
  const std::string identifier = daemon.addDocument("a.txt").asString();
  const NSURL url = daemon.url("a.txt");
  DroxaSetProcessHome(DroxaHome(home.path() + "/elsewhere"));
  EXPECT_FALSE(extension->_URLForItemWithPersistentIdentifier(identifier, true, true));
  EXPECT_EQ(logged(), (Lines{opened(identifier), returning(url), kClosed}));
}

TEST_F(URLForIdentifier, anAliasGivesItsTarget) {
  addOnDisk("target.txt");
  const std::string identifier = addAliasOnDisk("alias", "target.txt");
  const NSURL url = extension->URLForItemWithPersistentIdentifier(identifier);
  EXPECT_EQ(url, daemon.url("target.txt"));
  EXPECT_EQ(logged(), (Lines{opened(identifier), kBookmark, returning(url), kClosed}));
}

TEST_F(URLForIdentifier, anAliasGivesItselfWhenAliasesArentResolved) {
  addOnDisk("target.txt");
  const std::string identifier = addAliasOnDisk("alias", "target.txt");
  const NSURL url = extension->_URLForItemWithPersistentIdentifier(identifier, false);
  EXPECT_EQ(url, daemon.url("alias"));
  EXPECT_EQ(logged(), (Lines{opened(identifier), returning(url), kClosed}));
}

TEST_F(URLForIdentifier, aDanglingAliasHasNoURL) {
  const std::string identifier = addAliasOnDisk("alias", daemon.url("").path() + "/missing.txt");
  EXPECT_FALSE(extension->URLForItemWithPersistentIdentifier(identifier));
  NSError error;
  qv_URLByResolvingExternalDocumentReferenceWithError(daemon.url("alias"), &error);
  EXPECT_EQ(logged(), (Lines{opened(identifier), kBookmark, returningNothing(error), kClosed}));
}

TEST_F(URLForIdentifier, aLinkOutOfTheReplicaIsNoAlias) {
  const std::string identifier = addAliasOnDisk("alias", "/etc/hostname");
  EXPECT_EQ(extension->URLForItemWithPersistentIdentifier(identifier), daemon.url("alias"));
}

TEST_F(URLForIdentifier, theDaemonIsAskedWhereAnExcludedItemIs) {
  const std::string identifier = daemon.addDocument("a.tmp").asString();
  const NSURL url = extension->URLForItemWithPersistentIdentifier(identifier);
  EXPECT_EQ(url, daemon.url("a.tmp"));
  EXPECT_EQ(logged(), (Lines{opened(identifier), detected(url, identifier), returning(url), kClosed}));
  EXPECT_EQ(asked(), (Lines{"getURLForFileObjectID(" + identifier + ")",
                            "getURLForItemIdentifier(" + identifier + ")"}));
}

TEST_F(URLForIdentifier, theDaemonsURLOfAPrivateItemReplacesTheLocalOne) {
  const NSURL privateURL = makePrivateFile("secret");
  const std::string identifier = addAliasOnDisk("alias", privateURL.path());
  const NSURL url = extension->URLForItemWithPersistentIdentifier(identifier);
  EXPECT_EQ(url, daemon.url("alias")) << "where the daemon says that the item is";
  EXPECT_EQ(logged(), (Lines{opened(identifier), kBookmark, detected(privateURL, identifier), returning(url),
                             kClosed}));
}

TEST_F(URLForIdentifier, theLocalURLIsKeptWhenTheDaemonCantTellABetterOne) {
  const std::string identifier = daemon.addDocument("a.nosync").asString();
  const NSError failure(QVTessalyErrorDomain, QVErrorDatabase);
  daemon.replies().failNext("getURLForItemIdentifier", failure);
  const NSURL url = extension->URLForItemWithPersistentIdentifier(identifier);
  EXPECT_EQ(url, daemon.url("a.nosync"));
  EXPECT_EQ(logged(),
            (Lines{opened(identifier), detected(url, identifier),
                   "default: [WARNING] Failed getting url of " + identifier + " - " + failure.description(),
                   returning(url), kClosed}));
}

TEST_F(URLForIdentifier, theLocalURLIsKeptWhenTheDaemonGoesAway) {
  const std::string identifier = daemon.addDocument("~$a.txt").asString();
  const NSError failure(NSCocoaErrorDomain, NSXPCConnectionInterrupted);
  daemon.replies().failNextInTransport("getURLForItemIdentifier", failure);
  const NSURL url = extension->URLForItemWithPersistentIdentifier(identifier);
  EXPECT_EQ(url, daemon.url("~$a.txt"));
  EXPECT_EQ(logged(),
            (Lines{opened(identifier), detected(url, identifier),
                   "default: [WARNING] Failed getting url of " + identifier + " - " + failure.description(),
                   returning(url), kClosed}));
}

TEST_F(URLForIdentifier, theCallerIsBlockedUntilTheDaemonReplies) {
  const std::string identifier = daemon.addDocument("a.txt").asString();
  daemon.replies().answerOnAnotherThread(true);
  daemon.replies().hold("getURLForFileObjectID");
  NSURL url;
  std::thread caller([&] { url = extension->URLForItemWithPersistentIdentifier(identifier); });
  EXPECT_TRUE(eventually([&] { return daemon.replies().heldCount("getURLForFileObjectID") == 1; }));
  EXPECT_EQ(logged(), Lines{opened(identifier)});
  daemon.replies().release("getURLForFileObjectID");
  caller.join();
  EXPECT_EQ(url, daemon.url("a.txt"));
}

TEST_F(URLForIdentifier, namesAreRawBytes) {
  for (const std::string &name :
       {std::string("line\nbreak"), std::string("\xff\xfe.txt"), std::string(255, 'x'),
        std::string(".hidden"), std::string("%41"), std::string("100% sure")}) {
    const std::string identifier = daemon.addDocument(name).asString();
    EXPECT_EQ(extension->URLForItemWithPersistentIdentifier(identifier).lastPathComponent(), name);
  }
}

}  // namespace
}  // namespace droxa
