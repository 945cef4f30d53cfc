#include "additions/NSError+QVFPAdditions.h"
#include "tessaly/QVErrors.h"
#include "tests/extension/ExtensionFixture.h"

namespace droxa {
namespace {

class IdentifierForURL : public ExtensionTest {
 protected:
  // What is logged of a URL for which the daemon gives `item`, with `error` (may be empty) between.
  Lines lines(const NSURL &url, const std::string &item, const Lines &complaint, const std::string &result) {
    Lines expected{"debug: [DEBUG] ┏<1> asked identifier for " + url.path(),
                   "debug: [DEBUG] ┏<2> asked properties for " + url.path(),
                   "debug: [DEBUG] returning " + item, "debug: [DEBUG] ┗<2> "};
    expected.insert(expected.end(), complaint.begin(), complaint.end());
    expected.push_back("debug: [DEBUG] returning " + result);
    expected.push_back("debug: [DEBUG] ┗<1> ");
    return expected;
  }

  const std::shared_ptr<QVFileProviderExtension> extension = makeExtension();
};

TEST_F(IdentifierForURL, isTheItemsIdentifier) {
  const std::string identifier = daemon.addDocument("a.txt", 3).asString();
  const NSURL url = daemon.url("a.txt");
  EXPECT_EQ(extension->persistentIdentifierForItemAtURL(url), identifier);
  EXPECT_EQ(logged(), lines(url, daemon.item("a.txt")->description(), {}, identifier));
  EXPECT_EQ(asked(), Lines{"getQueryItemForURL(" + url.path() + ", fakeFSEvent 0)"});
}

TEST_F(IdentifierForURL, aURLOutsideTheSyncedLocationsHasNoneAndIsntLogged) {
  for (const NSURL &url :
       {NSURL(), NSURL::fileURLWithPath("/etc/passwd"), NSURL::URLWithString("https://example.com/a"),
        NSURL::fileURLWithPath(DroxaProcessHome().replica()),
        NSURL::fileURLWithPath(DroxaProcessHome().replica() + "/../state")}) {
    EXPECT_EQ(extension->persistentIdentifierForItemAtURL(url), std::nullopt) << url.description();
  }
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(asked(), Lines{});
}

TEST_F(IdentifierForURL, whereNothingIsThereIsNoIdentifier) {
  const NSURL url = daemon.url("").URLByAppendingPathComponent("missing");
  EXPECT_EQ(extension->persistentIdentifierForItemAtURL(url), std::nullopt);
  const NSError error = qv_fileProviderError(qvc_errorNoSuchItem(url.path()));
  EXPECT_EQ(logged(), lines(url, "(null)",
                            {"debug: [DEBUG] couldn't get item identifier at " + url.description() + ": " +
                             error.description()},
                            "(null)"));
}

TEST_F(IdentifierForURL, aDaemonThatCantBeReachedGivesNone) {
  daemon.addDocument("a.txt");
  const NSURL url = daemon.url("a.txt");
  const NSError failure(NSCocoaErrorDomain, NSXPCConnectionInterrupted);
  daemon.replies().failNextInTransport("getQueryItemForURL", failure);
  EXPECT_EQ(extension->persistentIdentifierForItemAtURL(url), std::nullopt);
  EXPECT_EQ(logged(), lines(url, "(null)",
                            {"debug: [DEBUG] couldn't get item identifier at " + url.description() + ": " +
                             failure.description()},
                            "(null)"));
}

// A container's item comes without an error when there is none.
TEST_F(IdentifierForURL, aContainerThatTheDaemonDoesntKnowHasNoneWithoutAnError) {
  const NSURL url = NSURL::fileURLWithPath(DroxaProcessHome().replica() + "/com.example.unknown/Documents");
  EXPECT_EQ(extension->persistentIdentifierForItemAtURL(url), std::nullopt);
  EXPECT_EQ(logged(), lines(url, "(null)", {}, "(null)"));
}

TEST_F(IdentifierForURL, leadsBackToTheURL) {
  daemon.addFolder("Folder");
  daemon.addDocument("Folder/a.txt");
  const NSURL url = daemon.url("Folder/a.txt");
  const auto identifier = extension->persistentIdentifierForItemAtURL(url);
  ASSERT_TRUE(identifier);
  EXPECT_EQ(extension->URLForItemWithPersistentIdentifier(*identifier), url);
}

}  // namespace
}  // namespace droxa
