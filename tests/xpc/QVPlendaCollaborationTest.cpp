// The collaboration service over a connection: each call and its reply.

#include <gtest/gtest.h>
#include <memory>

#include "tessaly/QVPlendaCollaboration.h"
#include "tessaly/xpc/QVPlendaCollaborationInterface.h"
#include "tests/support/Eventually.h"
#include "tests/support/Once.h"
#include "tests/xpc/ConnectedPair.h"

namespace droxa {
namespace {

using Text = std::optional<std::string>;
using Service = QVFileProviderPlendaCollaboration;

// Answers at once with what the test put there.
class ScriptedCollaboration final : public Service {
 public:
  void fetchVersionAndCapabilitiesWithCompletionHandler(QVCollaborationVersionHandler handler) override {
    handler(-1, 210, error);
  }
  Progress fetchCollaborationTokenWithCompletionHandler(QVCollaborationTokenHandler handler) override {
    handler(text, first, second, expiry, error);
    return progress;
  }
  Progress fetchLatestRevisionWithCompletionHandler(QVCollaborationErrorHandler handler) override {
    handler(error);
    return progress;
  }
  Progress refreshSharingStateWithCompletionHandler(QVCollaborationErrorHandler handler) override {
    handler(error);
    return progress;
  }
  void fetchFileProviderIdentifierWithCompletionHandler(QVCollaborationStringHandler handler) override {
    handler(text, error);
  }
  void fetchURLForSharingFileWithCompletionHandler(QVCollaborationURLHandler handler) override {
    handler(url, error);
  }
  Progress fetchFolderSharingStateWithCompletionHandler(QVCollaborationStateHandler handler) override {
    handler(isShared, error);
    return nullptr;
  }
  Progress fetchSharedFolderInfoWithCompletionHandler(QVCollaborationFolderHandler handler) override {
    handler(isShared, text, error);
    return nullptr;
  }
  void fetchAccountIdentifierWithCompletionHandler(QVCollaborationStringHandler handler) override {
    handler(second, error);
  }

  Progress progress;
  Text text, first, second;
  NSDate expiry;
  NSURL url;
  bool isShared = false;
  NSError error;
};

class CollaborationConnection : public testing::Test {
 protected:
  CollaborationConnection() { pair.serve<Service>(QVPlendaCollaborationInterface(), service); }
  std::shared_ptr<Service> remote() {
    return pair.client->remoteObjectProxyWithErrorHandler<Service>(
        [](const NSError &error) { ADD_FAILURE() << error.description(); });
  }
  // Every call's reply is what the service has.
  void expectAll() {
    const NSError &error = service->error;
    const Once<std::int64_t, std::int64_t, NSError> version("version");
    remote()->fetchVersionAndCapabilitiesWithCompletionHandler(version.completion());
    EXPECT_EQ(version.values(), (std::tuple(std::int64_t{-1}, std::int64_t{210}, error)));
    const Once<Text, Text, Text, NSDate, NSError> tokens("tokens");
    remote()->fetchCollaborationTokenWithCompletionHandler(tokens.completion());
    EXPECT_EQ(tokens.values(),
              (std::tuple(service->text, service->first, service->second, service->expiry, error)));
    const Once<NSError> revision("revision"), refresh("refresh");
    remote()->fetchLatestRevisionWithCompletionHandler(revision.completion());
    remote()->refreshSharingStateWithCompletionHandler(refresh.completion());
    EXPECT_EQ(revision.value<0>(), error);
    EXPECT_EQ(refresh.value<0>(), error);
    const Once<Text, NSError> provider("provider"), account("account");
    remote()->fetchFileProviderIdentifierWithCompletionHandler(provider.completion());
    remote()->fetchAccountIdentifierWithCompletionHandler(account.completion());
    EXPECT_EQ(provider.values(), (std::tuple(service->text, error)));
    EXPECT_EQ(account.values(), (std::tuple(service->second, error)));
    const Once<NSURL, NSError> sharing("URL");
    remote()->fetchURLForSharingFileWithCompletionHandler(sharing.completion());
    EXPECT_EQ(sharing.values(), (std::tuple(service->url, error)));
    const Once<bool, NSError> state("state");
    EXPECT_FALSE(remote()->fetchFolderSharingStateWithCompletionHandler(state.completion()));
    EXPECT_EQ(state.values(), (std::tuple(service->isShared, error)));
    const Once<bool, Text, NSError> folder("folder");
    EXPECT_FALSE(remote()->fetchSharedFolderInfoWithCompletionHandler(folder.completion()));
    EXPECT_EQ(folder.values(), (std::tuple(service->isShared, service->text, error)));
  }

  const std::shared_ptr<ScriptedCollaboration> service = std::make_shared<ScriptedCollaboration>();
  ConnectedPair pair;
};

TEST_F(CollaborationConnection, eachCallAndItsReplyCrossWhole) {
  service->text = "com.quorva.Tessaly";
  service->first = "";
  service->second = std::string("a\0b", 3);
  service->expiry = NSDate::distantFuture();
  service->url = NSURL::URLWithString("https://drive.example/a");
  service->isShared = true;
  service->error = NSError("Domain", 7, {{NSLocalizedDescriptionKey, std::string("no")}});
  expectAll();
}

TEST_F(CollaborationConnection, nilCrossesAsNil) {
  expectAll();
}

TEST_F(CollaborationConnection, progressCrossesAndIsCancelled) {
  service->progress = NSProgress::progressWithTotalUnitCount(0);
  for (const auto &mirror : {remote()->fetchCollaborationTokenWithCompletionHandler(nullptr),
                             remote()->fetchLatestRevisionWithCompletionHandler([](const NSError &) {}),
                             remote()->refreshSharingStateWithCompletionHandler([](const NSError &) {})}) {
    ASSERT_TRUE(mirror);
    EXPECT_TRUE(eventually([&mirror] { return mirror->totalUnitCount() == 0; }));
  }
  const auto mirror = remote()->fetchLatestRevisionWithCompletionHandler([](const NSError &) {});
  mirror->cancel();
  EXPECT_TRUE(eventually([this] { return service->progress->isCancelled(); }));
}

}  // namespace
}  // namespace droxa
