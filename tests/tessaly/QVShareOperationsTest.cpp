#include <gtest/gtest.h>
#include <memory>

#include "tessaly/QVErrors.h"
#include "tessaly/QVShareOperations.h"
#include "tests/support/FakeDaemonConnection.h"
#include "tests/support/Once.h"
#include "tests/support/RecordingOperation.h"
#include "tests/support/ScratchHome.h"
#include "tests/support/ShareCalls.h"

namespace droxa {
namespace {

using Lines = std::vector<std::string>;

const NSError kBroken(NSCocoaErrorDomain, NSXPCConnectionInterrupted);
const NSURL kURL = NSURL::fileURLWithPath("/replica/a");

// One of the operations, its completion's values as the fake daemon's answers.
struct Made {
  std::shared_ptr<NSOperation> operation;
  std::shared_ptr<QVOperationClient> client;
  std::function<void(std::function<void(const FakeSharing::Answers &, const NSError &)>)> setCompletion;
};

struct Kind {
  const char *name;
  const char *call;  // the daemon's
  std::string arguments;
  Made (*make)();
  // What is left of the daemon's answers.
  FakeSharing::Answers (*expected)(const FakeSharing::Answers &all);
};

template <class Operation, class Set>
Made made(const std::shared_ptr<Operation> &operation, Set set) {
  return {operation, operation, [operation, set](auto completed) { set(*operation, completed); }};
}

FakeSharing::Answers shareOnly(const FakeSharing::Answers &all) {
  FakeSharing::Answers some;
  some.share = all.share;
  return some;
}

FakeSharing::Answers shareAndURL(const FakeSharing::Answers &all) {
  FakeSharing::Answers some = shareOnly(all);
  some.url = all.url;
  return some;
}

FakeSharing::Answers tokens(const FakeSharing::Answers &all) {
  FakeSharing::Answers some;
  some.first = all.first;
  some.second = all.second;
  return some;
}

Made makeCopy() {
  return made(QVShareCopyOperation::initWithURL(kURL), [](auto &operation, auto completed) {
    operation.setRootShareCopyCompletionBlock(
        [completed](const auto &share, const NSURL &url, const NSError &error) {
          FakeSharing::Answers answers;
          answers.share = share;
          answers.url = url;
          completed(answers, error);
        });
  });
}

Made makeSave() {
  return made(QVShareSaveOperation::initWithShare(wholeShare(), NSURL()),
              [](auto &operation, auto completed) {
                operation.setShareSaveCompletionBlock([completed](const auto &share, const NSError &error) {
                  FakeSharing::Answers answers;
                  answers.share = share;
                  completed(answers, error);
                });
              });
}

Made makeDestroy() {
  return made(
      QVShareDestroyOperation::initWithShare(wholeShare(), NSURL()), [](auto &operation, auto completed) {
        operation.setShareDestroyCompletionBlock([completed](const NSError &error) { completed({}, error); });
      });
}

Made makeToken() {
  return made(QVSharingCopyShareTokenOperation::initWithURL(kURL), [](auto &operation, auto completed) {
    operation.setShareAndBaseTokenCompletionBlock(
        [completed](const auto &first, const auto &second, const NSError &error) {
          FakeSharing::Answers answers;
          answers.first = first;
          answers.second = second;
          completed(answers, error);
        });
  });
}

void PrintTo(const Kind &kind, std::ostream *stream) {
  *stream << kind.name;
}

std::vector<Kind> kinds() {
  const std::string share = wholeShare().description();
  return {{"copy", "startOperation_toCopySharingInfoAtURL", "file:///replica/a", makeCopy, shareAndURL},
          {"save", "startOperation_toSaveSharingInfo", share, makeSave, shareOnly},
          {"destroy", "startOperation_toUnshareShare", share + ", no", makeDestroy,
           [](const FakeSharing::Answers &) { return FakeSharing::Answers(); }},
          {"token", "startOperation_toCopyParticipantTokenAtURL", "file:///replica/a", makeToken, tokens}};
}

class ShareOperation : public testing::TestWithParam<Kind> {
 protected:
  ShareOperation() { daemon_.sharing().setAnswers(wholeAnswers()); }
  ~ShareOperation() override {
    EXPECT_TRUE(eventually([this] { return queue_.operationCount() == 0; }));
    EXPECT_EQ(done_.calls(), 1);
  }
  void setCompletion() { made_.setCompletion(done_.completion()); }
  void add() { queue_.addOperation(made_.operation); }
  // Added, and with the daemon, which doesn't answer.
  void addAndHold() {
    setCompletion();
    daemon_.replies().hold(kind_.call);
    add();
    ASSERT_TRUE(eventually([this] { return daemon_.replies().heldCount(kind_.call) == 1; }));
  }
  void expectCancelled() const {
    EXPECT_TRUE(done_.value<1>().is(QVTessalyErrorDomain, QVErrorCancelled))
        << done_.value<1>().description();
    EXPECT_TRUE(sameAnswers(done_.value<0>(), {}));
  }

