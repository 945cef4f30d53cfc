// The services on an item over real connections: client, service and daemon.

#include <gtest/gtest.h>

#include "platform/foundation/NSFileManager.h"
#include "platform/usermanagement/UMUserManager.h"
#include "sharing/QVFileProviderPlendaCollaborationServiceSource.h"
#include "sharing/QVSharingClient.h"
#include "tessaly/QVUbiquitousItems.h"
#include "tessaly/xpc/QVPlendaCollaborationInterface.h"
#include "tessaly/xpc/QVSharingServiceInterface.h"
#include "tests/extension/ScriptedPrincipal.h"
#include "tests/sharing/SharingFixture.h"
#include "tests/support/Once.h"

namespace droxa {
namespace {

using Lines = std::vector<std::string>;
using Share = std::optional<CKShare>;

constexpr char kCopy[] = "startOperation_toCopySharingInfoAtURL";
constexpr char kSave[] = "startOperation_toSaveSharingInfo";

class ItemServiceConnections : public SharingTest {
 protected:
  ItemServiceConnections() {
    QVInstallUbiquitousItemProvider();
    daemon.addDocument("a");
    principal->urls["d1"] = daemon.url("a");
  }
  ~ItemServiceConnections() override {
    UMSetConfiguration({});
    for (const auto &one : connections_) one->invalidate();
    queue->waitUntilAllOperationsAreFinished();
    NSFileManager::defaultManager()->setUbiquitousItemProvider(nullptr);
  }

  template <class Source>
  std::shared_ptr<Source> makeItemSource(const std::string &identifier = "d1") {
    return std::make_shared<Source>(principal, identifier, queue);
  }
  std::shared_ptr<NSXPCConnection> connectTo(QVFileProviderServiceSource &source,
                                             const NSXPCInterface &interface) {
    const auto endpoint = source.makeListenerEndpointAndReturnError(nullptr);
    auto connection = NSXPCConnection::connectionWithListenerEndpoint(*endpoint, nullptr);
    connection->setRemoteObjectInterface(interface);
    connection->resume();
    connections_.push_back(connection);
    return connection;
  }
  std::shared_ptr<QVSharingService> sharing() {
    const auto client = connectTo(*sharingClient, getSharingServiceInterface());
    return client->remoteObjectProxyWithErrorHandler<QVSharingService>([](const NSError &) {});
  }
  std::shared_ptr<QVFileProviderPlendaCollaboration> collaboration() {
    const auto client = connectTo(*collaborationSource, QVPlendaCollaborationInterface());
    return client->remoteObjectProxyWithErrorHandler<QVFileProviderPlendaCollaboration>(
        [](const NSError &) {});
  }
  const std::shared_ptr<NSXPCConnection> &lastConnection() const { return connections_.back(); }

  // The lines of a client's end, in order, without what else was logged.
  Lines endLines() const {
    Lines kept;
    for (const std::string &line : logLines(capture))
      if (line.find("connection i") != std::string::npos || line.find("persona") != std::string::npos)
        kept.push_back(line);
    return kept;
  }

  const std::shared_ptr<ScriptedPrincipal> principal = std::make_shared<ScriptedPrincipal>();
  const std::shared_ptr<NSOperationQueue> queue = std::make_shared<NSOperationQueue>();
  const std::shared_ptr<QVSharingClient> sharingClient = makeItemSource<QVSharingClient>();
  const std::shared_ptr<QVFileProviderPlendaCollaborationServiceSource> collaborationSource =
      makeItemSource<QVFileProviderPlendaCollaborationServiceSource>();

