#include "additions/NSError+QVFPAdditions.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVErrors.h"
#include "tests/extension/ExtensionFixture.h"

namespace droxa {
namespace {

class PropertiesForURL : public ExtensionTest {
 protected:
  static Lines lines(const NSURL &url, const std::string &item) {
    return {"debug: [DEBUG] ┏<1> asked properties for " + url.path(), "debug: [DEBUG] returning " + item,
            "debug: [DEBUG] ┗<1> "};
  }
  static std::string askedFor(const NSURL &url, bool fakeFSEvent) {
    return "getQueryItemForURL(" + url.path() + ", fakeFSEvent " + (fakeFSEvent ? "1" : "0") + ")";
  }
  static NSURL documentsOf(const std::string &containerID) {
    return NSURL::fileURLWithPath(DroxaProcessHome().replica() + "/" + containerID + "/" +
                                  QVDocumentsFolderName(containerID));
  }

  const std::shared_ptr<QVFileProviderExtension> extension = makeExtension();
};

TEST_F(PropertiesForURL, areTheDaemonsOfADocument) {
  daemon.addDocument("a.txt", 7);
  const NSURL url = daemon.url("a.txt");
  NSError error;
  const auto item = extension->_propertiesForItemAtURL(url, &error);
  ASSERT_TRUE(item);
  EXPECT_FALSE(error);
  EXPECT_EQ(item->fields(), daemon.item("a.txt")->fields());
  EXPECT_EQ(logged(), lines(url, item->description()));
  EXPECT_EQ(asked(), Lines{askedFor(url, false)});
}

TEST_F(PropertiesForURL, ofANewItemMakeTheDaemonLook) {
  daemon.addDocument("a.txt");
  const NSURL url = daemon.url("a.txt");
  EXPECT_TRUE(extension->_propertiesForNewItemAtURL(url, nullptr));
  EXPECT_TRUE(extension->_propertiesForItemAtURL(url, true, nullptr));
  EXPECT_TRUE(extension->_propertiesForItemAtURL(url, false, nullptr));
  EXPECT_TRUE(extension->_propertiesForItemAtURL(url, nullptr));
  EXPECT_EQ(asked(),
            (Lines{askedFor(url, true), askedFor(url, true), askedFor(url, false), askedFor(url, false)}));
}

TEST_F(PropertiesForURL, outsideTheSyncedLocationsAreNoneAndNothingIsLogged) {
  const NSURL url = NSURL::fileURLWithPath("/etc/passwd");
  NSError error;
  EXPECT_FALSE(extension->_propertiesForItemAtURL(url, &error));
  EXPECT_EQ(error, NSError(NSFileProviderErrorDomain, -1005)) << "without user info";
  EXPECT_FALSE(extension->_propertiesForItemAtURL(url, nullptr));
  EXPECT_FALSE(extension->_propertiesForItemAtURL(NSURL(), nullptr));
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(asked(), Lines{});
}

TEST_F(PropertiesForURL, ofAnApplicationsContainerAreTheContainerItems) {
  daemon.addContainer("com.example.notes");
  const NSURL url = documentsOf("com.example.notes");
  for (const bool forceScan : {false, true}) {
    clear();
    QVContainerCache::forget();
    NSError error;
    const auto item = extension->_propertiesForItemAtURL(url, forceScan, &error);
    ASSERT_TRUE(item);
    EXPECT_FALSE(error);
    EXPECT_EQ(logged(), lines(url, item->description()));
    EXPECT_EQ(asked(),
              (Lines{"getContainers()", std::string("getContainerItem(com.example.notes, forceScan ") +
                                            (forceScan ? "1)" : "0)")}));
  }
}

TEST_F(PropertiesForURL, ofTheRootAreItsContainerItems) {
  const auto item = extension->_propertiesForItemAtURL(daemon.url(""), nullptr);
  ASSERT_TRUE(item);
  EXPECT_EQ(asked().back(),
            std::string("getContainerItem(") + QVUbiquitousDefaultContainerID + ", forceScan 0)");
}

TEST_F(PropertiesForURL, ofTheDocumentsAndDesktopContainersAreAnOrdinaryItems) {
  for (const std::string containerID : {QVUbiquitousDocumentsContainerID, QVUbiquitousDesktopContainerID}) {
    clear();
    const NSURL url = documentsOf(containerID);
    EXPECT_TRUE(extension->_propertiesForItemAtURL(url, nullptr));
    EXPECT_EQ(asked(), Lines{askedFor(url, false)});
  }
}

TEST_F(PropertiesForURL, ofAnUnknownContainerAreNoneWithoutAnError) {
  const NSURL url = documentsOf("com.example.unknown");
  NSError error;
  EXPECT_FALSE(extension->_propertiesForItemAtURL(url, &error));
  EXPECT_FALSE(error);
  EXPECT_EQ(logged(), lines(url, "(null)"));
}

TEST_F(PropertiesForURL, ofAContainerThatTheDaemonCantGiveAreNoneWithoutAnError) {
  daemon.addContainer("com.example.notes");
  daemon.replies().failNext("getContainerItem", NSError(QVTessalyErrorDomain, QVErrorDatabase));
  NSError error;
  EXPECT_FALSE(extension->_propertiesForItemAtURL(documentsOf("com.example.notes"), &error));
  EXPECT_FALSE(error);
}

TEST_F(PropertiesForURL, aDaemonsErrorIsTranslated) {
  daemon.addDocument("a.txt");
  const NSURL url = daemon.url("a.txt");
  for (const auto &[code, translated] : {std::pair{2, -1000}, {14, -1005}, {60, 16}, {59, 17}}) {
    clear();
    const NSError failure(QVTessalyErrorDomain, code);
    daemon.replies().failNext("getQueryItemForURL", failure);
    NSError error;
    EXPECT_FALSE(extension->_propertiesForItemAtURL(url, &error));
    EXPECT_TRUE(error.is(NSFileProviderErrorDomain, translated)) << error.description();
    EXPECT_EQ(error.underlyingError(), failure);
    EXPECT_EQ(logged(), lines(url, "(null)"));
  }
}

TEST_F(PropertiesForURL, anErrorWithoutTranslationPassesThrough) {
  daemon.addDocument("a.txt");
  const NSError failure(QVTessalyErrorDomain, QVErrorDatabase);
  daemon.replies().failNext("getQueryItemForURL", failure);
  NSError error;
  EXPECT_FALSE(extension->_propertiesForItemAtURL(daemon.url("a.txt"), &error));
  EXPECT_EQ(error, failure);
}

TEST_F(PropertiesForURL, anErrorThatNobodyAskedForIsDropped) {
  const NSURL url = daemon.url("").URLByAppendingPathComponent("missing");
  EXPECT_FALSE(extension->_propertiesForItemAtURL(url, nullptr));
  EXPECT_EQ(logged(), lines(url, "(null)"));
}

}  // namespace
}  // namespace droxa
