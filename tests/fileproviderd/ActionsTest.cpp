#include <cerrno>
#include <gtest/gtest.h>

#include "fileproviderd/Actions.h"
#include "fileproviderd/HostServices.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/fileprovider/xpc/FileProviderInterfaces.h"
#include "tests/fileproviderd/ScriptedExtension.h"
#include "tests/support/Once.h"
#include "tests/xpc/ConnectedPair.h"

namespace droxa::testing {
namespace {

using ItemAnswer = Once<std::shared_ptr<const NSFileProviderItem>, NSError>;
using ActionAnswer = Once<std::shared_ptr<FPDAction>, NSError>;

FPDActionRequest renaming() {
  FPDActionRequest request;
  request.kind = FPDActionRequest::Kind::rename;
  request.identifier = "d1";
  request.name = "b";
  return request;
}

class ActionsTest : public ::testing::Test {
 protected:
  std::shared_ptr<FPDAction> perform(const FPDActionRequest &request) {
    const ActionAnswer answer("action");
    actions.perform(request, answer.completion());
    EXPECT_EQ(answer.value<1>(), NSError());
    return answer.value<0>();
  }
  ScriptedAction &extensions(std::size_t index) { return *extension->actions.at(index); }

  const std::shared_ptr<ScriptedExtension> extension = std::make_shared<ScriptedExtension>();
  const std::shared_ptr<ScriptedConnecting> connecting = std::make_shared<ScriptedConnecting>(extension);
  const std::shared_ptr<ExtensionCalls> calls = std::make_shared<ExtensionCalls>(connecting);
  const std::shared_ptr<FollowedContainers> followed = std::make_shared<FollowedContainers>(calls);
  const std::shared_ptr<OpenListings> listings = std::make_shared<OpenListings>();
  const Actions actions{calls, followed, listings};
};

TEST_F(ActionsTest, anActionBeginsWithItsFirstWaitAndEndsWithTheExtensions) {
  const auto action = perform(renaming());
  EXPECT_EQ(extension->asked.take(), "rename d1");
  EXPECT_EQ(extensions(0).waits, 0);
  const ItemAnswer first("first"), second("second"), later("later");
  action->waitWithReply(first.completion());
  action->waitWithReply(second.completion());
  EXPECT_EQ(extensions(0).waits, 1);
  const auto item = document(1, "b");
  extensions(0).end(item, NSError());
  action->waitWithReply(later.completion());
  for (const ItemAnswer *answer : {&first, &second, &later}) EXPECT_EQ(answer->value<0>(), item);
}

TEST_F(ActionsTest, theExtensionsErrorIsPassedOn) {
  const auto action = perform(renaming());
  const ItemAnswer end("end");
  action->waitWithReply(end.completion());
  extensions(0).end(nullptr, NSError::errorWithPOSIXCode(EIO));
  EXPECT_EQ(end.value<1>(), NSError::errorWithPOSIXCode(EIO));
}

TEST_F(ActionsTest, aRootThatIsntFoundIsADaemonThatDoesntTell) {
  const auto action = perform(renaming());
  const ItemAnswer end("end");
  action->waitWithReply(end.completion());
  extensions(0).end(
      nullptr, fileProviderErrorForNonExistentItemWithIdentifier(NSFileProviderRootContainerItemIdentifier));
  EXPECT_TRUE(end.value<1>().is(NSFileProviderErrorDomain, NSFileProviderErrorServerUnreachable));
}

TEST_F(ActionsTest, neitherItemNorErrorIsPassedOn) {
  const auto action = perform(renaming());
  const ItemAnswer end("end");
  action->waitWithReply(end.completion());
  extensions(0).end(nullptr, NSError());
  EXPECT_EQ(end.value<1>(), NSError());
}

TEST_F(ActionsTest, aRequestThatMakesNoSenseNeverReachesTheExtension) {
  FPDActionRequest nameless = renaming();
  nameless.name.reset();
  const ActionAnswer answer("action");
  actions.perform(nameless, answer.completion());
  EXPECT_FALSE(answer.value<0>());
  EXPECT_TRUE(answer.value<1>().is(NSPOSIXErrorDomain, EINVAL));
  EXPECT_TRUE(extension->actions.empty());
}

TEST_F(ActionsTest, anExtensionThatEndsBeforeItGaveTheActionIsAskedAnew) {
  connecting->transportFailures = 1;
  const auto action = perform(renaming());
  ASSERT_TRUE(action);
  EXPECT_EQ(extension->actions.size(), 1U);
}

TEST_F(ActionsTest, anExtensionThatCantBeStartedIsTheError) {
  connecting->startFailure = NSError(NSFileProviderErrorDomain, NSFileProviderErrorServerUnreachable);
  const ActionAnswer answer("action");
  actions.perform(renaming(), answer.completion());
  EXPECT_FALSE(answer.value<0>());
  EXPECT_EQ(answer.value<1>(), connecting->startFailure);
}

TEST_F(ActionsTest, anExtensionThatEndsInTheMiddleEndsTheActionOnceAndItIsntMadeAgain) {
  const auto action = perform(renaming());
  const ItemAnswer end("end"), later("later");
  action->waitWithReply(end.completion());
  extensions(0).cutOff(connectionInterrupted());
  const NSError error = end.value<1>();
  EXPECT_TRUE(error.is(NSFileProviderErrorDomain, NSFileProviderErrorServerUnreachable));
  EXPECT_EQ(error.localizedDescription(),
            "nobody knows whether this was done: the extension ended before it answered: exit status 1");
  EXPECT_EQ(error.underlyingError(), connectionInterrupted());
  EXPECT_EQ(extension->actions.size(), 1U);
  action->waitWithReply(later.completion());
  EXPECT_EQ(later.value<1>(), error);
}

TEST_F(ActionsTest, theProgressIsTheExtensions) {
  const auto action = perform(renaming());
  const Once<std::int64_t, std::int64_t> told("progress");
  action->getProgress(told.completion());
  EXPECT_EQ(told.values(), (std::tuple<std::int64_t, std::int64_t>(3, 7)));
}

TEST_F(ActionsTest, cancellingIsPassedOnAndTheEndIsTheExtensions) {
  const auto action = perform(renaming());
  const ItemAnswer end("end");
  action->waitWithReply(end.completion());
  action->cancel();
  EXPECT_EQ(extensions(0).cancels, 1);
  EXPECT_FALSE(end.called());
  extensions(0).end(document(1, "b"), NSError());  // it was too late
  EXPECT_TRUE(end.value<0>());
  action->cancel();
  EXPECT_EQ(extensions(0).cancels, 1);
}

TEST_F(ActionsTest, aReleaseBeforeTheEndCancelsAndWhoWaitsIsStillAnswered) {
  auto action = perform(renaming());
  const ItemAnswer end("end");
  action->waitWithReply(end.completion());
  action.reset();
  EXPECT_EQ(extensions(0).cancels, 1);
  extensions(0).end(nullptr, NSError(NSCocoaErrorDomain, NSUserCancelledError));
  EXPECT_TRUE(end.value<1>());
}

TEST_F(ActionsTest, aReleaseAfterTheEndCancelsNothing) {
  auto action = perform(renaming());
  const ItemAnswer end("end");
  action->waitWithReply(end.completion());
  extensions(0).end(document(1, "b"), NSError());
  action.reset();
  EXPECT_EQ(extensions(0).cancels, 0);
}

// A client's listing, the containers that are watched and the action, in one host.
class ActionsOfHost : public ActionsTest {
 protected:
  const std::shared_ptr<ControlService> control =
      std::make_shared<ControlService>(calls, followed, listings, "/r", [] { return FPDStatus(); });
};

TEST_F(ActionsOfHost, aListingForgetsThePageThatItAskedForAhead) {
  std::shared_ptr<NSFileProviderRemoteEnumerator> listing;
  control->enumeratorForContainer("i1",
                                  [&](const auto &enumerator, const NSError &) { listing = enumerator; });
  const auto asked = extension->enumerators.take();
  std::vector<std::size_t> pages;
  const auto ask = [&](const std::string &page) {
    listing->enumerateItems(
        NSData::dataWithString(page),
        [&](const auto &items, const NSData &, const NSError &) { pages.push_back(items.size()); });
  };
  ask("p");
  asked->answerPage("p", {}, "q");
  asked->answerPage("q", {document(1, "old")});
  const auto action = perform(renaming());
  const ItemAnswer end("end");
  action->waitWithReply(end.completion());
  extensions(0).end(document(1, "new"), NSError());
  EXPECT_TRUE(end.wait());
  ask("q");
  asked->answerPage("q", {document(1, "new"), document(2, "newer")});
  EXPECT_EQ(pages, (std::vector<std::size_t>{0, 2}));
}

TEST_F(ActionsOfHost, theWatchersOfTheItemsFolderLearnOfItWithoutASignal) {
  const auto observer = std::make_shared<RecordingObserver>();
  std::shared_ptr<FPDWatch> watch;
  control->watchContainer("i1", observer, [&](const auto &given, const NSError &) { watch = given; });
  const auto enumerator = extension->enumerators.take();
  ASSERT_TRUE(enumerator);
  enumerator->answerFirstListing({document(1, "a")});
  const auto action = perform(renaming());
  const ItemAnswer end("end");
  action->waitWithReply(end.completion());
  extensions(0).end(document(1, "b", 2, "i1"), NSError());
  enumerator->answerChanges("A", {document(1, "b", 2)}, {}, "B");
  EXPECT_EQ(observer->next(), "renamed a -> b");
}

class ConnectedActions : public ActionsOfHost {
 protected:
  ConnectedActions() { pair.serve<FPDControlProtocol>(FPDControlInterface(), control); }
  std::shared_ptr<FPDAction> performOverConnection(const FPDActionRequest &request) {
    const ActionAnswer answer("action");
    pair.client->remoteObjectProxyWithErrorHandler<FPDControlProtocol>(nullptr)->performAction(
        request, answer.completion());
    return answer.value<0>();
  }
  ConnectedPair pair;
};

TEST_F(ConnectedActions, aClientThatDiesCancelsItsAction) {
  const auto action = performOverConnection(renaming());
  const ItemAnswer end("end");
  NSXPCProxyWithErrorHandler<FPDAction>(action, [answer = end.completion()](const NSError &error) {
    answer(nullptr, error);
  })->waitWithReply(end.completion());
  ASSERT_TRUE(eventually([this] { return extensions(0).waits == 1; }));
  pair.client->invalidate();
  EXPECT_TRUE(eventually([this] { return extensions(0).cancels == 1; }));
  extensions(0).end(nullptr, NSError(NSCocoaErrorDomain, NSUserCancelledError));
}

TEST_F(ConnectedActions, everyFieldOfARequestArrives) {
  FPDActionRequest full;
  full.kind = FPDActionRequest::Kind::setFavoriteRank;
  full.identifier = std::string("d\xff", 2);
  full.parentIdentifier = "";
  full.name = "";
  full.url = NSURL::fileURLWithPath("/a b");
  full.date = NSDate::dateWithNanosecondsSince1970(0);
  full.tagData = NSData::dataWithString("x");
  full.favoriteRank = ~std::uint64_t{0};
  FPDActionRequest sparse;
  sparse.kind = FPDActionRequest::Kind::deleteItem;
  sparse.identifier = "d1";
  for (const FPDActionRequest &request : {full, sparse}) {
    ASSERT_TRUE(performOverConnection(request));
    EXPECT_EQ(extension->requests.back(), request);
  }
}

TEST_F(ConnectedActions, aKindThatThereIsntIsAnErrorForTheClientAlone) {
  FPDActionRequest request = renaming();
  request.kind = static_cast<FPDActionRequest::Kind>(200);
  const ActionAnswer answer("action");
  pair.client->remoteObjectProxyWithErrorHandler<FPDControlProtocol>(nullptr)->performAction(
      request, answer.completion());
  EXPECT_FALSE(answer.value<0>());
  EXPECT_EQ(answer.value<1>().localizedDescription(), "unknown action 200");
  EXPECT_TRUE(performOverConnection(renaming()));
}

}  // namespace
}  // namespace droxa::testing
