#include <cerrno>
#include <cstdio>
#include <filesystem>
#include <gtest/gtest.h>
#include <sys/xattr.h>

#include "platform/foundation/NSFileManager.h"
#include "platform/foundation/NSURLResources.h"
#include "tessaly/QVUbiquitousItems.h"
#include "tests/support/FakeDaemonConnection.h"
#include "tests/support/ScratchHome.h"

namespace droxa {

namespace {

class UbiquitousItems : public testing::Test {
 protected:
  UbiquitousItems() { QVInstallUbiquitousItemProvider(); }
  ~UbiquitousItems() override { NSFileManager::defaultManager()->setUbiquitousItemProvider(nullptr); }

  // Marks the file as the daemon does; false where the file system has no such attributes.
  bool mark(const std::string &state) const {
    const std::string marker = "1 " + state + " 8 0 0 0123 v1 record";
    return setxattr(file_.path().c_str(), "user.droxa.document", marker.data(), marker.size(), 0) == 0;
  }
  NSURL makeFile() const {
    home_.write("replica/org.example.Box/Documents/a", "contents");
    return NSURL::fileURLWithPath(home_.replica() + "/org.example.Box/Documents/a");
  }

  const ScratchHome home_;
  const FakeDaemonScope fake_;
  const NSURL file_ = makeFile();
};

}  // namespace

TEST_F(UbiquitousItems, areEvictedByTheDaemon) {
  fake_.daemon->addDocument("a");
  NSError error;
  EXPECT_TRUE(NSFileManager::defaultManager()->evictUbiquitousItemAtURL(fake_.daemon->url("a"), &error));
  EXPECT_EQ(error, NSError());
  EXPECT_FALSE(fake_.daemon->item("a")->fields().isDownloaded);
}

TEST_F(UbiquitousItems, aRefusedEvictionIsTheDaemonsError) {
  fake_.daemon->addDocument("a");
  fake_.daemon->setUnsent("a", true);
  NSError error;
  EXPECT_FALSE(NSFileManager::defaultManager()->evictUbiquitousItemAtURL(fake_.daemon->url("a"), &error));
  EXPECT_TRUE(error.is(QVTessalyErrorDomain, QVErrorUnsentChanges));
  EXPECT_FALSE(NSFileManager::defaultManager()->evictUbiquitousItemAtURL(fake_.daemon->url("a"), nullptr));
}

TEST_F(UbiquitousItems, aDatalessDocumentIsNotReachable) {
  if (!mark("d")) GTEST_SKIP() << "no extended attributes here";
  EXPECT_TRUE(qv_isDataless(file_));
  NSError error;
  EXPECT_FALSE(checkResourceIsReachableAndReturnError(file_, &error));
  EXPECT_TRUE(error.is(NSCocoaErrorDomain, NSFileReadNoSuchFileError));
  mark("e");
  EXPECT_FALSE(checkResourceIsReachableAndReturnError(file_, nullptr));
}

TEST_F(UbiquitousItems, aPresentOrUnmarkedDocumentIsReachable) {
  EXPECT_TRUE(checkResourceIsReachableAndReturnError(file_, nullptr));
  if (!mark("p")) GTEST_SKIP() << "no extended attributes here";
  EXPECT_FALSE(qv_isDataless(file_));
  EXPECT_TRUE(checkResourceIsReachableAndReturnError(file_, nullptr));
}

TEST_F(UbiquitousItems, anAttributeOfAnotherKindSaysNothing) {
  if (!mark("d")) GTEST_SKIP() << "no extended attributes here";
  setxattr(file_.path().c_str(), "user.droxa.document", "2 d x", 5, 0);
  EXPECT_FALSE(qv_isDataless(file_));
  setxattr(file_.path().c_str(), "user.droxa.document", "1 d", 3, 0);
  EXPECT_FALSE(qv_isDataless(file_));
}

TEST_F(UbiquitousItems, areWorkedOnInTheDaemonsOwnFolder) {
  const auto provider = NSFileManager::defaultManager()->ubiquitousItemProvider();
  const NSURL folder = provider->itemReplacementDirectoryForURL(file_);
  EXPECT_EQ(folder.path(), home_.replica() + "/.droxa-private/actions");
  EXPECT_TRUE(std::filesystem::is_directory(folder.path()));
  EXPECT_EQ(provider->itemReplacementDirectoryForURL(file_), folder);
  EXPECT_FALSE(provider->itemReplacementDirectoryForURL(NSURL::fileURLWithPath(home_.root() + "/outside")));
  EXPECT_FALSE(provider->itemReplacementDirectoryForURL(NSURL()));
}

TEST_F(UbiquitousItems, thatArePromisedHaveAPhysicalURL) {
  const auto provider = NSFileManager::defaultManager()->ubiquitousItemProvider();
  const NSURL folder = file_.URLByDeletingLastPathComponent();
  const NSURL promised = folder.URLByAppendingPathComponent("b");
  const NSURL promise = folder.URLByAppendingPathComponent(".b.droxafault");
  EXPECT_EQ(provider->physicalURLForURL(promised), promised);
  home_.write("replica/org.example.Box/Documents/.b.droxafault", "droxa promise 1\n");
  EXPECT_EQ(provider->physicalURLForURL(promised), promise);
  EXPECT_EQ(provider->physicalURLForURL(file_), file_);
  EXPECT_EQ(provider->physicalURLForName(folder, "b"), promise);
}

// Its text alone could tell the name, and a rename doesn't change that.
TEST_F(UbiquitousItems, thatArePromisedCantBeRenamedToANameThatLeavesNoRoom) {
  const auto provider = NSFileManager::defaultManager()->ubiquitousItemProvider();
  const NSURL folder = file_.URLByDeletingLastPathComponent();
  for (const std::string &name : {std::string(250, 'x'), std::string("x~0123456789abcdef")}) {
    const NSURL target = provider->physicalURLForName(folder, name);
    EXPECT_EQ(::rename(file_.path().c_str(), target.path().c_str()), -1);
    EXPECT_EQ(errno, ENAMETOOLONG);
  }
}

// Also of one that has no file of its own.
TEST_F(UbiquitousItems, areSharedWhenTheDaemonSaysSo) {
  fake_.daemon->addDocument("b");
  for (const bool expected : {false, true}) {
    fake_.daemon->setShared("b", expected);
    bool isShared = !expected;
    EXPECT_TRUE(getResourceValue(fake_.daemon->url("b"), &isShared, NSURLUbiquitousItemIsSharedKey, nullptr));
    EXPECT_EQ(isShared, expected);
  }
}

TEST_F(UbiquitousItems, thatTheDaemonDoesntKnowHaveNoSharedState) {
  bool isShared = true;
  NSError error;
  EXPECT_FALSE(getResourceValue(NSURL::fileURLWithPath(home_.replica() + "/none"), &isShared,
                                NSURLUbiquitousItemIsSharedKey, &error));
  EXPECT_TRUE(error.is(QVTessalyErrorDomain, QVErrorNoSuchItem));
  EXPECT_TRUE(isShared) << "it stays";
}

}  // namespace droxa