  const Kind kind_ = GetParam();
  const ScratchHome home_;
  FakeDaemonScope fake_;
  FakeDaemon &daemon_ = *fake_.daemon;
  NSOperationQueue queue_;
  const Made made_ = kind_.make();
  const Once<FakeSharing::Answers, NSError> done_{"completion"};
};

TEST_P(ShareOperation, endsWithWhatTheDaemonAnswers) {
  setCompletion();
  add();
  EXPECT_EQ(done_.value<1>(), NSError());
  EXPECT_TRUE(sameAnswers(done_.value<0>(), kind_.expected(wholeAnswers())));
  EXPECT_EQ(daemon_.calls(), Lines{std::string(kind_.call) + "(" + kind_.arguments + ")"});
  EXPECT_EQ(daemon_.sharing().lastOperation(), made_.client) << "it is its call's own client";
  made_.operation->waitUntilFinished();
}

TEST_P(ShareOperation, anErrorOfTheDaemonIsItsOwn) {
  const NSError failure("Domain", 7, {{NSLocalizedDescriptionKey, std::string("no")}});
  daemon_.replies().failNext(kind_.call, failure);
  setCompletion();
  add();
  EXPECT_TRUE(done_.value<1>().isSameObject(failure));
}

TEST_P(ShareOperation, aDaemonThatIsNotThereIsTheConnectionsError) {
  fake_.connection->setUnreachable(kBroken);
  setCompletion();
  add();
  EXPECT_EQ(done_.value<1>(), kBroken);
  EXPECT_TRUE(sameAnswers(done_.value<0>(), {}));
}

TEST_P(ShareOperation, aDaemonThatGoesMeanwhileIsTheConnectionsError) {
  addAndHold();
  EXPECT_FALSE(made_.operation->isFinished());
  fake_.connection->loseDaemon(kBroken);
  EXPECT_EQ(done_.value<1>(), kBroken);
  daemon_.replies().release(kind_.call);
}

TEST_P(ShareOperation, cancelledBeforeItIsAddedTheDaemonIsNeverAsked) {
  setCompletion();
  made_.operation->cancel();
  expectCancelled();
  add();
  made_.operation->waitUntilFinished();
  EXPECT_EQ(daemon_.calls(), Lines());
}

TEST_P(ShareOperation, cancelledItTellsTheDaemonAndDoesntWaitForIt) {
  addAndHold();
  const auto remote = std::make_shared<RecordingCancellable>();
  made_.client->setRemoteOperationProxy(remote, {});
  made_.operation->cancel();
  made_.operation->cancel();
  expectCancelled();
  EXPECT_TRUE(remote->log.waitFor("invalidate"));
  daemon_.replies().release(kind_.call);  // too late
  EXPECT_EQ(remote->log.calls(), Lines{"invalidate"});
}

TEST_P(ShareOperation, whatTheDaemonHandsOverAfterTheCancelIsCancelledToo) {
  addAndHold();
  made_.operation->cancel();
  expectCancelled();
  const auto remote = std::make_shared<RecordingCancellable>();
  made_.client->setRemoteOperationProxy(remote, {});
  EXPECT_EQ(remote->log.calls(), Lines{"invalidate"});
  made_.client->setRemoteOperationProxy(nullptr, {});
  daemon_.replies().release(kind_.call);
}

TEST_P(ShareOperation, theDaemonCancelsItToo) {
  addAndHold();
  made_.client->progressCallbackWithTopic("topic", {});
  made_.client->invalidate();
  expectCancelled();
  daemon_.replies().release(kind_.call);
}

TEST_P(ShareOperation, aCancelAfterTheEndChangesNothing) {
  const auto remote = std::make_shared<RecordingCancellable>();
  addAndHold();
  made_.client->setRemoteOperationProxy(remote, {});
  daemon_.replies().release(kind_.call);
  EXPECT_EQ(done_.value<1>(), NSError());
  EXPECT_TRUE(eventually([&remote] { return remote.use_count() == 1; })) << "nothing is kept of the daemon";
  made_.operation->cancel();
  made_.operation->waitUntilFinished();
  EXPECT_EQ(remote->log.calls(), Lines());
}

TEST_P(ShareOperation, aCompletionThatIsSetAfterTheEndIsCalled) {
  made_.operation->cancel();
  setCompletion();
  expectCancelled();
}

TEST_P(ShareOperation, completesUnderAPersonaThatCantBeAdoptedAnyMore) {
  qvc_block_remember_persona = [](QVBlock) -> QVBlock { return [] {}; };  // as when the adoption fails
  setCompletion();
  qvc_block_remember_persona = nullptr;
  add();
  EXPECT_EQ(done_.value<1>(), NSError());
}

INSTANTIATE_TEST_SUITE_P(All, ShareOperation, testing::ValuesIn(kinds()),
                         [](const auto &each) { return std::string(each.param.name); });

TEST(ShareOperations, cancelledAtAnyMomentEachCompletesOnce) {
  const ScratchHome home;
  const FakeDaemonScope fake;
  fake.daemon->replies().answerOnAnotherThread(true);
  NSOperationQueue queue;
  for (int round = 0; round < 300; ++round) {
    const auto operation = QVShareSaveOperation::initWithShare(wholeShare(), NSURL());
    const Once<std::optional<CKShare>, NSError> done("completion");
    operation->setShareSaveCompletionBlock(done.completion());
    queue.addOperation(operation);
    if (round % 2 == 1) (void)fake.daemon->log().waitFor("startOperation_toSaveSharingInfo");
    operation->cancel();
    EXPECT_TRUE(done.wait());
    operation->waitUntilFinished();
    fake.daemon->log().clear();
    fake.daemon->sharing().forgetOperations();
  }
}

class ShareURLOperation : public testing::Test {
 protected:
  ShareURLOperation() {
    daemon_.sharing().setAnswers(wholeAnswers());
    operation_->setCopyShareURLCompletionBlock(done_.completion());
  }
  const ScratchHome home_;
  FakeDaemonScope fake_;
  FakeDaemon &daemon_ = *fake_.daemon;
  NSOperationQueue queue_;
  const std::shared_ptr<QVShareCopyShareURLOperation> operation_ =
      QVShareCopyShareURLOperation::initWithFileURL(kURL, "text/plain");
  const Once<NSURL, NSError> done_{"completion"};
};

TEST_F(ShareURLOperation, asksForTheShareAndThenForItsURL) {
  queue_.addOperation(operation_);
  EXPECT_EQ(done_.value<1>(), NSError());
  EXPECT_EQ(done_.value<0>(), wholeAnswers().url);
  EXPECT_EQ(daemon_.calls(), (Lines{"startOperation_toCopySharingInfoAtURL(file:///replica/a)",
                                    "startOperation_toCopyShareURLForShare(" +
                                        wholeAnswers().share->description() + ", text/plain)"}));
}

TEST_F(ShareURLOperation, withoutAShareThereIsNoURL) {
  const NSError none = qvc_error(QVErrorNoShare, "none");
  daemon_.replies().failNext("startOperation_toCopySharingInfoAtURL", none);
  queue_.addOperation(operation_);
  EXPECT_EQ(done_.value<1>(), none);
  EXPECT_FALSE(done_.value<0>());
  EXPECT_EQ(daemon_.calls().size(), 1U);
}

TEST_F(ShareURLOperation, theSecondQuestionsErrorIsItsOwn) {
  const NSError failure("Domain", 7);
  daemon_.replies().failNext("startOperation_toCopyShareURLForShare", failure);
  queue_.addOperation(operation_);
  EXPECT_EQ(done_.value<1>(), failure);
}

TEST_F(ShareURLOperation, cancelledBetweenTheTwoQuestionsItAsksNoMore) {
  daemon_.replies().hold("startOperation_toCopySharingInfoAtURL");
  queue_.addOperation(operation_);
  ASSERT_TRUE(
      eventually([&] { return daemon_.replies().heldCount("startOperation_toCopySharingInfoAtURL") == 1; }));
  operation_->cancel();
  EXPECT_TRUE(done_.value<1>().is(QVTessalyErrorDomain, QVErrorCancelled));
  daemon_.replies().release("startOperation_toCopySharingInfoAtURL");
  operation_->waitUntilFinished();
  EXPECT_EQ(daemon_.calls().size(), 1U);
}

TEST(SharingCreateShare, isTheDaemonsAnswer) {
  const ScratchHome home;
  const FakeDaemonScope fake;
  fake.daemon->sharing().setAnswers(wholeAnswers());
  NSError error;
  EXPECT_EQ(QVSharingCreateShareForItemAtURL(kURL, &error), wholeAnswers().share);
  EXPECT_FALSE(error);
  EXPECT_EQ(fake.daemon->calls(), Lines{"createSharingInfoForURL(file:///replica/a)"});
  fake.connection->setUnreachable(kBroken);
  EXPECT_FALSE(QVSharingCreateShareForItemAtURL(kURL, &error));
  EXPECT_EQ(error, kBroken);
  EXPECT_FALSE(QVSharingCreateShareForItemAtURL(kURL, nullptr));
}

}  // namespace
}  // namespace droxa
