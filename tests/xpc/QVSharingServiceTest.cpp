// The sharing service over a connection: each call and its reply, and the progress that comes with it.

#include <gtest/gtest.h>
#include <memory>

#include "tessaly/QVSharingService.h"
#include "tessaly/xpc/QVSharingServiceInterface.h"
#include "tests/support/Eventually.h"
#include "tests/support/Once.h"
#include "tests/support/ScriptedSharingService.h"
#include "tests/support/ShareCalls.h"
#include "tests/xpc/ConnectedPair.h"

namespace droxa {
namespace {

using Item = std::shared_ptr<const NSFileProviderItem>;
using Lines = std::vector<std::string>;
using Share = std::optional<CKShare>;

class SharingServiceConnection : public testing::Test {
 protected:
  SharingServiceConnection() { pair.serve<QVSharingService>(getSharingServiceInterface(), service); }
  std::shared_ptr<QVSharingService> remote(NSXPCErrorHandler handler = [](const NSError &error) {
    ADD_FAILURE() << error.description();
  }) {
    return pair.client->remoteObjectProxyWithErrorHandler<QVSharingService>(std::move(handler));
  }
  // For a call without a reply, which the end of the connection may come before.
  std::shared_ptr<QVSharingService> quiet() {
    return remote([](const NSError &) {});
  }
  // The service's progress, as one call's.
  std::shared_ptr<NSProgress> giveProgress(std::int64_t total) {
    service->progress = NSProgress::progressWithTotalUnitCount(total);
    return service->progress;
  }

