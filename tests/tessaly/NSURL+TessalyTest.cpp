#include <cerrno>
#include <gtest/gtest.h>

#include "tessaly/NSURL+Tessaly.h"
#include "tessaly/QVErrors.h"
#include "tests/support/FakeDaemonConnection.h"
#include "tests/support/ScratchHome.h"

namespace droxa {

namespace {

class TessalyURL : public testing::Test {
 protected:
  // A path below the default container's folder.
  NSURL in(const std::string &path) const { return NSURL::fileURLWithPath(container_ + "/" + path); }
  NSURL link(const std::string &path, const std::string &target) const {
    home_.makeSymbolicLink("replica/org.example.Box/" + path, target);
    return in(path);
  }
  NSURL file(const std::string &path) const {
    home_.write("replica/org.example.Box/" + path, "contents");
    return in(path);
  }
  static NSURL resolve(const NSURL &url, NSError *error = nullptr) {
    return qv_URLByResolvingExternalDocumentReferenceWithError(url, error);
  }
  const ScratchHome home_;
  const std::string container_ = home_.replica() + "/org.example.Box";
};

using Alias = TessalyURL;

}  // namespace

TEST_F(TessalyURL, whatIsInAContainersFolderIsInASyncedLocation) {
  EXPECT_TRUE(qv_isInSyncedLocation(in("Documents")));
  EXPECT_TRUE(qv_isInSyncedLocation(in("Documents/a/b")));
  EXPECT_TRUE(qv_isInSyncedLocation(in("Library/state")));
}

TEST_F(TessalyURL, everythingElseIsNot) {
  EXPECT_FALSE(qv_isInSyncedLocation(NSURL()));
  EXPECT_FALSE(qv_isInSyncedLocation(NSURL::fileURLWithPath("/")));
  EXPECT_FALSE(qv_isInSyncedLocation(NSURL::fileURLWithPath(home_.root())));
  EXPECT_FALSE(qv_isInSyncedLocation(NSURL::fileURLWithPath(home_.replica())));
  EXPECT_FALSE(qv_isInSyncedLocation(NSURL::fileURLWithPath(container_)));
  EXPECT_FALSE(
      qv_isInSyncedLocation(NSURL::fileURLWithPath(home_.replica() + "-other/org.example.Box/Documents")));
  EXPECT_FALSE(qv_isInSyncedLocation(NSURL::fileURLWithPath(home_.replica() + "/.hidden/Documents/a")));
  EXPECT_FALSE(qv_isInSyncedLocation(in("../../outside/Documents")));
  EXPECT_FALSE(
      qv_isInSyncedLocation(NSURL::URLWithString("https://example.org" + container_ + "/Documents")));
}

TEST_F(TessalyURL, aPromiseURLHasItsName) {
  EXPECT_TRUE(qv_isPromiseURL(in("Documents/.a.txt.droxafault")));
  EXPECT_TRUE(qv_isPromiseURL(in("Documents/..droxafault.droxafault")));
  for (const char *path : {"Documents/a.txt.droxafault", "Documents/.droxafault", "Documents/..droxafault",
                           "Documents/.a.droxafaulty", "Documents/.a.droxafault/b"})
    EXPECT_FALSE(qv_isPromiseURL(in(path))) << path;
  EXPECT_FALSE(qv_isPromiseURL(NSURL()));
}

TEST_F(TessalyURL, aParentHasWhatIsBelowItAtAnyDepth) {
  EXPECT_TRUE(qv_isParentOfURL(in("Documents"), in("Documents/a")));
  EXPECT_TRUE(qv_isParentOfURL(in("Documents"), in("Documents/a/b/c")));
  EXPECT_FALSE(qv_isParentOfURL(in("Documents"), in("Documents")));
  EXPECT_FALSE(qv_isParentOfURL(in("Documents/a"), in("Documents")));
  EXPECT_FALSE(qv_isParentOfURL(in("Documents/a"), in("Documents/ab")));
  EXPECT_FALSE(qv_isParentOfURL(NSURL(), in("Documents")));
  EXPECT_FALSE(qv_isParentOfURL(in("Documents"), NSURL()));
}

TEST_F(TessalyURL, outsideTheDocumentsFolderAContainerIsPrivate) {
  EXPECT_TRUE(qv_isInTessalyPrivateStorages(in("Library")));
  EXPECT_TRUE(qv_isInTessalyPrivateStorages(in("Library/Documents/a")));
  EXPECT_TRUE(qv_isInTessalyPrivateStorages(in("Documents2")));
  EXPECT_FALSE(qv_isInTessalyPrivateStorages(in("Documents")));
  EXPECT_FALSE(qv_isInTessalyPrivateStorages(in("Documents/Library")));
  EXPECT_FALSE(qv_isInTessalyPrivateStorages(NSURL::fileURLWithPath("/Library")));
  EXPECT_FALSE(qv_isInTessalyPrivateStorages(NSURL()));
}

TEST_F(TessalyURL, someNamesAreKeptLocal) {
  for (const char *name : {"a.nosync", ".nosync", "a.tmp", "~$letter.doc", ".#draft", "a.swp", ".a.swp",
                           "a.part", "a.crdownload", ".fuse_hidden0001"})
    EXPECT_TRUE(qv_isNameExcludedFromSync(name)) << name;
  for (const char *name : {"", "a", "nosync", "a.nosync.txt", "tmp", "a.tmpx", "$~a", "~a", "#a",
                           "fuse_hidden", ".hidden", "\xff"})
    EXPECT_FALSE(qv_isNameExcludedFromSync(name)) << name;
}

TEST_F(TessalyURL, whatIsBelowAFolderThatIsKeptLocalIsKeptLocalToo) {
  EXPECT_TRUE(qv_wouldBeExcludedFromSync(in("Documents/a.tmp")));
  EXPECT_TRUE(qv_wouldBeExcludedFromSync(in("Documents/cache.nosync/a/b")));
  EXPECT_FALSE(qv_wouldBeExcludedFromSync(in("Documents/a/b")));
  EXPECT_FALSE(qv_wouldBeExcludedFromSync(NSURL::fileURLWithPath("/tmp/a.tmp")));
  EXPECT_FALSE(qv_wouldBeExcludedFromSync(NSURL()));
}

TEST_F(TessalyURL, onlyTheDocumentsFolderItselfNamesItsContainer) {
  EXPECT_EQ(qv_containerIDIfIsDocumentsContainerURL(in("Documents")), "org.example.Box");
  EXPECT_EQ(qv_containerIDIfIsDocumentsContainerURL(in("Documents/")), "org.example.Box");
  EXPECT_EQ(qv_containerIDIfIsDocumentsContainerURL(in("Documents/a")), std::nullopt);
  EXPECT_EQ(qv_containerIDIfIsDocumentsContainerURL(in("Library")), std::nullopt);
  EXPECT_EQ(qv_containerIDIfIsDocumentsContainerURL(NSURL::fileURLWithPath(container_)), std::nullopt);
  EXPECT_EQ(qv_containerIDIfIsDocumentsContainerURL(NSURL::fileURLWithPath("/Documents")), std::nullopt);
  EXPECT_EQ(qv_containerIDIfIsDocumentsContainerURL(NSURL()), std::nullopt);
}

TEST_F(TessalyURL, thePhysicalPropertyIsAdded) {
  NSURL url = in("Documents/a");
  qv_addPhysicalProperty(url);
  EXPECT_TRUE(url.hasPhysicalProperty());
  EXPECT_EQ(url, in("Documents/a"));
  NSURL nil;
  qv_addPhysicalProperty(nil);
  EXPECT_FALSE(nil);
}

TEST_F(TessalyURL, theseQuestionsNeedNoDaemon) {
  const FakeDaemonScope scope;
  const NSURL url = link("Documents/alias", "target");
  qv_isInSyncedLocation(url);
  qv_isInTessalyPrivateStorages(url);
  qv_wouldBeExcludedFromSync(url);
  qv_containerIDIfIsDocumentsContainerURL(url);
  qv_isExternalDocumentReference(url);
  resolve(url);
  EXPECT_TRUE(scope.daemon->calls().empty());
}

TEST_F(TessalyURL, aFileObjectsURLIsAskedOfTheDaemon) {
  const FakeDaemonScope scope;
  const QVFileObjectID document = scope.daemon->addDocument("a");
  NSError error;
  EXPECT_EQ(qv_documentURLFromFileObjectID(document, &error), scope.daemon->url("a"));
  EXPECT_FALSE(error);
  EXPECT_EQ(scope.daemon->calls(),
            std::vector<std::string>({"getURLForFileObjectID(" + document.asString() + ")"}));
}

TEST_F(TessalyURL, aFileObjectThatIsNotThereHasNoURL) {
  const FakeDaemonScope scope;
  NSError error;
  EXPECT_FALSE(qv_documentURLFromFileObjectID(QVFileObjectID::documentID(99), &error));
  EXPECT_EQ(error, qvc_errorNoSuchItem("d99"));
  EXPECT_FALSE(qv_documentURLFromFileObjectID(QVFileObjectID::documentID(99), nullptr));
  const NSError broken(NSCocoaErrorDomain, NSXPCConnectionInvalid);
  scope.connection->setUnreachable(broken);
  EXPECT_FALSE(qv_documentURLFromFileObjectID(QVFileObjectID::documentID(99), &error));
  EXPECT_EQ(error, broken);
}

TEST_F(Alias, aLinkToASyncedLocationIsOne) {
  const NSURL target = file("Documents/f/target");
  EXPECT_TRUE(qv_isExternalDocumentReference(link("Documents/absolute", target.path())));
  EXPECT_TRUE(qv_isExternalDocumentReference(link("Documents/relative", "f/target")));
  EXPECT_EQ(resolve(in("Documents/absolute")), target);
  EXPECT_EQ(resolve(in("Documents/relative")), target);
}

TEST_F(Alias, itsTargetMayBeAFolderOfAnotherContainer) {
  const std::string folder = home_.makeFolder("replica/org.example.Other/Documents/f");
  const NSURL alias = link("Documents/alias", "../../org.example.Other/Documents/f");
  EXPECT_TRUE(qv_isExternalDocumentReference(alias));
  EXPECT_EQ(resolve(alias).path(), folder);
}

TEST_F(Alias, aLinkOutOfTheReplicaIsNone) {
  EXPECT_FALSE(qv_isExternalDocumentReference(link("Documents/absolute", "/etc/hostname")));
  EXPECT_FALSE(qv_isExternalDocumentReference(link("Documents/relative", "../../../outside")));
  EXPECT_FALSE(qv_isExternalDocumentReference(link("Documents/container", container_)));
}

TEST_F(Alias, aLinkThroughALinkThatLeadsOutIsNone) {
  home_.write("outside/secret", "");
  link("Documents/way out", home_.root() + "/outside");
  EXPECT_FALSE(qv_isExternalDocumentReference(link("Documents/sly", "way out/secret")));
  EXPECT_FALSE(qv_isExternalDocumentReference(link("Documents/chain", "way out")));
}

TEST_F(Alias, filesFoldersAndNothingAreNone) {
  EXPECT_FALSE(qv_isExternalDocumentReference(file("Documents/file")));
  EXPECT_FALSE(qv_isExternalDocumentReference(in("Documents")));
  EXPECT_FALSE(qv_isExternalDocumentReference(in("Documents/missing")));
  EXPECT_FALSE(qv_isExternalDocumentReference(NSURL()));
}

TEST_F(Alias, aliasesOfAliasesLeadToTheLastTarget) {
  const NSURL target = file("Documents/target");
  link("Documents/first", "target");
  link("Documents/f/second", "../first");
  const NSURL third = link("Documents/third", "f/second");
  EXPECT_TRUE(qv_isExternalDocumentReference(third));
  EXPECT_EQ(resolve(third), target);
}

TEST_F(Alias, aDanglingAliasHasNoTarget) {
  const NSURL dangling = link("Documents/dangling", "missing");
  EXPECT_TRUE(qv_isExternalDocumentReference(dangling));
  NSError error;
  EXPECT_FALSE(resolve(dangling, &error));
  EXPECT_TRUE(error.is(NSCocoaErrorDomain, NSFileReadNoSuchFileError));
  EXPECT_TRUE(error.underlyingError().is(NSPOSIXErrorDomain, ENOENT));
  EXPECT_NE(error.localizedDescription().find(dangling.path()), std::string::npos);
  EXPECT_FALSE(resolve(dangling, nullptr));
}

TEST_F(Alias, aCircularAliasHasNoTarget) {
  link("Documents/a", "b");
  link("Documents/b", "a");
  const NSURL self = link("Documents/self", "self");
  for (const NSURL &circular : {in("Documents/a"), self}) {
    EXPECT_TRUE(qv_isExternalDocumentReference(circular));
    NSError error;
    EXPECT_FALSE(resolve(circular, &error));
    EXPECT_TRUE(error.is(NSCocoaErrorDomain, NSFileReadNoSuchFileError));
    EXPECT_TRUE(error.underlyingError().is(NSPOSIXErrorDomain, ELOOP));
  }
}

TEST_F(Alias, chainsOfUpToFortyLinksAreFollowed) {
  const NSURL target = file("Documents/0");
  for (int i = 1; i <= 41; ++i) link("Documents/" + std::to_string(i), std::to_string(i - 1));
  EXPECT_EQ(resolve(in("Documents/40")), target);
  EXPECT_FALSE(resolve(in("Documents/41")));
}

TEST_F(Alias, aHomeThatIsReachedThroughALinkHasAliasesToo) {
  file("Documents/target");
  link("Documents/alias", "target");
  link("Documents/absolute", container_ + "/Documents/target");
  const std::string nickname = home_.makeSymbolicLink("nickname", home_.root());
  DroxaSetProcessHome(DroxaHome(nickname));
  const std::string documents = nickname + "/replica/org.example.Box/Documents/";
  for (const char *name : {"alias", "absolute"}) {
    EXPECT_TRUE(qv_isExternalDocumentReference(NSURL::fileURLWithPath(documents + name)));
    EXPECT_EQ(resolve(NSURL::fileURLWithPath(documents + name)).path(), documents + "target");
  }
}

TEST_F(Alias, namesMayBeAnyBytes) {
  const NSURL target = file("Documents/new\nline \xff");
  const NSURL alias = link("Documents/\xfe", "new\nline \xff");
  EXPECT_TRUE(qv_isExternalDocumentReference(alias));
  EXPECT_EQ(resolve(alias), target);
}

TEST_F(Alias, nilResolvesToNilWithAnError) {
  NSError error;
  EXPECT_FALSE(resolve(NSURL(), &error));
  EXPECT_TRUE(error);
}

TEST_F(TessalyURL, hasTheTypeThatTheDaemonTells) {
  const FakeDaemonScope fake;
  fake.daemon->addDocument("a");
  fake.daemon->addFolder("b");
  NSError error;
  EXPECT_EQ(qv_typeIdentifierWithError(fake.daemon->url("a"), &error), "application/octet-stream");
  EXPECT_EQ(qv_typeIdentifierWithError(fake.daemon->url("b"), &error), "inode/directory");
  EXPECT_FALSE(error);
}

TEST_F(TessalyURL, hasNoTypeWhereNothingIs) {
  const FakeDaemonScope fake;
  NSError error;
  EXPECT_FALSE(qv_typeIdentifierWithError(in("Documents/none"), &error));
  EXPECT_TRUE(error.is(QVTessalyErrorDomain, QVErrorNoSuchItem));
  EXPECT_FALSE(qv_typeIdentifierWithError(NSURL(), &error));
  EXPECT_TRUE(error.is(QVTessalyErrorDomain, QVErrorInvalidArgument));
  EXPECT_FALSE(qv_typeIdentifierWithError(NSURL(), nullptr));
}

}  // namespace droxa
