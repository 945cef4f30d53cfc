// The sharing operations over real connections: client, service and daemon each at an end of one.

#include <fstream>
#include <gtest/gtest.h>

#include "tests/sharing/ConnectedSharing.h"
#include "tests/xpc/Descriptors.h"

namespace droxa {
namespace {

using Lines = std::vector<std::string>;
constexpr char kSave[] = "startOperation_toSaveSharingInfo";
constexpr char kInvalidated[] = "debug: [DEBUG] share service source connection invalidated";

using ShareOperationConnections = ConnectedSharing;

TEST_F(ShareOperationConnections, eachCallAndItsReplyCrossWhole) {
  FakeSharing::Answers answers = wholeAnswers();
  const std::string path = home.write("replica/shared.txt", "contents");
  answers.urlWrapper = FPSandboxingURLWrapper::wrapperWithURL(NSURL::fileURLWithPath(path), true, nullptr);
  daemon.sharing().setAnswers(answers);
  const auto remote = proxyOf(client());
  for (const ShareCall &call : shareCalls()) {
    SCOPED_TRACE(call.name);
    daemon.log().clear();
    Reply reply;
    call.make(*remote, std::make_shared<RecordingOperation>(), reply.block());
    ASSERT_TRUE(reply.came());
    EXPECT_FALSE(reply.problem()) << reply.problem().description();
    EXPECT_TRUE(sameAnswers(reply.answers(), call.expected(answers)));
    EXPECT_EQ(daemon.calls(), (Lines{call.name + "(" + call.arguments + ")"}));
    if (call.hasShare) {
      EXPECT_EQ(daemon.sharing().lastShare(), wholeShare());
    }
  }
}

TEST_F(ShareOperationConnections, nilCrossesAsNil) {
  daemon.sharing().setAnswers({});
  const auto remote = proxyOf(client());
  for (const ShareCall &call : shareCalls()) {
    SCOPED_TRACE(call.name);
    Reply reply;
    call.make(*remote, nullptr, reply.block());
    ASSERT_TRUE(reply.came());
    EXPECT_FALSE(reply.problem());
    EXPECT_TRUE(sameAnswers(reply.answers(), {}));
  }
}

TEST_F(ShareOperationConnections, anErrorOfTheDaemonReachesTheClientWhole) {
  const NSError failure("Domain", -9,
                        {{NSLocalizedDescriptionKey, std::string("no")},
                         {NSUnderlyingErrorKey, NSError::errorWithPOSIXCode(EDQUOT)}});
  daemon.replies().failNext(kSave, failure);
  EXPECT_EQ(finish(*proxyOf(client()), kSave), failure);
}

TEST_F(ShareOperationConnections, aShareWithAnAssetIsRefusedAndTheConnectionGoesOn) {
  CKShare share = wholeShare();
  share.fields["file"] = CKAsset::assetWithFileAtPath("/a");
  std::atomic<int> failures{0};
  const auto remote = proxyOf(client(), [&failures](const NSError &) { ++failures; });
  remote->startOperation_toSaveSharingInfo(nullptr, share,
                                           [](const auto &, const auto &) { ADD_FAILURE() << "replied"; });
  EXPECT_TRUE(eventually([&failures] { return failures == 1; }));
  EXPECT_FALSE(finish(*remote, kSave));
}

TEST_F(ShareOperationConnections, eitherSideCancelsAndProgressComesInOrder) {
  daemon.replies().hold(kSave);
  const auto operation = std::make_shared<RecordingOperation>();
  Reply reply;
  shareCall(kSave).make(*proxyOf(client()), operation, reply.block());
  ASSERT_TRUE(eventually([this] { return daemon.sharing().lastOperation() != nullptr; }));
  const auto given = daemon.sharing().lastOperation();
  const auto remote = std::make_shared<RecordingCancellable>();
  given->setRemoteOperationProxy(remote, {{"kind", std::string("save")}});
  Lines expected{"remote kind=save"};
  for (int step = 0; step < 50; ++step) {
    given->progressCallbackWithTopic("upload", {{"done", std::int64_t{step}}});
    expected.push_back("progress upload done=" + std::to_string(step));
  }
  given->invalidate();
  expected.emplace_back("invalidate");
  ASSERT_TRUE(operation->log.waitFor("invalidate"));
  EXPECT_EQ(operation->log.calls(), expected);

  ASSERT_TRUE(operation->remote());
  operation->remote()->invalidate();
  EXPECT_TRUE(remote->log.waitFor("invalidate"));
  EXPECT_EQ(reply.calls, 0) << "cancelling doesn't answer";
  daemon.replies().release(kSave);
  EXPECT_TRUE(reply.came());
  EXPECT_EQ(reply.calls, 1);
}

TEST_F(ShareOperationConnections, theClientsOperationIsReleasedWhenTheDaemonLetsGo) {
  auto operation = std::make_shared<RecordingOperation>();
  const std::weak_ptr<RecordingOperation> released = operation;
  Reply reply;
  shareCall(kSave).make(*proxyOf(client()), operation, reply.block());
  ASSERT_TRUE(reply.came());
  operation = nullptr;
  EXPECT_FALSE(released.expired()) << "the daemon holds it";
  daemon.sharing().forgetOperations();
  EXPECT_TRUE(eventually([&released] { return released.expired(); }));
}

TEST_F(ShareOperationConnections, theEndOfTheDaemonAnswersTheClientOnce) {
  daemon.replies().hold(kSave);
  Reply reply;
  shareCall(kSave).make(*proxyOf(client()), nullptr, reply.block());
  ASSERT_TRUE(eventually([this] { return daemon.replies().heldCount(kSave) == 1; }));
  daemonDelegate->endConnections();
  ASSERT_TRUE(reply.came());
  EXPECT_TRUE(reply.problem().is(NSCocoaErrorDomain, NSXPCConnectionInterrupted));
  daemon.replies().release(kSave);
  EXPECT_FALSE(finish(*proxyOf(client()), kSave)) << "the next call goes a new way";
  EXPECT_EQ(reply.calls, 1);
}

TEST_F(ShareOperationConnections, withoutADaemonEachCallIsAnsweredWithTheConnectionsError) {
  daemonListener->invalidate();
  daemonDelegate->endConnections();
  const auto remote = proxyOf(client());
  for (const ShareCall &call : shareCalls()) {
    const NSError error = finish(*remote, call.name.c_str());
    EXPECT_EQ(error.domain(), NSCocoaErrorDomain) << call.name;
  }
}

TEST_F(ShareOperationConnections, theEndOfTheExtensionFailsTheCallsUnderWayOnce) {
  daemon.replies().hold(kSave);
  std::atomic<int> failures{0};
  const auto remote = proxyOf(client(), [&failures](const NSError &error) {
    EXPECT_TRUE(error.is(NSCocoaErrorDomain, NSXPCConnectionInterrupted));
    ++failures;
  });
  const auto operation = std::make_shared<RecordingOperation>();
  remote->startOperation_toSaveSharingInfo(operation, wholeShare(),
                                           [](const auto &, const auto &) { ADD_FAILURE() << "replied"; });
  ASSERT_TRUE(eventually([this] { return daemon.replies().heldCount(kSave) == 1; }));
  delegate->lastConnection()->invalidate();
  EXPECT_TRUE(eventually([&failures] { return failures == 1; }));
  daemon.sharing().lastOperation()->invalidate();  // goes nowhere
  daemon.replies().release(kSave);
  EXPECT_TRUE(eventually([this] { return logged(kInvalidated) == 1; }));
  EXPECT_EQ(failures, 1);
  EXPECT_EQ(operation->log.calls(), Lines());
}

TEST_F(ShareOperationConnections, aClientThatIsKilledLeavesNothingBehind) {
  const std::string name = "startOperation_toCopySharingInfoAtURL";
  daemon.replies().hold(name);
  entitled.grant(SHARING_TEST_CLIENT, kAllEntitlements);
  ClientProcess process(endpoint(), "hang");
  ASSERT_TRUE(eventually([this] { return daemon.sharing().lastOperation() != nullptr; }));
  const auto remote = std::make_shared<RecordingCancellable>();
  daemon.sharing().lastOperation()->setRemoteOperationProxy(remote, {});
  ASSERT_EQ(process.read(true), "called");
  process.killNow();
  ASSERT_TRUE(eventually([this] { return logged(kInvalidated) == 1; }));
  EXPECT_TRUE(remote->log.waitFor("invalidate")) << "the daemon needn't go on";
  const auto late = std::make_shared<RecordingCancellable>();
  daemon.sharing().lastOperation()->setRemoteOperationProxy(late, {});
  EXPECT_TRUE(late->log.waitFor("invalidate")) << "nor what it begins later";
  daemon.sharing().lastOperation()->progressCallbackWithTopic("nobody listens", {});
  daemon.replies().release(name);
  EXPECT_TRUE(eventually([this] { return !delegate->lastConnection(); }));
  daemon.sharing().forgetOperations();
  const std::weak_ptr<RecordingCancellable> released = remote;
  EXPECT_TRUE(eventually([&remote] { return remote.use_count() == 1; })) << "the daemon's own is let go of";
}

TEST_F(ShareOperationConnections, whatHasEndedBeforeTheClientGoesIsNotCancelled) {
  daemon.replies().hold(kSave);
  Reply reply;
  shareCall(kSave).make(*proxyOf(client()), std::make_shared<RecordingOperation>(), reply.block());
  ASSERT_TRUE(eventually([this] { return daemon.sharing().lastOperation() != nullptr; }));
  const auto remote = std::make_shared<RecordingCancellable>();
  daemon.sharing().lastOperation()->setRemoteOperationProxy(remote, {});
  daemon.replies().release(kSave);
  ASSERT_TRUE(reply.came());
  daemon.sharing().forgetOperations();
  EXPECT_TRUE(eventually([&remote] { return remote.use_count() == 1; }));
  client()->invalidate();
  ASSERT_TRUE(eventually([this] { return logged(kInvalidated) == 1; }));
  EXPECT_EQ(remote->log.calls(), Lines());
}

TEST_F(ShareOperationConnections, aProcessHasItsOwnPrivilegesAndNotThoseOfTheOneThatGaveItTheEndpoint) {
  ClientProcess refused(endpoint(), "privilege");
  EXPECT_EQ(refused.waitForEnd(), 26);
  entitled.grant(SHARING_TEST_CLIENT, {QVSharingProxyEntitlement});
  ClientProcess served(endpoint(), "privilege");
  EXPECT_EQ(served.waitForEnd(), 0);
  EXPECT_EQ(finish(*proxyOf(client()), "createSharingInfoForURL").code(), 26) << "it is another program";
}

TEST_F(ShareOperationConnections, aDocumentIsOpenedThroughItsWrapperWhereItsPathCantBe) {
  const std::string path = home.write("replica/shared.txt", "what is in it");
  FakeSharing::Answers answers;
  answers.urlWrapper = FPSandboxingURLWrapper::wrapperWithURL(NSURL::fileURLWithPath(path), true, nullptr);
  ASSERT_TRUE(answers.urlWrapper);
  daemon.sharing().setAnswers(answers);
  std::filesystem::remove(path);  // the descriptor is the only way left
  entitled.grant(SHARING_TEST_CLIENT, {QVSharingPrivateInterfaceEntitlement});
  ClientProcess reader(endpoint(), "read");
  EXPECT_EQ(reader.read(false), "what is in it");
  EXPECT_EQ(reader.waitForEnd(), 0);
}

// More than a peer may send unasked, and each is closed with its wrapper.
TEST_F(ShareOperationConnections, oneConnectionBringsAnyNumberOfWrappers) {
  const std::string path = home.write("replica/shared.txt", "contents");
  FakeSharing::Answers answers;
  answers.urlWrapper = FPSandboxingURLWrapper::wrapperWithURL(NSURL::fileURLWithPath(path), true, nullptr);
  daemon.sharing().setAnswers(answers);
  const auto remote = proxyOf(client());
  finish(*remote, "startOperation_toCopyDocumentURLForRecordID");
  const std::size_t before = openDescriptors();
  for (int round = 0; round < 300; ++round) {
    Reply reply;
    shareCall("startOperation_toCopyDocumentURLForRecordID").make(*remote, nullptr, reply.block());
    ASSERT_TRUE(reply.came());
    ASSERT_TRUE(reply.answers().urlWrapper) << reply.problem().description();
    ASSERT_GE(reply.answers().urlWrapper->descriptor(), 0);
  }
  EXPECT_TRUE(eventually([before] { return openDescriptors() <= before + 4; }));
}

std::size_t residentKiB() {
  std::ifstream file("/proc/self/statm");
  std::size_t pages = 0;
  std::size_t resident = 0;
  file >> pages >> resident;
  return resident * 4;
}

// Each connects through an endpoint of its own, has a call under way, and goes.
TEST_F(ShareOperationConnections, aThousandClientsThatDieLeaveMemoryAndDescriptorsWhereTheyWere) {
  const std::shared_ptr<QVFileProviderServiceSource> shared = makeSource();
  daemon.replies().hold(kSave);
  const auto runClients = [&](int count) {
    for (int index = 0; index < count; ++index) {
      const auto endpoint = shared->makeListenerEndpointAndReturnError(nullptr);
      ASSERT_TRUE(endpoint);
      const auto connection = connect(*endpoint);
      std::atomic<int> failed{0};
      shareCall(kSave).make(*proxyOf(connection, [&failed](const NSError &) { ++failed; }),
                            std::make_shared<RecordingOperation>(), [](const auto &, const auto &) {});
      ASSERT_TRUE(eventually([this] { return daemon.replies().heldCount(kSave) > 0; }));
      connection->invalidate();
      ASSERT_TRUE(eventually([&failed] { return failed == 1; }));
      daemon.replies().release(kSave);
      daemon.replies().hold(kSave);
      daemon.sharing().forgetOperations();
      daemon.log().clear();
      capture.clear();
    }
    EXPECT_TRUE(eventually([&shared] { return shared->listeners().empty(); }));
  };
  runClients(100);
  const std::size_t descriptors = openDescriptors();
  const std::size_t memory = residentKiB();
  runClients(1000);
  EXPECT_TRUE(eventually([descriptors] { return openDescriptors() <= descriptors + 8; }))
      << openDescriptors() << " after " << descriptors;
#if !defined(__SANITIZE_ADDRESS__) && !defined(__SANITIZE_THREAD__) && !defined(__clang__)
  EXPECT_LT(residentKiB(), memory + 8192) << "it was " << memory;
#else
  (void)memory;  // sanitizers keep freed memory
#endif
}

}  // namespace
}  // namespace droxa
