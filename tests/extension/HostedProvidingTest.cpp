#include "extension/HostedExtension.h"
#include "extension/HostedProviding.h"
#include "platform/fileprovider/xpc/FileProviderInterfaces.h"
#include "tests/extension/ProvidingFixture.h"
#include "tests/extension/ScriptedPrincipal.h"
#include "tests/xpc/ConnectedPair.h"

namespace droxa {
namespace {

const NSError kFailure = NSError::errorWithPOSIXCode(5);
const NSURL kURL = NSURL::fileURLWithPath("/replica/a");

class HostedProvidingTest : public testing::Test {
 protected:
  const std::shared_ptr<ScriptedPrincipal> principal = std::make_shared<ScriptedPrincipal>();
};

TEST_F(HostedProvidingTest, endsWithThePrincipalsAnswer) {
  const auto providing = HostedProviding::start(principal, kURL, 3);
  const Once<NSError> waited("waited"), later("later");
  providing->waitWithReply(waited.completion());
  principal->endStart(kFailure);
  providing->waitWithReply(later.completion());
  EXPECT_EQ(waited.value<0>(), kFailure);
  EXPECT_EQ(later.value<0>(), kFailure);
  EXPECT_EQ(principal->log.calls(), Lines{"start /replica/a, 3"});
}

TEST_F(HostedProvidingTest, isCancelledByItsCancelAndByItsRelease) {
  auto providing = HostedProviding::start(principal, kURL, 0);
  const Once<NSError> waited("waited");
  providing->waitWithReply(waited.completion());
  providing->cancel();
  EXPECT_FALSE(waited.called());  // the principal's answer is the end
  providing.reset();
  EXPECT_EQ(principal->log.count("cancel /replica/a"), 2U);
  principal->endStart(kFailure);
  EXPECT_EQ(waited.value<0>(), kFailure);
}

TEST_F(HostedProvidingTest, isNotCancelledAfterItsEnd) {
  auto providing = HostedProviding::start(principal, kURL, 0);
  principal->endStart({});
  providing->cancel();
  providing.reset();
  EXPECT_EQ(principal->log.calls(), Lines{"start /replica/a, 0"});
}

TEST_F(HostedProvidingTest, theHostsOtherQuestionsReachThePrincipal) {
  HostedExtension hosted(principal);
  const Once<NSError> stop("stop"), changed("changed"), placeholder("placeholder");
  const Once<bool, NSError> move("move");
  hosted.stopProvidingItemAtURL(kURL, stop.completion());
  hosted.itemChangedAtURL(kURL, changed.completion());
  hosted.providePlaceholderAtURL(kURL, placeholder.completion());
  hosted.movingItemAtURL(kURL, NSURL::fileURLWithPath("/replica/b"), move.completion());
  EXPECT_TRUE(move.value<0>());
  EXPECT_EQ(principal->log.calls(), (Lines{"stop /replica/a", "changed /replica/a", "placeholder /replica/a",
                                           "move /replica/a to /replica/b"}));
}

// The extension as its host has it.
class ConnectedProviding : public ProvidingTest {
 protected:
  ConnectedProviding() {
    pair_.serve<NSFileProviderExtensionProtocol>(NSFileProviderExtensionInterface(),
                                                 std::make_shared<HostedExtension>(extension));
  }
  std::shared_ptr<FPDProviding> startOverConnection(const NSURL &url) {
    Once<std::shared_ptr<FPDProviding>, NSError> answer("providing");
    pair_.client
        ->remoteObjectProxyWithErrorHandler<NSFileProviderExtensionProtocol>(
            [](const NSError &error) { ADD_FAILURE() << error.description(); })
        ->startProvidingItemAtURL(url, 0, answer.completion());
    EXPECT_TRUE(answer.value<0>());
    EXPECT_TRUE(daemon.log().waitFor("transfer 1: waitWithReply"));
    return answer.value<0>();
  }
  ConnectedPair pair_;
};

TEST_F(ConnectedProviding, endsWithTheDownload) {
  const auto providing = startOverConnection(at("a"));
  const Once<NSError> end("end");
  providing->waitWithReply(end.completion());
  daemon.finishDownload("a");
  EXPECT_EQ(end.value<0>(), NSError());
  EXPECT_EQ(daemon.log().count("evictItemAtURL"), 0U);
}

TEST_F(ConnectedProviding, aHostThatLetsGoCancelsTheDownloadAndEvictsNothing) {
  startOverConnection(at("a")).reset();
  EXPECT_TRUE(eventually([this] { return !daemon.isDownloading("a"); }));
  loggedUntil(closed(1));
  EXPECT_EQ(daemon.log().count("evictItemAtURL"), 0U);
}

TEST_F(ConnectedProviding, aHostThatDiesCancelsTheDownload) {
  const auto providing = startOverConnection(at("a"));
  pair_.client->invalidate();
  EXPECT_TRUE(eventually([this] { return !daemon.isDownloading("a"); }));
  loggedUntil(closed(1));
}

TEST_F(ConnectedProviding, aReleaseAfterTheEndEvictsNothing) {
  auto providing = startOverConnection(at("a"));
  const Once<NSError> end("end");
  providing->waitWithReply(end.completion());
  daemon.finishDownload("a");
  EXPECT_EQ(end.value<0>(), NSError());
  // The connection may end before the word of it is answered.
  NSXPCProxyWithErrorHandler<FPDProviding>(providing, [](const NSError &) {})->cancel();
  providing.reset();
  // Whatever that set going has been done when a later call is answered.
  Once<bool, NSError> later("move");
  pair_.client->remoteObjectProxyWithErrorHandler<NSFileProviderExtensionProtocol>(nullptr)->movingItemAtURL(
      at("a"), at("b"), later.completion());
  EXPECT_FALSE(later.value<0>());
  EXPECT_EQ(daemon.log().count("evictItemAtURL"), 0U);
  EXPECT_TRUE(daemon.item("a")->fields().isDownloaded);
}

TEST_F(ConnectedProviding, aDownloadThatAMoveNeedsIsNotCancelled) {
  const std::string identifier = daemon.identifier("a").asString();
  extension->_beginForcedDownload(identifier);
  auto providing = startOverConnection(at("a"));
  providing.reset();
  const std::string line =
      "[WARNING] Can't cancel download of " + at("a").path() + " which is downloading for CZM";
  ASSERT_TRUE(eventually([&] { return capture.contains(line); }));
  EXPECT_TRUE(daemon.isDownloading("a"));
  daemon.finishDownload("a");
  loggedUntil(closed(1));
}

}  // namespace
}  // namespace droxa
