#include <gtest/gtest.h>

#include "fileproviderd/HostServices.h"
#include "fileproviderd/OpenListings.h"
#include "fileproviderd/Providings.h"
#include "platform/fileprovider/xpc/FileProviderInterfaces.h"
#include "tests/fileproviderd/ScriptedExtension.h"
#include "tests/support/Once.h"
#include "tests/xpc/ConnectedPair.h"

namespace droxa::testing {
namespace {

const NSError kOffline(NSFileProviderErrorDomain, NSFileProviderErrorServerUnreachable);

class ProvidingsTest : public ::testing::Test {
 protected:
  ~ProvidingsTest() override {
    for (const auto &providing : extension->providings) providing->drop();
  }
  std::shared_ptr<FPDProviding> start(std::uint64_t options = 0) { return providings->start(url, options); }
  static bool isCancelled(const NSError &error) { return error.is(NSCocoaErrorDomain, NSUserCancelledError); }
  ScriptedProviding &extensions(std::size_t index) { return *extension->providings.at(index); }

  const NSURL url = NSURL::fileURLWithPath("/r/a.txt");
  const std::shared_ptr<ScriptedExtension> extension = std::make_shared<ScriptedExtension>();
  const std::shared_ptr<ScriptedConnecting> connecting = std::make_shared<ScriptedConnecting>(extension);
  const std::shared_ptr<ExtensionCalls> calls = std::make_shared<ExtensionCalls>(connecting);
  const std::shared_ptr<Providings> providings = std::make_shared<Providings>(calls);
};

TEST_F(ProvidingsTest, aProvidingEndsWithTheExtensions) {
  for (const NSError &outcome : {NSError(), kOffline}) {
    const auto providing = start(5);
    EXPECT_EQ(extension->asked.take(), "start /r/a.txt, 5");
    const Once<NSError> end("end"), later("later");
    providing->waitWithReply(end.completion());
    EXPECT_FALSE(end.called());
    extension->providings.back()->end(outcome);
    EXPECT_EQ(end.value<0>(), outcome);
    providing->waitWithReply(later.completion());
    EXPECT_EQ(later.value<0>(), outcome);
    EXPECT_EQ(providings->pathsUnderWay(), 0U);
  }
}

TEST_F(ProvidingsTest, clientsOfAPathShareOneOfTheExtension) {
  const auto first = start();
  const auto second = start();
  EXPECT_EQ(extension->providings.size(), 1U);
  const Once<NSError> firstEnd("first"), secondEnd("second");
  first->waitWithReply(firstEnd.completion());
  second->waitWithReply(secondEnd.completion());
  first->cancel();
  EXPECT_TRUE(isCancelled(firstEnd.value<0>()));
  EXPECT_EQ(extensions(0).cancels, 0);
  extensions(0).end({});
  EXPECT_EQ(secondEnd.value<0>(), NSError());
}

TEST_F(ProvidingsTest, theLastClientThatCancelsEndsIt) {
  const auto first = start();
  auto second = start();
  first->cancel();
  first->cancel();
  second.reset();
  EXPECT_EQ(extensions(0).cancels, 1);
  EXPECT_EQ(providings->pathsUnderWay(), 1U);
  extensions(0).end(NSError(NSPOSIXErrorDomain, ECANCELED));
  EXPECT_EQ(providings->pathsUnderWay(), 0U);
}

TEST_F(ProvidingsTest, aClientThatGoesIsToldWhatItWaitedFor) {
  auto providing = start();
  const Once<NSError> end("end");
  providing->waitWithReply(end.completion());
  providing.reset();
  EXPECT_TRUE(isCancelled(end.value<0>()));
  extensions(0).end({});
}

TEST_F(ProvidingsTest, nothingIsStoppedAfterTheEnd) {
  auto providing = start();
  extensions(0).end({});
  providing->cancel();
  providing.reset();
  EXPECT_EQ(extensions(0).cancels, 0);
  EXPECT_EQ(extension->asked.take(), "start /r/a.txt, 0");
  EXPECT_EQ(extension->asked.size(), 0U);
}

TEST_F(ProvidingsTest, whoComesAfterTheLastHasGoneGetsANewOneAfterItsEnd) {
  start()->cancel();
  const auto later = start(8);
  EXPECT_EQ(extension->providings.size(), 1U);
  const Once<NSError> end("end");
  later->waitWithReply(end.completion());
  extensions(0).end(NSError(NSPOSIXErrorDomain, ECANCELED));
  ASSERT_EQ(extension->providings.size(), 2U);
  EXPECT_FALSE(end.called());
  extensions(1).end({});
  EXPECT_EQ(end.value<0>(), NSError());
}

TEST_F(ProvidingsTest, anExtensionThatEndsInTheMiddleIsAskedOnceMore) {
  const auto providing = start();
  const Once<NSError> end("end");
  providing->waitWithReply(end.completion());
  extensions(0).cutOff(connectionInterrupted());
  ASSERT_EQ(extension->providings.size(), 2U);
  extensions(1).end({});
  EXPECT_EQ(end.value<0>(), NSError());
}

TEST_F(ProvidingsTest, aSecondEndInTheMiddleIsAnErrorThatMayBeTriedAgain) {
  const auto providing = start();
  const Once<NSError> end("end");
  providing->waitWithReply(end.completion());
  extensions(0).cutOff(connectionInterrupted());
  extensions(1).cutOff(connectionInterrupted());
  EXPECT_EQ(extension->providings.size(), 2U);
  EXPECT_TRUE(end.value<0>().is(NSFileProviderErrorDomain, NSFileProviderErrorServerUnreachable));
  EXPECT_EQ(end.value<0>().localizedDescription(), "the extension ended before it answered: exit status 1");
}

TEST_F(ProvidingsTest, theDaemonsEndThatTheExtensionTellsIsNotTheExtensions) {
  const auto providing = start();
  const Once<NSError> end("end");
  providing->waitWithReply(end.completion());
  extensions(0).end(connectionInterrupted());
  EXPECT_EQ(end.value<0>(), connectionInterrupted());
  EXPECT_EQ(extension->providings.size(), 1U);
}

TEST_F(ProvidingsTest, whatIsCancelledIsNotStartedAgain) {
  start()->cancel();
  extensions(0).cutOff(connectionInterrupted());
  EXPECT_EQ(extension->providings.size(), 1U);
  EXPECT_EQ(providings->pathsUnderWay(), 0U);
}

TEST_F(ProvidingsTest, anExtensionThatCantBeStartedIsTold) {
  connecting->startFailure = NSError::errorWithPOSIXCode(2, "can't start it");
  const auto providing = start();
  const Once<NSError> end("end");
  providing->waitWithReply(end.completion());
  EXPECT_EQ(end.value<0>().localizedDescription(), "can't start it");
}

TEST_F(ProvidingsTest, clientsAreGivenTheURLOfWhatTheyNamed) {
  extension->add("d1", "/r/a.txt", {});
  const auto control =
      std::make_shared<ControlService>(calls, std::make_shared<FollowedContainers>(calls),
                                       std::make_shared<OpenListings>(), "/r", [] { return FPDStatus(); });
  const Once<std::shared_ptr<FPDProviding>, NSURL, NSError> found("found"), missing("missing");
  control->startProvidingItemWithIdentifier("d1", 0x20000, found.completion());
  EXPECT_TRUE(found.value<0>());
  EXPECT_EQ(found.value<1>().path(), "/r/a.txt");
  EXPECT_EQ(found.value<2>(), NSError());
  control->startProvidingItemWithIdentifier("d2", 0, missing.completion());
  EXPECT_FALSE(missing.value<0>());
  EXPECT_TRUE(missing.value<2>().is(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem));
  const Once<NSError> stopped("stop");
  control->stopProvidingItemAtURL(url, stopped.completion());
  EXPECT_EQ(stopped.value<0>(), NSError());
  const Once<bool, NSError> moving("move");
  control->movingItemAtURL(url, NSURL::fileURLWithPath("/r/b"), moving.completion());
  EXPECT_TRUE(moving.value<0>());
  const Once<std::shared_ptr<FPDProviding>, NSURL, NSError> atPath("at a path that has nothing");
  control->startProvidingItemAtPath("/missing", 0, atPath.completion());
  EXPECT_FALSE(atPath.value<0>());
  EXPECT_TRUE(atPath.value<2>());
}

// A client in another process.
class ConnectedProvidingsTest : public ProvidingsTest {
 protected:
  ConnectedProvidingsTest() {
    extension->add("d1", "/r/a.txt", {});
    pair.serve<FPDControlProtocol>(
        FPDControlInterface(),
        std::make_shared<ControlService>(calls, std::make_shared<FollowedContainers>(calls),
                                         std::make_shared<OpenListings>(), "/r", [] { return FPDStatus(); }));
  }
  std::shared_ptr<FPDProviding> startOverConnection() {
    const Once<std::shared_ptr<FPDProviding>, NSURL, NSError> answer("providing");
    pair.client
        ->remoteObjectProxyWithErrorHandler<FPDControlProtocol>(
            [](const NSError &error) { ADD_FAILURE() << error.description(); })
        ->startProvidingItemWithIdentifier("d1", 1, answer.completion());
    EXPECT_EQ(answer.value<1>().path(), "/r/a.txt");
    return answer.value<0>();
  }
  ConnectedPair pair;
};

TEST_F(ConnectedProvidingsTest, aClientIsToldOfTheEnd) {
  const auto providing = startOverConnection();
  const Once<NSError> end("end");
  providing->waitWithReply(end.completion());
  extensions(0).end(kOffline);
  EXPECT_EQ(end.value<0>(), kOffline);
}

TEST_F(ConnectedProvidingsTest, aClientThatDiesEndsWhatItWanted) {
  const auto providing = startOverConnection();
  const Once<NSError> failure("error handler");
  NSXPCProxyWithErrorHandler<FPDProviding>(providing, failure.completion())
      ->waitWithReply([](const NSError &) { ADD_FAILURE() << "the reply ran"; });
  pair.client->invalidate();
  EXPECT_EQ(failure.value<0>().domain(), NSCocoaErrorDomain);
  EXPECT_TRUE(eventually([this] { return extensions(0).cancels == 1; }));
  extensions(0).end({});
}

TEST_F(ConnectedProvidingsTest, aClientThatLetsGoEndsWhatItWanted) {
  startOverConnection().reset();
  EXPECT_TRUE(eventually([this] { return extensions(0).cancels == 1; }));
  extensions(0).end({});
  EXPECT_EQ(extension->asked.take(), "url d1");
  EXPECT_EQ(extension->asked.take(), "start /r/a.txt, 1");
  EXPECT_EQ(extension->asked.size(), 0U);
}

TEST_F(ConnectedProvidingsTest, theOtherQuestionsCrossToo) {
  const auto control = pair.client->remoteObjectProxyWithErrorHandler<FPDControlProtocol>(nullptr);
  const Once<NSError> stopped("stop");
  control->stopProvidingItemAtURL(url, stopped.completion());
  EXPECT_EQ(stopped.value<0>(), NSError());
  const Once<bool, NSError> moving("move");
  control->movingItemAtURL(url, NSURL::fileURLWithPath("/r/b"), moving.completion());
  EXPECT_TRUE(moving.value<0>());
  const Once<std::shared_ptr<FPDProviding>, NSURL, NSError> missing("missing");
  control->startProvidingItemAtPath("/missing", 0, missing.completion());
  EXPECT_FALSE(missing.value<0>());
  EXPECT_TRUE(missing.value<2>());
}

}  // namespace
}  // namespace droxa::testing
