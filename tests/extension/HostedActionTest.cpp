#include "extension/HostedAction.h"
#include "extension/HostedExtension.h"
#include "platform/fileprovider/xpc/FileProviderInterfaces.h"
#include "tessaly/QVErrors.h"
#include "tests/extension/ActionFixture.h"
#include "tests/extension/ScriptedPrincipal.h"
#include "tests/xpc/ConnectedPair.h"

namespace droxa {
namespace {

using Kind = FPDActionRequest::Kind;

FPDActionRequest requestOf(Kind kind) {
  FPDActionRequest request;
  request.kind = kind;
  request.identifier = "d1";
  request.parentIdentifier = "i2";
  request.name = "b";
  request.url = NSURL::fileURLWithPath("/home/a");
  return request;
}

std::shared_ptr<const NSFileProviderItem> itemNamed(const std::string &name) {
  NSFileProviderItemFields fields;
  fields.filename = name;
  return std::make_shared<NSFileProviderPlainItem>(fields);
}

class HostedActionTest : public testing::Test {
 protected:
  std::shared_ptr<HostedAction> make(const FPDActionRequest &request) {
    return std::make_shared<HostedAction>(principal, request);
  }
  const std::shared_ptr<ScriptedPrincipal> principal = std::make_shared<ScriptedPrincipal>();
  OSLogCapture capture;
};

TEST_F(HostedActionTest, eachKindIsTheOperationOfThatName) {
  FPDActionRequest date = requestOf(Kind::setLastUsedDate), tags = requestOf(Kind::setTagData),
                   rank = requestOf(Kind::setFavoriteRank), home = requestOf(Kind::untrash),
                   move = requestOf(Kind::reparent);
  date.date = NSDate::dateWithNanosecondsSince1970(0);
  tags.tagData = NSData::dataWithString("abc");
  rank.favoriteRank = 7;
  home.parentIdentifier.reset();
  move.name.reset();
  const std::vector<std::pair<FPDActionRequest, std::string>> kinds{
      {requestOf(Kind::importDocument), "import /home/a to i2"},
      {requestOf(Kind::createDirectory), "create b in i2"},
      {requestOf(Kind::rename), "rename d1 to b"},
      {requestOf(Kind::reparent), "reparent d1 to i2 as b"},
      {move, "reparent d1 to i2 as nil"},
      {requestOf(Kind::trash), "trash d1"},
      {requestOf(Kind::untrash), "untrash d1 to i2"},
      {home, "untrash d1 to nil"},
      {requestOf(Kind::deleteItem), "delete d1"},
      {date, "used " + date.date.description() + " d1"},
      {requestOf(Kind::setLastUsedDate), "used (null) d1"},
      {tags, "tags 3 d1"},
      {requestOf(Kind::setTagData), "tags 0 d1"},
      {rank, "rank 7 d1"},
      {requestOf(Kind::setFavoriteRank), "rank nil d1"}};
  for (const auto &[request, what] : kinds) {
    principal->log.clear();
    const auto action = make(request);
    const ItemAnswer end(what);
    action->waitWithReply(end.completion());
    EXPECT_EQ(principal->log.calls(), Lines{what});
    principal->takeAction().completion(nullptr, NSError());
    EXPECT_EQ(end.value<1>(), NSError());
  }
}

TEST_F(HostedActionTest, beginsWhenItIsFirstWaitedForAndOnce) {
  const auto action = make(requestOf(Kind::rename));
  EXPECT_EQ(principal->log.calls(), Lines{});
  const ItemAnswer first("first"), second("second"), later("later");
  action->waitWithReply(first.completion());
  action->waitWithReply(second.completion());
  EXPECT_EQ(principal->log.calls(), Lines{"rename d1 to b"});
  const auto item = itemNamed("b");
  principal->takeAction().completion(item, NSError());
  action->waitWithReply(later.completion());
  for (const ItemAnswer *answer : {&first, &second, &later}) EXPECT_EQ(answer->value<0>(), item);
}

TEST_F(HostedActionTest, runsUnderAProgressOfItsOwn) {
  const auto action = make(requestOf(Kind::importDocument));
  const Once<std::int64_t, std::int64_t> before("before"), during("during");
  action->getProgress(before.completion());
  EXPECT_EQ(before.values(), (std::tuple<std::int64_t, std::int64_t>(0, -1)));
  const ItemAnswer end("end");
  action->waitWithReply(end.completion());
  const auto asked = principal->takeAction();
  ASSERT_TRUE(asked.progress);
  EXPECT_FALSE(NSProgress::currentProgress());
  asked.progress->setTotalUnitCount(10);
  asked.progress->setCompletedUnitCount(4);
  action->getProgress(during.completion());
  EXPECT_EQ(during.values(), (std::tuple<std::int64_t, std::int64_t>(4, 10)));
  asked.completion(nullptr, NSError());
}

TEST_F(HostedActionTest, cancellingCancelsTheProgressAndTheAnswerIsThePrincipals) {
  const auto action = make(requestOf(Kind::importDocument));
  const ItemAnswer end("end");
  action->waitWithReply(end.completion());
  const auto asked = principal->takeAction();
  action->cancel();
  EXPECT_TRUE(asked.progress->isCancelled());
  EXPECT_FALSE(end.called());
  asked.completion(itemNamed("a"), NSError());  // it was too late
  EXPECT_TRUE(end.value<0>());
}

TEST_F(HostedActionTest, aDownloadThatWasCancelledIsACancelledAction) {
  const NSError cancelled(QVTessalyErrorDomain, QVErrorCancelled);
  for (const bool isCancelled : {false, true}) {
    const auto action = make(requestOf(Kind::reparent));
    const ItemAnswer end("end");
    action->waitWithReply(end.completion());
    if (isCancelled) action->cancel();
    principal->takeAction().completion(nullptr, cancelled);
    EXPECT_EQ(end.value<1>().is(NSCocoaErrorDomain, NSUserCancelledError), isCancelled);
    EXPECT_EQ(isCancelled ? end.value<1>().underlyingError() : end.value<1>(), cancelled);
  }
}

TEST_F(HostedActionTest, thatIsCancelledBeforeItBeginsIsNeverMade) {
  const auto action = make(requestOf(Kind::trash));
  action->cancel();
  const ItemAnswer end("end");
  action->waitWithReply(end.completion());
  EXPECT_TRUE(end.value<1>().is(NSCocoaErrorDomain, NSUserCancelledError));
  EXPECT_EQ(principal->log.calls(), Lines{});
}

TEST_F(HostedActionTest, aReleaseBeforeItsEndCancels) {
  auto action = make(requestOf(Kind::importDocument));
  const ItemAnswer end("end");
  action->waitWithReply(end.completion());
  const auto asked = principal->takeAction();
  action.reset();
  EXPECT_TRUE(asked.progress->isCancelled());
  asked.completion(nullptr, NSError(NSCocoaErrorDomain, NSUserCancelledError));
  EXPECT_TRUE(end.wait());
}

TEST_F(HostedActionTest, aReleaseAfterItsEndCancelsNothing) {
  auto action = make(requestOf(Kind::importDocument));
  const ItemAnswer end("end");
  action->waitWithReply(end.completion());
  const auto asked = principal->takeAction();
  asked.completion(nullptr, NSError());
  action.reset();
  EXPECT_FALSE(asked.progress->isCancelled());
}

TEST_F(HostedActionTest, aSecondAnswerIsAFaultAndIsDropped) {
  const auto action = make(requestOf(Kind::rename));
  const ItemAnswer end("end");
  action->waitWithReply(end.completion());
  const auto asked = principal->takeAction();
  asked.completion(nullptr, NSError());
  asked.completion(nullptr, NSError::errorWithPOSIXCode(5));
  EXPECT_EQ(end.calls(), 1);
  EXPECT_EQ(end.value<1>(), NSError());
  EXPECT_TRUE(capture.contains("[CRIT] an action was completed again: " +
                               NSError::errorWithPOSIXCode(5).description()));
}

TEST_F(HostedActionTest, anAnswerThatIsDroppedIsAFaultAndAnError) {
  const auto action = make(requestOf(Kind::rename));
  const ItemAnswer end("end");
  action->waitWithReply(end.completion());
  principal->takeAction();
  EXPECT_TRUE(end.value<1>().is(NSCocoaErrorDomain, NSXPCConnectionReplyInvalid));
  EXPECT_TRUE(capture.contains("[CRIT] Assertion failed: answered (action)"));
}

TEST_F(HostedActionTest, aRequestThatMakesNoSenseIsToldAndNothingIsDone) {
  HostedExtension hosted(principal);
  FPDActionRequest noName = requestOf(Kind::rename);
  noName.name.reset();
  const Once<std::shared_ptr<FPDAction>, NSError> answer("action");
  hosted.performAction(noName, answer.completion());
  EXPECT_FALSE(answer.value<0>());
  EXPECT_TRUE(answer.value<1>().is(NSPOSIXErrorDomain, EINVAL));
  EXPECT_EQ(principal->log.calls(), Lines{});
}

// The extension as its host has it.
class ConnectedAction : public ActionTest {
 protected:
  ConnectedAction() {
    pair.serve<NSFileProviderExtensionProtocol>(NSFileProviderExtensionInterface(),
                                                std::make_shared<HostedExtension>(extension));
  }
  std::shared_ptr<FPDAction> perform(const FPDActionRequest &request) {
    const Once<std::shared_ptr<FPDAction>, NSError> answer("action");
    pair.client
        ->remoteObjectProxyWithErrorHandler<NSFileProviderExtensionProtocol>(
            [](const NSError &error) { ADD_FAILURE() << error.description(); })
        ->performAction(request, answer.completion());
    EXPECT_EQ(answer.value<1>(), NSError());
    return answer.value<0>();
  }
  FPDActionRequest renaming() const {
    FPDActionRequest request;
    request.kind = Kind::rename;
    request.identifier = document;
    request.name = "b.txt";
    return request;
  }
  ConnectedPair pair;
};

TEST_F(ConnectedAction, endsWithTheItem) {
  daemon.addDocument("b.txt", 9);
  operations.answer(at("b.txt"));
  const auto action = perform(renaming());
  const ItemAnswer end("end");
  action->waitWithReply(end.completion());
  ASSERT_TRUE(end.value<0>());
  EXPECT_EQ(end.value<0>()->fields(), daemon.item("b.txt")->fields());
}

TEST_F(ConnectedAction, endsWithTheErrorAndWhatIsInIt) {
  daemon.addDocument("b.txt", 9);
  operations.fail(collisionAt(at("b.txt")));
  const auto action = perform(renaming());
  const ItemAnswer end("end");
  action->waitWithReply(end.completion());
  const NSError error = end.value<1>();
  EXPECT_TRUE(error.is(NSFileProviderErrorDomain, NSFileProviderErrorFilenameCollision));
  EXPECT_TRUE(error.userInfo().contains(NSFileProviderErrorCollidingItemKey));
}

TEST_F(ConnectedAction, reportsItsProgressWhileItRuns) {
  operations.hold();
  operations.answer(NSURL(), fileError(NSFileWriteUnknownError));
  const auto action = perform(renaming());
  const ItemAnswer end("end");
  action->waitWithReply(end.completion());
  ASSERT_TRUE(operations.log().waitFor("renameWithNewName"));
  operations.progress()->setTotalUnitCount(8);
  operations.progress()->setCompletedUnitCount(5);
  const Once<std::int64_t, std::int64_t> told("progress");
  action->getProgress(told.completion());
  EXPECT_EQ(told.values(), (std::tuple<std::int64_t, std::int64_t>(5, 8)));
  operations.release();
  EXPECT_TRUE(end.value<1>());
}

TEST_F(ConnectedAction, aHostThatDiesCancelsIt) {
  operations.hold();
  operations.fail(NSError(NSCocoaErrorDomain, NSUserCancelledError));
  const auto action = perform(renaming());
  const ItemAnswer end("end");
  NSXPCProxyWithErrorHandler<FPDAction>(action, [answer = end.completion()](const NSError &error) {
    answer(nullptr, error);
  })->waitWithReply(end.completion());
  ASSERT_TRUE(operations.log().waitFor("renameWithNewName"));
  pair.client->invalidate();
  EXPECT_TRUE(end.wait());
  EXPECT_TRUE(eventually([&] { return operations.progress()->isCancelled(); }));
  operations.release();
}

TEST_F(ConnectedAction, aHostThatCancelsItLearnsOfTheEnd) {
  operations.hold();
  operations.fail(NSError(NSCocoaErrorDomain, NSUserCancelledError));
  const auto action = perform(renaming());
  const ItemAnswer end("end");
  action->waitWithReply(end.completion());
  ASSERT_TRUE(operations.log().waitFor("renameWithNewName"));
  action->cancel();
  EXPECT_TRUE(eventually([&] { return operations.progress()->isCancelled(); }));
  EXPECT_FALSE(end.called());
  operations.release();
  EXPECT_TRUE(end.value<1>().is(NSCocoaErrorDomain, NSUserCancelledError));
}

TEST_F(ConnectedAction, anActionThatNobodyWaitsForIsNeverMade) {
  perform(renaming()).reset();
  const auto other = perform(renaming());
  operations.fail(fileError(NSFileWriteUnknownError));
  const ItemAnswer end("end");
  other->waitWithReply(end.completion());
  EXPECT_TRUE(end.value<1>());
  EXPECT_EQ(operations.calls().size(), 1U);
}

}  // namespace
}  // namespace droxa
