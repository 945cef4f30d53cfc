#include <gtest/gtest.h>

#include "additions/QVPersonaAdoption.h"
#include "enumeration/QVFileEnumerator.h"
#include "tessaly/QVPersona.h"
#include "tests/enumeration/EnumerationFixture.h"
#include "tests/enumeration/ScriptedDaemon.h"

namespace droxa {
namespace {

using Words = std::vector<std::string>;

constexpr char kAssertion[] = "fault: [CRIT] Assertion failed: !_isSettingUpNotificationReceiving";

class FileEnumeratorSetup : public EnumerationTest {
 protected:
  // The daemon's calls of a first listing.
  Words setupAndListing(const std::string &path, int options, const std::string &listed) const {
    return {"getItemUpdateSenderWithReceiver()",
            "sender 1: remoteObjectProxyWithErrorHandler",
            "sender 1: boostPriority",
            "sender 1: remoteObjectProxyWithErrorHandler",
            "sender 1: watchItemAtURL(" + path + ", options " + std::to_string(options) + ")",
            "enumerateItemsInFolder(" + listed + ", sort 0, offset 0, limit 200)"};
  }
  // A listing that the daemon hasn't answered the setup of yet.
  std::shared_ptr<RecordingEnumerationObserver> startHeldListing(OpenFileEnumerator &enumerator) {
    daemon.replies().hold("getItemUpdateSenderWithReceiver");
    const auto observer = std::make_shared<RecordingEnumerationObserver>();
    enumerator.enumerateItemsForObserver(observer, NSData());
    enumerator.drain();
    return observer;
  }
};
using FileEnumeratorSetupDeathTest = FileEnumeratorSetup;

TEST_F(FileEnumeratorSetup, refusesANilURL) {
  EXPECT_EQ(QVFileEnumerator::initWithFileObjectID(folder, NSURL(), folder.asString(), false), nullptr);
  EXPECT_EQ(logLines(), Words{"error: [ERROR] can't create a file enumeration without a url"});
}

TEST_F(FileEnumeratorSetup, makesAnEnumeratorOfAURL) {
  const auto enumerator =
      QVFileEnumerator::initWithFileObjectID(folder, daemon.url("Folder"), folder.asString(), false);
  ASSERT_NE(enumerator, nullptr);
  EXPECT_TRUE(enumerator->supportsChanges());
  EXPECT_EQ(logLines(), Words{});
  EXPECT_EQ(listPage(*enumerator, NSData())->error(), NSError());
  enumerator->invalidate();
}

TEST_F(FileEnumeratorSetup, watchesTheFolderBeforeItIsListed) {
  listPage(*makeForFolder(), NSData());
  EXPECT_EQ(daemon.calls(), setupAndListing(daemon.url("Folder").path(), 19, folder.asString()));
}

TEST_F(FileEnumeratorSetup, watchesTheSubtreeWhenRecursive) {
  listPage(*makeForFolder(true), NSData());
  EXPECT_EQ(daemon.calls(), setupAndListing(daemon.url("Folder").path(), 23, folder.asString()));
}

TEST_F(FileEnumeratorSetup, looksAtTheContainersFirstForTheRoot) {
  listPage(*makeForRoot(), NSData());
  Words expected = setupAndListing(daemon.url("").path(), 19, "root");
  expected.insert(expected.begin(), "getContainers()");
  EXPECT_EQ(daemon.calls(), expected);
}

TEST_F(FileEnumeratorSetup, keepsTheChannelForTheNextListing) {
  const auto enumerator = makeListed();
  EXPECT_TRUE(enumerator->hasSender());
  listPage(*enumerator, NSData());
  EXPECT_EQ(daemon.calls(),
            Words{"enumerateItemsInFolder(" + folder.asString() + ", sort 0, offset 0, limit 200)"});
  EXPECT_EQ(countOfLines(kAssertion), 0u);
}

TEST_F(FileEnumeratorSetup, doesNotWaitForTheWatch) {
  daemon.replies().hold("watchItemAtURL");
  const auto enumerator = makeForFolder();
  EXPECT_EQ(listPage(*enumerator, NSData())->error(), NSError());
  EXPECT_EQ(daemon.replies().heldCount("watchItemAtURL"), 1u);
  daemon.replies().release("watchItemAtURL");
  enumerator->drain();
  EXPECT_TRUE(enumerator->hasSender());
}

TEST_F(FileEnumeratorSetup, completesOnTheQueue) {
  const auto enumerator = makeForFolder();
  for (int i = 0; i < 2; ++i) {  // without and with a channel
    Once<bool> onQueue("setup");
    enumerator->setupNotificationReceivingIfNeededWithCompletion(
        [&](const NSError &) { onQueue.completion()(dispatch_queue_is_current(enumerator->_queue)); });
    EXPECT_TRUE(onQueue.value<0>());
  }
}

TEST_F(FileEnumeratorSetup, runsUnderTheCallersPersona) {
  qvc_block_remember_persona = [](QVBlock block) -> QVBlock {
    const auto persona = UMUserManager::sharedManager().currentPersona()->userPersonaUniqueString();
    return [persona, block = std::move(block)] { QVAdoptPersona(persona, block); };
  };
  UMConfiguration configuration;
  configuration.personas = {{"work", true}, {"school", true}};
  configuration.processPersona = "work";
  UMSetConfiguration(configuration);
  const auto enumerator = makeForFolder();
  for (int i = 0; i < 2; ++i) {  // without and with a channel
    const QVPersonaAdoption adoption("school");
    Once<std::string> persona("setup");
    enumerator->setupNotificationReceivingIfNeededWithCompletion([&](const NSError &) {
      persona.completion()(*UMUserManager::sharedManager().currentPersona()->userPersonaUniqueString());
    });
    EXPECT_EQ(persona.value<0>(), "school");
  }
  enumerator->drain();
  qvc_block_remember_persona = nullptr;
  UMSetConfiguration({});
}

TEST_F(FileEnumeratorSetup, failsTheListingWithTheDaemonsError) {
  const NSError error = qvc_errorLoggedOut();
  daemon.replies().failNext("getItemUpdateSenderWithReceiver", error);
  const auto enumerator = makeForFolder();
  const auto observer = listPage(*enumerator, NSData());
  EXPECT_EQ(observer->story(), Words{"failed"});
  EXPECT_TRUE(observer->error().is(NSFileProviderErrorDomain, NSFileProviderErrorNotAuthenticated));
  EXPECT_TRUE(observer->error().underlyingError().isSameObject(error));
  EXPECT_EQ(daemon.calls(), Words{"getItemUpdateSenderWithReceiver()"});
  EXPECT_FALSE(enumerator->hasSender());
}

TEST_F(FileEnumeratorSetup, failsTheListingWithTheConnectionsError) {
  const NSError error(QVTessalyErrorDomain, QVErrorNoSuchItem);
  daemon.replies().failNextInTransport("getItemUpdateSenderWithReceiver", error);
  const auto observer = listPage(*makeForFolder(), NSData());
  EXPECT_EQ(observer->story(), Words{"failed"});
  EXPECT_TRUE(observer->error().is(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem));
  EXPECT_TRUE(observer->error().underlyingError().isSameObject(error));
}

TEST_F(FileEnumeratorSetup, survivesAReplyWithoutASender) {
  const auto scripted = ScriptedDaemon::install();
  const auto enumerator = makeForFolder();
  EXPECT_EQ(listPage(*enumerator, NSData())->error(), NSError());
  EXPECT_FALSE(enumerator->hasSender());
}

TEST_F(FileEnumeratorSetup, isTriedAgainByTheNextListing) {
  const auto enumerator = makeForFolder();
  daemon.replies().failNext("getItemUpdateSenderWithReceiver", qvc_errorLoggedOut());
  daemon.replies().failNextInTransport("getItemUpdateSenderWithReceiver", NSError(NSCocoaErrorDomain, 4097));
  for (int i = 0; i < 2; ++i) EXPECT_TRUE(listPage(*enumerator, NSData())->error());
  EXPECT_EQ(listPage(*enumerator, NSData())->error(), NSError());
  EXPECT_TRUE(enumerator->hasSender());
  EXPECT_EQ(countOfLines(kAssertion), 0u);
}

TEST_F(FileEnumeratorSetup, isAnsweredWhenTheDaemonDiesDuringIt) {
  const auto enumerator = makeForFolder();
  const auto observer = startHeldListing(*enumerator);
  fake.connection->breakOff(NSError(NSCocoaErrorDomain, NSXPCConnectionInterrupted));
  EXPECT_EQ(observer->error(), NSError(NSCocoaErrorDomain, NSXPCConnectionInterrupted));
  daemon.replies().release("getItemUpdateSenderWithReceiver");
  EXPECT_EQ(listPage(*enumerator, NSData())->error(), NSError());
}

TEST_F(FileEnumeratorSetup, neverKeepsASenderThatComesAfterInvalidation) {
  const auto enumerator = makeForFolder();
  const auto observer = startHeldListing(*enumerator);
  enumerator->invalidate();
  enumerator->drain();
  daemon.replies().release("getItemUpdateSenderWithReceiver");
  EXPECT_EQ(observer->story(), (Words{"didEnumerateItems(0)", "finished"}));
  EXPECT_FALSE(enumerator->hasSender());
  EXPECT_EQ(daemon.calls(),
            (Words{"getItemUpdateSenderWithReceiver()", "sender 1: invalidate",
                   "enumerateItemsInFolder(" + folder.asString() + ", sort 0, offset 0, limit 200)"}));
}

TEST_F(FileEnumeratorSetup, afterInvalidationStillListsButKeepsNoSender) {
  const auto enumerator = makeForFolder();
  enumerator->invalidate();
  EXPECT_EQ(listPage(*enumerator, NSData())->error(), NSError());
  EXPECT_EQ(daemon.calls(),
            (Words{"getItemUpdateSenderWithReceiver()", "sender 1: invalidate",
                   "enumerateItemsInFolder(" + folder.asString() + ", sort 0, offset 0, limit 200)"}));
}

TEST_F(FileEnumeratorSetup, goesOnWhenTwoListingsMeetInIt) {
  const auto enumerator = makeForFolder();
  const auto first = startHeldListing(*enumerator);
  EXPECT_EQ(countOfLines(kAssertion), 0u);
  const auto second = startHeldListing(*enumerator);
  EXPECT_EQ(countOfLines(kAssertion), 1u);
  EXPECT_EQ(daemon.calls(),
            (Words{"getItemUpdateSenderWithReceiver()", "getItemUpdateSenderWithReceiver()"}));
  daemon.replies().release("getItemUpdateSenderWithReceiver");
  EXPECT_EQ(first->error(), NSError());
  EXPECT_EQ(second->error(), NSError());
  log.clear();
  EXPECT_EQ(listPage(*enumerator, NSData())->error(), NSError());
  EXPECT_EQ(countOfLines(kAssertion), 0u);
}

TEST_F(FileEnumeratorSetup, endsWithTheSenderInvalidatedOnTheQueue) {
  const auto enumerator = makeListed();
  enumerator->invalidate();
  enumerator->drain();
  EXPECT_EQ(daemon.calls(), Words{"sender 1: invalidate"});
  EXPECT_FALSE(enumerator->hasSender());
  enumerator->invalidate();
  enumerator->drain();
  EXPECT_EQ(daemon.calls(), Words{"sender 1: invalidate"});
}

TEST_F(FileEnumeratorSetup, leavesNothingThatHoldsTheEnumeratorAfterInvalidation) {
  auto enumerator =
      QVFileEnumerator::initWithFileObjectID(folder, daemon.url("Folder"), folder.asString(), false);
  listPage(*enumerator, NSData());
  enumerator->invalidate();
  const std::weak_ptr<QVFileEnumerator> weak = enumerator;
  enumerator.reset();
  EXPECT_TRUE(eventually([&] { return weak.expired(); }));
}

TEST_F(FileEnumeratorSetupDeathTest, belongsOnTheQueue) {
  const auto enumerator = makeForFolder();
  EXPECT_DEATH(enumerator->_setupNotificationReceivingIfNeededWithCompletion([](const NSError &) {}),
               "file-enumerator");
}

TEST_F(FileEnumeratorSetupDeathTest, observingAccountsBelongsOnTheQueue) {
  const auto enumerator = makeForFolder();
  EXPECT_DEATH(enumerator->_startObservingAccountChangesIfNeeded(), "file-enumerator");
}

}  // namespace
}  // namespace droxa
