#include <thread>

#include "tessaly/QVErrors.h"
#include "tests/extension/ProvidingFixture.h"

namespace droxa {
namespace {

class StopProviding : public ProvidingTest {
 protected:
  static std::string stopping(const NSURL &url) { return "debug: [DEBUG] stop providing " + url.path(); }
  // The lines of the level and above, without those of looking URLs up.
  Lines complaints() const {
    Lines lines;
    for (const std::string &line : logged())
      if (!line.starts_with("debug: ")) lines.push_back(line);
    return lines;
  }
  std::size_t evictions() const { return daemon.log().count("evictItemAtURL"); }
};

TEST_F(StopProviding, aDownloadUnderWayIsCancelledAndNothingEvicted) {
  const NSURL url = at("a");
  const Once<NSError> done("completion");
  start(url, done);
  extension->stopProvidingItemAtURL(url);
  EXPECT_TRUE(done.value<0>().is(QVTessalyErrorDomain, QVErrorCancelled)) << done.value<0>().description();
  EXPECT_TRUE(daemon.log().waitFor("transfer 1: cancel"));
  EXPECT_EQ(evictions(), 0U);
  EXPECT_EQ(loggedUntil(closed(1)),
            (Lines{starting(url, 1), stopping(url), ended(1, done.value<0>()), closed(1)}));
}

TEST_F(StopProviding, aDownloadThatTheDaemonHasNotStartedIsCancelled) {
  daemon.replies().hold("startDownloadAtURL");
  const Once<NSError> done("completion");
  extension->startProvidingItemAtURL(at("a"), done.completion());
  extension->stopProvidingItemAtURL(at("a"));
  EXPECT_TRUE(done.value<0>().is(QVTessalyErrorDomain, QVErrorCancelled));
  daemon.replies().release("startDownloadAtURL");
  EXPECT_TRUE(eventually([this] { return daemon.interests("a") == 0; }));
  EXPECT_EQ(evictions(), 0U);
}

TEST_F(StopProviding, withoutADownloadTheContentsAreEvicted) {
  daemon.addDocument("b", 3);
  clear();
  extension->stopProvidingItemAtURL(at("b"));
  EXPECT_EQ(logged(), Lines{stopping(at("b"))});
  EXPECT_EQ(asked(), Lines{"evictItemAtURL(" + at("b").path() + ")"});
  EXPECT_FALSE(daemon.item("b")->fields().isDownloaded);
}

TEST_F(StopProviding, afterADownloadHasEndedTheContentsAreEvicted) {
  const Once<NSError> done("completion");
  start(at("a"), done);
  daemon.finishDownload("a");
  done.wait();
  extension->stopProvidingItemAtURL(at("a"));
  EXPECT_EQ(evictions(), 1U);
  EXPECT_FALSE(daemon.item("a")->fields().isDownloaded);
}

TEST_F(StopProviding, anEvictionThatFailsIsLoggedWithItsError) {
  daemon.addDocument("b", 3);
  daemon.setUnsent("b", true);
  clear();
  extension->stopProvidingItemAtURL(at("b"));
  const NSError refusal = qvc_error(QVErrorUnsentChanges, "the cloud doesn't have the document's contents");
  EXPECT_EQ(logged(),
            (Lines{stopping(at("b")), "error: [ERROR] can't evict item at url: " + refusal.description()}));
  EXPECT_TRUE(daemon.item("b")->fields().isDownloaded);
}

TEST_F(StopProviding, anEvictionWithoutADaemonIsLoggedWithTheConnectionsError) {
  const NSError broken(NSCocoaErrorDomain, NSXPCConnectionInvalid);
  fake.connection->setUnreachable(broken);
  extension->stopProvidingItemAtURL(at("a"));
  EXPECT_EQ(complaints(), Lines{"error: [ERROR] can't evict item at url: " + broken.description()});
}

TEST_F(StopProviding, aDocumentThatAMoveNeedsIsLeftAlone) {
  const NSURL url = at("a");
  const std::string identifier = daemon.identifier("a").asString();
  const Once<NSError> done("completion");
  start(url, done);
  extension->_beginForcedDownload(identifier);
  extension->stopProvidingItemAtURL(url);
  EXPECT_EQ(complaints(), Lines{"default: [WARNING] Can't cancel download of " + url.path() +
                                " which is downloading for CZM"});
  EXPECT_EQ(evictions(), 0U);
  EXPECT_TRUE(daemon.isDownloading("a"));
  extension->_endForcedDownload(identifier);
  extension->stopProvidingItemAtURL(url);
  EXPECT_TRUE(done.value<0>().is(QVTessalyErrorDomain, QVErrorCancelled));
}

TEST_F(StopProviding, whatIsInsideAFolderThatAMoveNeedsIsLeftAlone) {
  const std::string folder = daemon.addFolder("f").asString();
  daemon.addFolder("f/g");
  daemon.addDocument("f/g/b");
  clear();
  extension->_beginForcedDownload(folder);
  extension->stopProvidingItemAtURL(at("f/g/b"));
  EXPECT_EQ(complaints(), Lines{"default: [WARNING] Can't cancel download of " + at("f/g/b").path() +
                                " which is inside a folder downloading for CZM"});
  EXPECT_EQ(evictions(), 0U);
  // The folder itself isn't inside.
  extension->stopProvidingItemAtURL(at("f"));
  EXPECT_EQ(evictions(), 1U);
}

TEST_F(StopProviding, otherForcedItemsAreNoHindrance) {
  daemon.addDocument("b");
  const std::string folder = daemon.addFolder("f").asString();
  const std::string gone = daemon.addDocument("gone").asString();
  daemon.remove("gone");
  clear();
  for (const std::string &identifier :
       {std::string("no identifier"), gone, folder, daemon.identifier("a").asString()})
    extension->_beginForcedDownload(identifier);
  extension->stopProvidingItemAtURL(at("b"));
  EXPECT_EQ(evictions(), 1U);
}

TEST_F(StopProviding, theFirstForcedItemInTheListIsTheOneThatIsTold) {
  const std::string folder = daemon.addFolder("f").asString();
  const std::string document = daemon.addDocument("f/b").asString();
  clear();
  extension->_beginForcedDownload(document);
  extension->_beginForcedDownload(folder);
  extension->stopProvidingItemAtURL(at("f/b"));
  EXPECT_EQ(complaints(), Lines{"default: [WARNING] Can't cancel download of " + at("f/b").path() +
                                " which is downloading for CZM"});
}

TEST_F(StopProviding, anItemThatIsForcedTwiceStaysForcedUntilBothMovesHaveEnded) {
  const std::string identifier = daemon.identifier("a").asString();
  extension->_beginForcedDownload(identifier);
  extension->_beginForcedDownload(identifier);
  extension->_endForcedDownload(identifier);
  extension->stopProvidingItemAtURL(at("a"));
  EXPECT_EQ(evictions(), 0U);
  extension->_endForcedDownload(identifier);
  extension->_endForcedDownload(identifier);
  extension->stopProvidingItemAtURL(at("a"));
  EXPECT_EQ(evictions(), 1U);
}

TEST_F(StopProviding, startsAndStopsFromManyThreadsCompleteEachOnce) {
  daemon.replies().answerOnAnotherThread(true);
  constexpr int kThreads = 4;
  constexpr int kRounds = 50;
  std::vector<std::thread> threads;
  for (int thread = 0; thread < kThreads; ++thread)
    threads.emplace_back([&, url = at("t" + std::to_string(thread))] {
      for (int round = 0; round < kRounds; ++round) {
        const Once<NSError> done("completion");
        extension->startProvidingItemAtURL(url, done.completion());
        extension->stopProvidingItemAtURL(url);
        EXPECT_TRUE(done.wait());
      }
    });
  for (std::thread &thread : threads) thread.join();
  EXPECT_EQ(faults(), Lines{});
}

}  // namespace
}  // namespace droxa
