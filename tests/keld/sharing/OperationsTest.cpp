// How operations run: refused, cancelled, out of time, answered once whatever ends first.

#include <atomic>
#include <future>

#include "keld/KeldListener.h"
#include "tessaly/QVDaemonConnectionOverXPC.h"
#include "tests/keld/sharing/SharingDrive.h"
#include "tests/support/ShareCalls.h"

namespace droxa::keld {
namespace {

class SharingOperations : public SharingDrive {
 protected:
  using SharingDrive::SharingDrive;
  // What each operation that needs something is told when it doesn't get it.
  void expectAll(const NSURL &asked, std::int64_t code) {
    EXPECT_TESSALY_ERROR(info(asked).error, code);
    EXPECT_TESSALY_ERROR(create(asked).error, code);
    EXPECT_TESSALY_ERROR(std::get<2>(access(asked, true)), code);
    EXPECT_TESSALY_ERROR(std::get<2>(tokens(asked)), code);
    EXPECT_TESSALY_ERROR(prepare(asked), code);
    EXPECT_TESSALY_ERROR(process(asked, 0, QVProcessCheckSubshares), code);
  }
};
class HungCloud : public SharingOperations {
 protected:
  HungCloud() : SharingOperations(ImpatientOptions()) {}
};

TEST_F(SharingOperations, whatIsMissingIsNamed) {
  expectAll({}, QVErrorInvalidArgument);
  EXPECT_NE(info({}).error.localizedDescription().find("no URL"), std::string::npos);
  for (const NSError &error :
       {save(std::nullopt).error, shareURL(std::nullopt).error, unshare(std::nullopt, true)}) {
    EXPECT_TESSALY_ERROR(error, QVErrorInvalidArgument);
    EXPECT_NE(error.localizedDescription().find("no share"), std::string::npos);
  }
  EXPECT_TESSALY_ERROR(save(CKShare()).error, QVErrorInvalidArgument);
  EXPECT_TESSALY_ERROR(std::get<1>(document(std::nullopt, true)), QVErrorInvalidArgument);
  EXPECT_TESSALY_ERROR(std::get<1>(lookUp(std::nullopt)), QVErrorInvalidArgument);
}

TEST_F(SharingOperations, whatIsntInTheDriveIsntFound) {
  expectAll(NSURL::fileURLWithPath("/etc/hostname"), QVErrorNoSuchItem);
  expectAll(url("nothing"), QVErrorNoSuchItem);
}

TEST_F(SharingOperations, nobodySharesWhenNobodyIsSignedIn) {
  sentDocument("letter");
  const CKShare saved = shared("letter");
  Once<NSError> out("signing out");
  session()->signOut(out.completion());
  ASSERT_FALSE(out.value<0>());
  expectAll(url("letter"), QVErrorLoggedOut);
  EXPECT_TESSALY_ERROR(save(saved).error, QVErrorLoggedOut);
  EXPECT_TESSALY_ERROR(unshare(saved, true), QVErrorLoggedOut);
  EXPECT_TESSALY_ERROR(std::get<1>(document(recordOf("letter"), false)), QVErrorLoggedOut);
}

TEST_F(SharingOperations, whatIsntSharedSaysWhatToDo) {
  const auto refused = [&](const std::string &path, const char *hint) {
    ASSERT_TRUE(device.knowsSoon(path)) << path;
    const NSError error = create(url(path)).error;
    EXPECT_TESSALY_ERROR(error, QVErrorNotShareable);
    EXPECT_NE(error.localizedDescription().find(hint), std::string::npos) << error.description();
  };
  refused("", "container's own folder");
  std::filesystem::create_symlink("letter", device.keld.at("link"));
  refused("link", "alias");
  device.keld.write("scratch.tmp");
  refused("scratch.tmp", "this machine alone");
  const std::string trash = "/" + device.keld.replica() + "/" + QVUbiquitousTrashContainerID;
  device.keld.write(trash + "/files/old");
  refused(trash + "/files/old", "trash");
  const std::string secret = "/" + device.keld.replica() + "/" + QVUbiquitousDefaultContainerID + "/secret";
  device.keld.write(secret);
  refused(secret, "private");
}

TEST_F(HungCloud, aCallThatDoesntMoveEndsWithATimeout) {
  sentFolder("Plans");
  const auto made = create(url("Plans"));
  const CKShare saved = shared("Plans");
  cloud->onEveryCall(hanging());
  device.keld.write("Plans/new");
  const CKRecordID plans = recordOf("Plans");
  const std::vector<std::function<NSError()>> calls{
      [&] { return info(url("Plans")).error; },
      [&] { return save(made.share).error; },
      [&] { return shareURL(made.share).error; },
      [&] { return unshare(saved, true); },
      [&] { return std::get<2>(access(url("Plans"), true)); },
      [&] { return std::get<2>(tokens(url("Plans"))); },
      [&] { return process(url("Plans"), 0, QVProcessCheckSubshares); },
      [&] { return std::get<1>(document(plans, true)); },
      [&] { return std::get<1>(lookUp(std::vector<CKShareParticipant>(1))); },
      [&] { return prepare(url("Plans")); },
      [&] { return create(url("Plans/new")).error; }};
  std::vector<std::future<NSError>> answers;
  for (const auto &call : calls) answers.push_back(std::async(std::launch::async, call));
  for (std::size_t index = 0; index < answers.size(); ++index) {
    const NSError error = answers[index].get();
    EXPECT_TRUE(CKErrorIsTimeout(error)) << index << ": " << error.description();
  }
}

TEST_F(SharingOperations, anOperationIsCancelledByWhatItsClientWasGiven) {
  sentDocument("letter");
  const auto made = create(url("letter"));
  cloud->onNextCall(Call::modifyRecords, hanging());
  const auto op = std::make_shared<RecordingOperation>();
  Once<std::optional<CKShare>, NSError> answer("save");
  session()->startOperation_toSaveSharingInfo(op, made.share, answer.completion());
  ASSERT_TRUE(op->log.waitFor("remote"));
  ASSERT_TRUE(eventually([&] { return cloud->hanging() > 0; }));
  op->remote()->invalidate();
  EXPECT_TESSALY_ERROR(answer.value<1>(), QVErrorCancelled);
  EXPECT_FALSE(answer.value<0>());
  op->remote()->invalidate();
  EXPECT_TRUE(eventually([&] { return op.use_count() == 1; })) << "it is held though it has ended";
}

TEST_F(SharingOperations, theEndOfAConnectionCancelsItsOperationsAndNoOthers) {
  sentDocument("letter");
  const auto made = create(url("letter"));
  const auto other = device.keld.sharedDaemon()->newSession();
  cloud->onEveryCall(Call::modifyRecords, hanging());
  Once<std::optional<CKShare>, NSError> ours("ours"), theirs("theirs");
  const auto op = std::make_shared<RecordingOperation>();
  session()->startOperation_toSaveSharingInfo(op, made.share, ours.completion());
  other->startOperation_toSaveSharingInfo(nullptr, made.share, theirs.completion());
  ASSERT_TRUE(eventually([&] { return cloud->hanging() == 2; }));
  std::static_pointer_cast<KeldSession>(other)->end();
  EXPECT_TESSALY_ERROR(theirs.value<1>(), QVErrorCancelled);
  EXPECT_FALSE(ours.called());
  Once<NSError> late("late");
  other->startOperation_toUnshareShare(nullptr, made.share, true, late.completion());
  EXPECT_TESSALY_ERROR(late.value<0>(), QVErrorCancelled);
  op->remote()->invalidate();
  EXPECT_TESSALY_ERROR(ours.value<1>(), QVErrorCancelled);
}

TEST_F(SharingOperations, theEndOfTheDaemonAnswersWhatIsUnderWay) {
  sentDocument("letter");
  const auto made = create(url("letter"));
  cloud->onEveryCall(Call::modifyRecords, hanging());
  Once<std::optional<CKShare>, NSError> save("save");
  session()->startOperation_toSaveSharingInfo(nullptr, made.share, save.completion());
  device.keld.write("new");
  Once<NSError> prepared("prepare");
  session()->startOperation_toPrepFolderForSharingAt(nullptr, url("new"), prepared.completion());
  ASSERT_TRUE(eventually([&] { return cloud->hanging() > 0; }));
  device.keld.daemon().stop();
  EXPECT_TESSALY_ERROR(save.value<1>(), QVErrorShuttingDown);
  EXPECT_TESSALY_ERROR(prepared.value<0>(), QVErrorShuttingDown);
  EXPECT_TESSALY_ERROR(info(url("letter")).error, QVErrorShuttingDown);
}

TEST_F(SharingOperations, moreThanCanWaitAreRefusedAndAThousandDeadClientsLeaveNothing) {
  sentDocument("letter");
  const auto made = create(url("letter"));
  cloud->onEveryCall(Call::modifyRecords, hanging());
  SharingQueue &queue = device.keld.daemon().sharing().queue();
  ASSERT_TRUE(eventually([&] { return queue.count() == 0; })) << "an answer comes before its place is free";
  const auto other = device.keld.sharedDaemon()->newSession();
  std::atomic<int> answered{0}, busy{0}, cancelled{0};
  std::vector<std::shared_ptr<RecordingOperation>> clients;
  for (int n = 0; n < 1000; ++n) {
    clients.push_back(std::make_shared<RecordingOperation>());
    other->startOperation_toSaveSharingInfo(clients.back(), made.share,
                                            [&](const std::optional<CKShare> &share, const NSError &error) {
                                              EXPECT_FALSE(share);
                                              busy += error.code() == QVErrorBusy ? 1 : 0;
                                              cancelled += error.code() == QVErrorCancelled ? 1 : 0;
                                              ++answered;
                                            });
  }
  EXPECT_EQ(queue.count(), 264U) << "8 at once, and 256 that wait";
  EXPECT_EQ(busy, 736);
  EXPECT_LE(cloud->hanging(), 8);
  std::static_pointer_cast<KeldSession>(other)->end();
  ASSERT_TRUE(eventually([&] { return answered == 1000 && queue.count() == 0; })) << answered;
  EXPECT_EQ(cancelled, 264);
  ASSERT_TRUE(eventually([&] {
    return std::all_of(clients.begin(), clients.end(), [](const auto &op) { return op.use_count() == 1; });
  }));
  cloud->clearFaults();
  EXPECT_TRUE(save(made.share).share) << "it goes on for others";
}

// The same as clients have it: over a connection to the daemon's socket.
TEST_F(SharingOperations, aLostConnectionCancelsWhatItAskedFor) {
  sentDocument("letter");
  const auto made = create(url("letter"));
  const std::string socket = folder.path() + "/socket";
  NSError error;
  const auto listener = KeldListener::listen(device.keld.sharedDaemon(), socket, &error);
  ASSERT_TRUE(listener) << error.description();
  auto connection = std::make_shared<QVDaemonConnectionOverXPC>(socket);
  cloud->onEveryCall(Call::modifyRecords, hanging());
  std::atomic<int> ended{0};
  const auto proxy = connection->remoteObjectProxyWithErrorHandler([&](const NSError &) { ++ended; });
  const auto op = std::make_shared<RecordingOperation>();
  Once<std::optional<CKShare>, NSError> cancelled("cancelled by its client");
  proxy->startOperation_toSaveSharingInfo(op, made.share, cancelled.completion());
  ASSERT_TRUE(op->log.waitFor("remote"));
  for (int n = 0; n < 50; ++n)
    proxy->startOperation_toSaveSharingInfo(
        std::make_shared<RecordingOperation>(), made.share,
        [&](const std::optional<CKShare> &, const NSError &) { ++ended; });
  SharingQueue &queue = device.keld.daemon().sharing().queue();
  ASSERT_TRUE(eventually([&] { return queue.count() == 51; })) << queue.count();
  op->remote()->invalidate();
  EXPECT_TESSALY_ERROR(cancelled.value<1>(), QVErrorCancelled);
  connection.reset();
  EXPECT_TRUE(eventually([&] { return queue.count() == 0; })) << queue.count();
  EXPECT_TRUE(eventually([&] { return ended == 50; })) << ended;
  listener->invalidate();
}

TEST_F(SharingOperations, waitsForUploadsOfDeadClientsAreLetGoOf) {
  cloud->onEveryCall(Call::modifyRecords, failing(CKErrorCode::networkUnavailable));
  device.keld.write("new");
  const auto other = device.keld.sharedDaemon()->newSession();
  std::vector<std::unique_ptr<Once<NSError>>> answers;
  for (int n = 0; n < 8; ++n) {
    answers.push_back(std::make_unique<Once<NSError>>("prepare"));
    other->startOperation_toPrepFolderForSharingAt(nullptr, url("new"), answers.back()->completion());
  }
  std::static_pointer_cast<KeldSession>(other)->end();
  for (const auto &answer : answers) EXPECT_TESSALY_ERROR(answer->value<0>(), QVErrorCancelled);
}

// Each with whatever arguments: there is one answer.
TEST_F(SharingOperations, everyOperationAnswersOnce) {
  std::atomic<int> replies{0};
  for (const ShareCall &call : shareCalls())
    call.make(*session(), std::make_shared<RecordingOperation>(),
              [&](const FakeSharing::Answers &, const NSError &) { ++replies; });
  EXPECT_TRUE(eventually([&] { return replies == static_cast<int>(shareCalls().size()); })) << replies;
  EXPECT_TRUE(eventually([&] { return device.keld.daemon().sharing().queue().count() == 0; }));
  EXPECT_EQ(replies, static_cast<int>(shareCalls().size()));
}

}  // namespace
}  // namespace droxa::keld