  const std::shared_ptr<ScriptedSharingService> service = std::make_shared<ScriptedSharingService>();
  ConnectedPair pair;
};

bool shows(const NSProgress &progress, std::int64_t completed, std::int64_t total) {
  return eventually(
      [&] { return progress.completedUnitCount() == completed && progress.totalUnitCount() == total; });
}

TEST_F(SharingServiceConnection, eachCallAndItsReplyCrossWhole) {
  NSFileProviderItemFields fields;
  fields.itemIdentifier = "d7";
  service->isShared = true;
  service->item = std::make_shared<NSFileProviderPlainItem>(fields);
  service->first = QVSharingStrings({"a", "b"});
  service->second = QVSharingStrings(std::vector<std::string>());
  service->participants = wholeAnswers().participants;
  service->publicPermission = -3;
  service->share = wholeShare();
  service->url = NSURL::URLWithString("https://drive.example/a");
  service->error = NSError("Domain", 7, {{NSLocalizedDescriptionKey, std::string("no")}});
  const auto &error = service->error;

  const Once<bool, Item, NSError> info("info");
  remote()->fetchSharingInfo(info.completion());
  EXPECT_TRUE(info.value<0>());
  ASSERT_TRUE(info.value<1>());
  EXPECT_EQ(info.value<1>()->fields(), fields);
  EXPECT_EQ(info.value<2>(), error);

  const Once<bool, Item, QVSharingStrings, QVSharingStrings, NSError> preflight("preflight");
  EXPECT_FALSE(remote()->preflightCheckIfCurrentlyShareableWithCompletion(preflight.completion()));
  EXPECT_TRUE(preflight.value<0>());
  EXPECT_EQ(preflight.value<2>(), service->first);
  EXPECT_EQ(preflight.value<3>(), service->second);
  EXPECT_EQ(preflight.value<4>(), error);

  const Once<QVShareParticipants, std::int64_t, NSError> participants("participants");
  remote()->fetchParticipantListAndPublicPermission(participants.completion());
  EXPECT_EQ(participants.values(), (std::tuple(service->participants, std::int64_t{-3}, error)));

  const Once<Share, NSError> fetch("fetch"), save("save");
  remote()->fetchShareWithCompletion(fetch.completion());
  EXPECT_EQ(fetch.values(), (std::tuple(service->share, error)));
  remote()->saveShare(wholeShare(), save.completion());
  EXPECT_EQ(save.values(), (std::tuple(service->share, error)));

  const Once<NSURL, NSError> url("URL");
  remote()->fetchShareURLWithCompletion(url.completion());
  EXPECT_EQ(url.values(), (std::tuple(service->url, error)));

  const Once<NSError> unshare("unshare");
  remote()->unshareWithCompletion(unshare.completion());
  EXPECT_EQ(unshare.value<0>(), error);

  quiet()->startPreparingForShareWhenForcing(true);
  EXPECT_TRUE(service->log.waitFor("prepare, forced"));
  EXPECT_EQ(service->log.calls(),
            (Lines{"info", "preflight", "participants", "fetch", "save " + wholeShare().description(), "URL",
                   "unshare", "prepare, forced"}));
}

TEST_F(SharingServiceConnection, nilCrossesAsNil) {
  const Once<bool, Item, QVSharingStrings, QVSharingStrings, NSError> preflight("preflight");
  remote()->preflightCheckIfCurrentlyShareableWithCompletion(preflight.completion());
  EXPECT_EQ(preflight.values(),
            (std::tuple(false, Item(), QVSharingStrings(), QVSharingStrings(), NSError())));
  const Once<QVShareParticipants, std::int64_t, NSError> participants("participants");
  remote()->fetchParticipantListAndPublicPermission(participants.completion());
  EXPECT_FALSE(participants.value<0>());
  const Once<Share, NSError> save("save");
  remote()->saveShare(std::nullopt, save.completion());
  EXPECT_EQ(save.values(), (std::tuple(Share(), NSError())));
  const Once<NSURL, NSError> url("URL");
  remote()->fetchShareURLWithCompletion(url.completion());
  EXPECT_FALSE(url.value<0>());
  EXPECT_EQ(service->log.calls()[2], "save (null)");
}

TEST_F(SharingServiceConnection, aProgressIsThereAtOnceAndShowsTheRealOne) {
  const auto real = giveProgress(2);
  service->hold();
  const Once<NSError> done("unshare");
  const auto mirror = remote()->unshareWithCompletion(done.completion());
  ASSERT_TRUE(mirror);
  EXPECT_TRUE(shows(*mirror, 0, 2));
  real->setCompletedUnitCount(1);
  EXPECT_TRUE(shows(*mirror, 1, 2));
  real->setTotalUnitCount(5);
  EXPECT_TRUE(shows(*mirror, 1, 5));
  service->release();
  EXPECT_FALSE(done.value<0>());
  real->setCompletedUnitCount(5);
  EXPECT_TRUE(shows(*mirror, 5, 5)) << "also after the reply";
}

TEST_F(SharingServiceConnection, ofManyChangesTheLastOneArrives) {
  const auto real = giveProgress(100'000);
  const Once<Share, NSError> done("fetch");
  const auto mirror = remote()->fetchShareWithCompletion(done.completion());
  for (std::int64_t count = 1; count <= 100'000; ++count) real->setCompletedUnitCount(count);
  EXPECT_TRUE(shows(*mirror, 100'000, 100'000));
}

TEST_F(SharingServiceConnection, aNilProgressLeavesTheClientsAsItWasMade) {
  const Once<Share, NSError> done("fetch");
  const auto mirror = remote()->fetchShareWithCompletion(done.completion());
  EXPECT_FALSE(done.value<1>());
  ASSERT_TRUE(mirror);
  EXPECT_EQ(mirror->totalUnitCount(), -1);
  mirror->cancel();
  const Once<Share, NSError> next("next");
  remote()->fetchShareWithCompletion(next.completion());
  EXPECT_FALSE(next.value<1>());
}

TEST_F(SharingServiceConnection, cancellingReachesTheRealOneOnce) {
  for (const bool isEarly : {true, false}) {
    const auto real = giveProgress(1);
    std::atomic<int> cancelled{0};
    real->setCancellationHandler([&cancelled] { ++cancelled; });
    service->hold();
    const Once<Share, NSError> done("save");
    const auto mirror = remote()->saveShare(std::nullopt, done.completion());
    if (!isEarly) {
      EXPECT_TRUE(shows(*mirror, 0, 1));
    }
    mirror->cancel();
    mirror->cancel();
    EXPECT_TRUE(eventually([&cancelled] { return cancelled == 1; }));
    EXPECT_TRUE(real->isCancelled());
    EXPECT_EQ(done.calls(), 0) << "cancelling isn't the answer";
    service->release();
    EXPECT_TRUE(done.wait());
    EXPECT_EQ(cancelled, 1);
  }
}

TEST_F(SharingServiceConnection, lettingGoOfAProgressCancelsNothingAndKeepsNothing) {
  std::weak_ptr<NSProgress> real = giveProgress(1);
  service->hold();
  const Once<Share, NSError> done("fetch");
  auto mirror = remote()->fetchShareWithCompletion(done.completion());
  EXPECT_TRUE(shows(*mirror, 0, 1));
  mirror = nullptr;
  EXPECT_FALSE(real.lock()->isCancelled());
  service->progress = nullptr;
  EXPECT_TRUE(eventually([&real] { return real.expired(); })) << "the client held it alone";
  service->release();
  EXPECT_TRUE(done.wait());
}

TEST_F(SharingServiceConnection, theEndOfTheClientCancelsNothingAndTheEndOfTheServiceFailsItsCallsOnce) {
  const auto real = giveProgress(1);
  service->hold();
  std::atomic<int> failures{0}, replies{0};
  const auto proxy = remote([&failures](const NSError &) { ++failures; });
  const auto mirror =
      proxy->fetchShareWithCompletion([&replies](const Share &, const NSError &) { ++replies; });
  EXPECT_TRUE(shows(*mirror, 0, 1));
  pair.server->invalidate();
  EXPECT_TRUE(eventually([&failures] { return failures == 1; }));
  real->setCompletedUnitCount(1);  // nobody listens
  mirror->cancel();
  service->release();
  EXPECT_FALSE(real->isCancelled());
  EXPECT_EQ(replies, 0);
  EXPECT_EQ(failures, 1);
}

TEST_F(SharingServiceConnection, aSynchronousProxyAnswersBeforeItReturns) {
  service->share = wholeShare();
  Share share;
  pair.client
      ->synchronousRemoteObjectProxyWithErrorHandler<QVSharingService>(
          [](const NSError &error) { ADD_FAILURE() << error.description(); })
      ->fetchShareWithCompletion([&share](const Share &given, const NSError &) { share = given; });
  EXPECT_EQ(share, Share(wholeShare()));
}

TEST_F(SharingServiceConnection, callsAreServedBesideOneThatWaits) {
  service->hold();
  const Once<Share, NSError> waiting("waiting");
  remote()->fetchShareWithCompletion(waiting.completion());
  ASSERT_TRUE(service->log.waitFor("fetch"));
  quiet()->startPreparingForShareWhenForcing(false);
  EXPECT_TRUE(service->log.waitFor("prepare"));
  service->release();
  EXPECT_TRUE(waiting.wait());
}

}  // namespace
}  // namespace droxa
