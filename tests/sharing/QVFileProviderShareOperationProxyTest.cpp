#include <gtest/gtest.h>
#include <sys/syscall.h>
#include <unistd.h>

#include "sharing/QVFileProviderShareOperationProxy.h"
#include "sharing/_QVFileProviderShareOperationWrapper.h"
#include "tests/sharing/SharingFixture.h"

namespace droxa {
namespace {

using Lines = std::vector<std::string>;

// Every call of the proxy, called in process.
class QVFileProviderShareOperationProxyTest : public SharingTest {
 protected:
  // A proxy for a client with these privileges.
  std::unique_ptr<QVFileProviderShareOperationProxy> makeProxy(const std::vector<std::string> &entitlements) {
    entitleThisProcess(entitlements);
    NSXPCPeer self;
    self.processIdentifier = getpid();
    self.processDescriptor = static_cast<int>(syscall(SYS_pidfd_open, getpid(), 0));
    auto privileges = std::make_shared<const QVCClientPrivilegesDescriptor>(self);
    close(self.processDescriptor);
    capture.clear();
    return std::make_unique<QVFileProviderShareOperationProxy>(
        nullptr, "d7", std::make_shared<NSOperationQueue>(), std::move(privileges));
  }
  // The lines of one call, in order, with their tags replaced by "T".
  Lines callLines() const {
    Lines lines = logLines(capture);
    for (std::string &line : lines) {
      for (const std::string mark : {"┏", "┗"}) {
        const auto at = line.find(mark);
        if (at == std::string::npos) continue;
        const auto begin = at + mark.size();
        const auto end = line.find(' ', begin);
        EXPECT_EQ(std::stoull(line.substr(begin, end - begin), nullptr, 16) % 2, 0U) << line;
        line.replace(begin, end - begin, "T");
      }
    }
    return lines;
  }
  static std::string method(const ShareCall &call) {
    return "-[QVFileProviderShareOperationProxy " + call.selector + "]";
  }
  static std::string replyLine(const ShareCall &call, Lines values, const NSError &error) {
    values.resize(call.positions - 1, "(null)");
    values.push_back(LogDescription(error));
    std::string text;
    for (const std::string &value : values) text += (text.empty() ? "" : ", ") + value;
    return "info: [INFO] " + method(call) + "_block_invoke: reply(" + text + ")";
  }
  static std::string opened(const ShareCall &call) { return "info: [INFO] ┏T " + method(call) + " "; }
};

const char *entitlementOf(const std::string &privilege) {
  if (privilege == "isSharingProxyEntitled") return QVSharingProxyEntitlement;
  return privilege == "isFolderSharingProxyEntitled" ? QVFolderSharingProxyEntitlement
                                                     : QVSharingPrivateInterfaceEntitlement;
}

// Everything but what the call needs.
std::vector<std::string> othersThan(const std::string &entitlement) {
  std::vector<std::string> others;
  for (const std::string &one : kAllEntitlements)
    if (one != entitlement) others.push_back(one);
  return others;
}

TEST_F(QVFileProviderShareOperationProxyTest, eachCallIsRefusedWithoutItsPrivilege) {
  ASSERT_EQ(shareCalls().size(), 12U);
  daemon.sharing().setAnswers(wholeAnswers());
  for (const ShareCall &call : shareCalls()) {
    SCOPED_TRACE(call.name);
    const auto proxy = makeProxy(othersThan(entitlementOf(call.privilege)));
    const auto operation = std::make_shared<RecordingOperation>();
    Reply reply;
    call.make(*proxy, operation, reply.block());
    EXPECT_EQ(reply.calls, 1) << "it is refused before the call returns";
    EXPECT_TRUE(reply.problem().is(QVTessalyErrorDomain, 26));
    EXPECT_EQ(reply.problem().localizedDescription(), call.privilege + " privilege required");
    EXPECT_TRUE(sameAnswers(reply.answers(), {}));
    EXPECT_EQ(daemon.calls(), Lines());
    EXPECT_EQ(operation->log.calls(), Lines());
    EXPECT_EQ(callLines(), (Lines{opened(call), replyLine(call, {}, reply.problem()), "info: [INFO] ┗T "}));
  }
}

TEST_F(QVFileProviderShareOperationProxyTest, eachCallGoesToTheDaemonWithItsPrivilegeAlone) {
  FakeSharing::Answers answers = wholeAnswers();
  const std::string path = home.write("replica/shared.txt", "contents");
  answers.urlWrapper = FPSandboxingURLWrapper::wrapperWithURL(NSURL::fileURLWithPath(path), true, nullptr);
  daemon.sharing().setAnswers(answers);
  for (const ShareCall &call : shareCalls()) {
    SCOPED_TRACE(call.name);
    daemon.log().clear();
    const auto proxy = makeProxy({entitlementOf(call.privilege)});
    Reply reply;
    call.make(*proxy, std::make_shared<RecordingOperation>(), reply.block());
    ASSERT_EQ(reply.calls, 1);
    EXPECT_FALSE(reply.problem());
    const FakeSharing::Answers expected = call.expected(answers);
    EXPECT_TRUE(sameAnswers(reply.answers(), expected));
    EXPECT_EQ(daemon.calls(), (Lines{call.name + "(" + call.arguments + ")"}));
    if (call.hasShare) {
      EXPECT_EQ(daemon.sharing().lastShare(), wholeShare());
    }
    EXPECT_EQ(callLines(), (Lines{opened(call), replyLine(call, loggedValues(call, expected), NSError()),
                                  "info: [INFO] ┗T "}));
  }
}

TEST_F(QVFileProviderShareOperationProxyTest, anErrorOfTheDaemonComesAsItIsWithWhatElseItSaid) {
  daemon.sharing().setAnswers(wholeAnswers());
  const NSError failure("SomeDomain", 77, {{NSLocalizedDescriptionKey, std::string("no")}});
  const auto proxy = makeProxy(kAllEntitlements);
  for (const ShareCall &call : shareCalls()) {
    SCOPED_TRACE(call.name);
    daemon.replies().failNext(call.name, failure);
    Reply reply;
    call.make(*proxy, nullptr, reply.block());
    ASSERT_EQ(reply.calls, 1);
    EXPECT_TRUE(reply.problem().isSameObject(failure));
    EXPECT_TRUE(sameAnswers(reply.answers(), call.expected(wholeAnswers())));
  }
}

TEST_F(QVFileProviderShareOperationProxyTest, aLostConnectionAnswersEachCallOnceWithItsError) {
  const NSError lost(NSCocoaErrorDomain, NSXPCConnectionInterrupted);
  const auto proxy = makeProxy(kAllEntitlements);
  for (const ShareCall &call : shareCalls()) {
    SCOPED_TRACE(call.name);
    daemon.replies().hold(call.name);
    capture.clear();
    Reply reply;
    call.make(*proxy, nullptr, reply.block());
    EXPECT_EQ(reply.calls, 0);
    EXPECT_EQ(callLines(), (Lines{opened(call), "info: [INFO] ┗T "}))
        << "the section ends when the call has been passed on";
    capture.clear();
    fake.connection->breakOff(lost);
    daemon.replies().release(call.name);  // too late
    EXPECT_EQ(reply.calls, 1);
    EXPECT_TRUE(reply.problem().isSameObject(lost));
    EXPECT_TRUE(sameAnswers(reply.answers(), {}));
    EXPECT_EQ(logged(replyLine(call, {}, lost)), 1U);
  }
}

TEST_F(QVFileProviderShareOperationProxyTest, nilArgumentsGoToTheDaemonToo) {
  const auto proxy = makeProxy(kAllEntitlements);
  Reply reply;
  const auto values = [&reply](const auto &...) { ++reply.calls; };
  proxy->createSharingInfoForURL(NSURL(), values);
  proxy->startOperation_toCopyShareURLForShare(nullptr, std::nullopt, std::nullopt, values);
  proxy->startOperation_toLookupShareParticipants(nullptr, std::nullopt, values);
  proxy->startOperation_toCopyDocumentURLForRecordID(nullptr, std::nullopt, false, values);
  EXPECT_EQ(reply.calls, 4);
  EXPECT_EQ(daemon.calls(),
            (Lines{"createSharingInfoForURL((null))", "startOperation_toCopyShareURLForShare((null), (null))",
                   "startOperation_toLookupShareParticipants((null))",
                   "startOperation_toCopyDocumentURLForRecordID((null), no)"}));
}

TEST_F(QVFileProviderShareOperationProxyTest, theDaemonGetsAWrapperAndTheClientSomethingToCancel) {
  const auto proxy = makeProxy(kAllEntitlements);
  const auto operation = std::make_shared<RecordingOperation>();
  Reply reply;
  daemon.replies().hold("startOperation_toSaveSharingInfo");
  shareCall("startOperation_toSaveSharingInfo").make(*proxy, operation, reply.block());
  const auto given = daemon.sharing().lastOperation();
  ASSERT_TRUE(given);
  EXPECT_TRUE(std::dynamic_pointer_cast<_QVFileProviderShareOperationWrapper>(given));

  given->progressCallbackWithTopic("upload", {{"done", std::int64_t{3}}, {"name", std::string("a")}});
  const auto remote = std::make_shared<RecordingCancellable>();
  given->setRemoteOperationProxy(remote, {{"kind", std::string("save")}});
  ASSERT_TRUE(operation->remote());
  EXPECT_NE(operation->remote(), remote) << "never the daemon's own object";
  operation->remote()->invalidate();
  EXPECT_EQ(remote->log.calls(), Lines{"invalidate"});
  given->invalidate();
  EXPECT_EQ(operation->log.calls(),
            (Lines{"progress upload done=3 name=a", "remote kind=save", "invalidate"}));
  daemon.replies().release("startOperation_toSaveSharingInfo");
  EXPECT_EQ(reply.calls, 1);
}

TEST_F(QVFileProviderShareOperationProxyTest, eachCallReachesTheDaemonAnew) {
  const auto first = QVFileProviderShareOperationProxy::remoteObject();
  EXPECT_NE(first, QVFileProviderShareOperationProxy::remoteObject());
  const auto proxy = makeProxy(kAllEntitlements);
  const std::size_t before = fake.connection->proxiesMade();
  Reply reply;
  shareCall("createSharingInfoForURL").make(*proxy, nullptr, reply.block());
  shareCall("createSharingInfoForURL").make(*proxy, nullptr, reply.block());
  EXPECT_EQ(fake.connection->proxiesMade(), before + 2);
}

}  // namespace
}  // namespace droxa