 private:
  std::vector<std::shared_ptr<NSXPCConnection>> connections_;
};

TEST_F(ItemServiceConnections, theServicesHaveTheirNames) {
  EXPECT_EQ(sharingClient->serviceName(), "com.quorva.Tessaly.SharingV1");
  EXPECT_EQ(collaborationSource->serviceName(), "com.quorva.PlendaCollaboration");
}

TEST_F(ItemServiceConnections, theFilesURLIsLookedForWheneverItIsAsked) {
  EXPECT_EQ(sharingClient->fileURL(), daemon.url("a"));
  principal->urls["d1"] = NSURL::fileURLWithPath("/elsewhere");
  EXPECT_EQ(sharingClient->fileURL().path(), "/elsewhere");
  EXPECT_FALSE(makeItemSource<QVSharingClient>("d9")->fileURL());
}

TEST_F(ItemServiceConnections, aShareIsMadeSavedAndWithdrawnByAClient) {
  FakeSharing::Answers answers;
  CKShare unsaved = wholeShare();
  unsaved.recordChangeTag = "";
  answers.share = unsaved;
  answers.url = daemon.url("a");  // so that it isn't kept
  daemon.sharing().setAnswers(answers);
  daemon.replies().failNext(kCopy, qvc_error(QVErrorNoShare, "none"));
  const auto remote = sharing();
  const Once<Share, NSError> fetched("fetch");
  EXPECT_TRUE(remote->fetchShareWithCompletion(fetched.completion()));
  EXPECT_EQ(fetched.value<0>(), Share(unsaved));

  answers.share = wholeShare();
  answers.share->recordChangeTag = "tag";
  daemon.sharing().setAnswers(answers);
  const Once<Share, NSError> saved("save");
  const auto saving = remote->saveShare(fetched.value<0>(), saved.completion());
  EXPECT_EQ(saved.value<0>(), answers.share);
  EXPECT_TRUE(eventually([&] { return saving->completedUnitCount() == 1 && saving->totalUnitCount() == 1; }));

  const Once<NSError> gone("unshare");
  const auto unsharing = remote->unshareWithCompletion(gone.completion());
  EXPECT_FALSE(gone.value<0>());
  EXPECT_TRUE(
      eventually([&] { return unsharing->completedUnitCount() == 2 && unsharing->totalUnitCount() == 2; }));
}

TEST_F(ItemServiceConnections, eachConnectionKeepsAShareOfItsOwn) {
  FakeSharing::Answers answers;
  answers.share = wholeShare();
  daemon.sharing().setAnswers(answers);
  for (std::size_t client = 1; client <= 2; ++client) {
    const Once<Share, NSError> fetched("fetch");
    sharing()->fetchShareWithCompletion(fetched.completion());
    EXPECT_EQ(fetched.value<0>(), answers.share);
    EXPECT_EQ(daemon.log().count(kCopy), client);
  }
}

TEST_F(ItemServiceConnections, whatAClientBeganGoesOnWhenItHasGone) {
  daemon.replies().hold(kSave);
  sharing()->saveShare(wholeShare(), [](const Share &, const NSError &) { ADD_FAILURE() << "replied"; });
  ASSERT_TRUE(daemon.log().waitFor(kSave));
  const auto remote = std::make_shared<RecordingCancellable>();
  daemon.sharing().lastOperation()->setRemoteOperationProxy(remote, {});
  lastConnection()->invalidate();
  ASSERT_TRUE(eventually(
      [this] { return logged("debug: [DEBUG] sharing service source connection invalidated") == 1; }));
  EXPECT_EQ(queue->operationCount(), 1U);
  daemon.replies().release(kSave);
  queue->waitUntilAllOperationsAreFinished();
  EXPECT_EQ(remote->log.calls(), Lines());
}

TEST_F(ItemServiceConnections, aClientsProgressCancelsWhatTheDaemonDoes) {
  daemon.replies().hold(kSave);
  const Once<Share, NSError> saved("save");
  const auto progress = sharing()->saveShare(wholeShare(), saved.completion());
  ASSERT_TRUE(daemon.log().waitFor(kSave));
  const auto remote = std::make_shared<RecordingCancellable>();
  daemon.sharing().lastOperation()->setRemoteOperationProxy(remote, {});
  progress->cancel();
  EXPECT_TRUE(saved.value<1>().is(QVTessalyErrorDomain, QVErrorCancelled));
  EXPECT_TRUE(remote->log.waitFor("invalidate"));
  daemon.replies().release(kSave);
}

TEST_F(ItemServiceConnections, collaborationIsServedToAnybody) {
  const Once<std::int64_t, std::int64_t, NSError> version("version");
  collaboration()->fetchVersionAndCapabilitiesWithCompletionHandler(version.completion());
  EXPECT_EQ(version.values(), (std::tuple(std::int64_t{1}, std::int64_t{210}, NSError())));
}

TEST_F(ItemServiceConnections, theEndOfAClientIsToldUnderThePersonaOfItsBeginning) {
  UMConfiguration managed;
  managed.personas = {{"work", true}};
  managed.processPersona = "work";
  UMSetConfiguration(managed);
  const Once<std::int64_t, std::int64_t, NSError> version("version");
  collaboration()->fetchVersionAndCapabilitiesWithCompletionHandler(version.completion());
  version.wait();
  managed.processPersona = std::nullopt;
  UMSetConfiguration(managed);
  capture.clear();
  lastConnection()->invalidate();
  const std::string end = "debug: [DEBUG] collaboration service source connection ";
  ASSERT_TRUE(eventually([&] { return logged(end + "invalidated") == 1; }));
  EXPECT_EQ(endLines(), (Lines{end + "interrupted", end + "invalidated"}));
}

TEST_F(ItemServiceConnections, whereThePersonaCantBeAdoptedTheEndIsToldAllTheSame) {
  UMConfiguration managed;
  managed.personas = {{"work", true}};
  managed.processPersona = "work";
  UMSetConfiguration(managed);
  const Once<Share, NSError> fetched("fetch");
  sharing()->fetchShareWithCompletion(fetched.completion());
  fetched.wait();
  managed.processPersona = std::nullopt;
  managed.mayUseArbitraryPersonas = false;
  UMSetConfiguration(managed);
  capture.clear();
  lastConnection()->invalidate();
  const std::string refused = "debug: [DEBUG] Not allowed to adopt persona - should fallback persona";
  const std::string end = "debug: [DEBUG] sharing service source connection ";
  ASSERT_TRUE(eventually([&] { return logged(end + "invalidated") == 1; }));
  EXPECT_EQ(endLines(), (Lines{refused, end + "interrupted", refused, end + "invalidated"}));
}

}  // namespace
}  // namespace droxa
