#include <cerrno>
#include <gtest/gtest.h>

#include "enumeration/QVFileEnumerator.h"
#include "platform/usermanagement/UMUserManager.h"
#include "tessaly/QVNotifications.h"
#include "tessaly/QVPersona.h"
#include "tests/enumeration/EnumerationFixture.h"

namespace droxa {
namespace {

using Words = std::vector<std::string>;

constexpr char kAccountLine[] =
    "default: [NOTICE] received account did update notification, invalidating change token";

void post(const char *name) {
  NSNotificationCenter::defaultCenter().postNotificationName(name);
}

class FileEnumeratorNotifications : public EnumerationTest {
 protected:
  // A root enumerator whose update channel stands.
  std::shared_ptr<OpenFileEnumerator> makeListedRoot() {
    auto enumerator = makeForRoot();
    listPage(*enumerator, NSData());
    enumerator->drain();
    log.clear();
    return enumerator;
  }
  // One that observes accounts, but whose update channel was lost.
  std::shared_ptr<OpenFileEnumerator> makeWithoutChannel() {
    auto enumerator = makeListed();
    enumerator->_handleNotificationError(NSError(NSCocoaErrorDomain, NSXPCConnectionInterrupted));
    enumerator->drain();
    log.clear();
    return enumerator;
  }
};

TEST_F(FileEnumeratorNotifications, aFolderObservesTheAccountOnly) {
  EXPECT_EQ(makeListed()->registrations(), 1u);
}

TEST_F(FileEnumeratorNotifications, theRootObservesTheAccountAndTheContainers) {
  EXPECT_EQ(makeListedRoot()->registrations(), 2u);
}

TEST_F(FileEnumeratorNotifications, areObservedFromTheFirstListingOn) {
  const auto enumerator = makeForRoot();
  EXPECT_EQ(enumerator->registrations(), 0u);
  daemon.replies().hold("getItemUpdateSenderWithReceiver");
  const auto observer = std::make_shared<RecordingEnumerationObserver>();
  enumerator->enumerateItemsForObserver(observer, NSData());
  enumerator->drain();
  EXPECT_EQ(enumerator->registrations(), 2u);
  daemon.replies().release("getItemUpdateSenderWithReceiver");
  observer->waitForAnswer();
}

TEST_F(FileEnumeratorNotifications, areObservedOnceHoweverOftenTheFolderIsListed) {
  const auto enumerator = makeListedRoot();
  listPage(*enumerator, NSData());
  EXPECT_EQ(enumerator->registrations(), 2u);
  EXPECT_EQ(daemon.log().count("getContainers"), 1u);
}

TEST_F(FileEnumeratorNotifications, areNotObservedAfterInvalidation) {
  const auto enumerator = makeListedRoot();
  enumerator->invalidate();
  enumerator->drain();
  EXPECT_EQ(enumerator->registrations(), 0u);
  listPage(*enumerator, NSData());
  EXPECT_EQ(enumerator->registrations(), 0u);
}

TEST_F(FileEnumeratorNotifications, ofTheContainersExpireTheRootsToken) {
  const auto enumerator = makeListedRoot();
  const NSData anchor = currentAnchor(*enumerator);
  push(*enumerator, {live(1)});
  log.clear();
  const std::string tag = hexTag(QVLogSectionCreate(false) + 2);
  post(QVContainerListDidChangeNotification);
  EXPECT_EQ(logLines(),
            (Words{"debug: [DEBUG] ┏" + tag + " container list did change, invalidating our change token",
                   "debug: [DEBUG] invalidating change token",
                   "debug: [DEBUG] signal changes to fileproviderd", "debug: [DEBUG] ┗" + tag + " "}));
  EXPECT_EQ(host->signals(),
            (Words{NSFileProviderRootContainerItemIdentifier, NSFileProviderRootContainerItemIdentifier}));
  EXPECT_TRUE(isExpired(changesSince(*enumerator, anchor)->error()));
  EXPECT_TRUE(enumerator->hasSender());
}

TEST_F(FileEnumeratorNotifications, ofTheContainersDoNotReachAFolder) {
  const auto enumerator = makeListed();
  const NSData anchor = currentAnchor(*enumerator);
  post(QVContainerListDidChangeNotification);
  EXPECT_EQ(logLines(), Words{});
  EXPECT_EQ(currentAnchor(*enumerator), anchor);
}

TEST_F(FileEnumeratorNotifications, ofTheAccountExpireTheTokenWithoutAChannel) {
  const auto enumerator = makeWithoutChannel();
  const NSData anchor = currentAnchor(*enumerator);
  post(QVAccountTokenDidChangeNotification);
  EXPECT_EQ(logLines(), (Words{kAccountLine, "debug: [DEBUG] invalidating change token",
                               "debug: [DEBUG] signal changes to fileproviderd"}));
  EXPECT_EQ(host->signals(), Words{folder.asString()});
  EXPECT_TRUE(isExpired(changesSince(*enumerator, anchor)->error()));
}

TEST_F(FileEnumeratorNotifications, ofTheAccountDoNothingButSaySoWhileTheChannelStands) {
  const auto enumerator = makeListed();
  const NSData anchor = currentAnchor(*enumerator);
  post(QVAccountTokenDidChangeNotification);
  EXPECT_EQ(logLines(), Words{kAccountLine});
  EXPECT_EQ(host->signalCount(), 0u);
  EXPECT_EQ(changesSince(*enumerator, anchor)->error(), NSError());
}

TEST_F(FileEnumeratorNotifications, ofTheAccountExpireTheTokenDuringASetup) {
  const auto enumerator = makeForFolder();
  const NSData anchor = currentAnchor(*enumerator);
  daemon.replies().hold("getItemUpdateSenderWithReceiver");
  const auto observer = std::make_shared<RecordingEnumerationObserver>();
  enumerator->enumerateItemsForObserver(observer, NSData());
  enumerator->drain();
  post(QVAccountTokenDidChangeNotification);
  EXPECT_NE(currentAnchor(*enumerator), anchor);
  daemon.replies().release("getItemUpdateSenderWithReceiver");
  EXPECT_EQ(observer->error(), NSError());
}

TEST_F(FileEnumeratorNotifications, ofTheAccountWaitForTheQueue) {
  const auto enumerator = makeWithoutChannel();
  const NSData anchor = currentAnchor(*enumerator);
  // Whatever was queued before has run when the post returns.
  bool ran = false;
  dispatch_async(enumerator->_queue, [&] { ran = true; });
  post(QVAccountTokenDidChangeNotification);
  EXPECT_TRUE(ran);
  EXPECT_NE(currentAnchor(*enumerator), anchor);
}

TEST_F(FileEnumeratorNotifications, areNotReceivedAfterInvalidation) {
  const auto enumerator = makeListedRoot();
  enumerator->invalidate();
  enumerator->drain();
  log.clear();
  post(QVAccountTokenDidChangeNotification);
  post(QVContainerListDidChangeNotification);
  EXPECT_EQ(logLines(), Words{});
}

TEST_F(FileEnumeratorNotifications, doNotKeepTheEnumeratorAlive) {
  auto enumerator = OpenFileEnumerator::make(folder, daemon.url("Folder"), folder.asString(), false);
  dispatch_sync(enumerator->_queue, [&] { enumerator->_startObservingAccountChangesIfNeeded(); });
  EXPECT_EQ(enumerator->registrations(), 1u);
  const std::weak_ptr<OpenFileEnumerator> weak = enumerator;
  enumerator.reset();
  EXPECT_TRUE(weak.expired());
  post(QVAccountTokenDidChangeNotification);
  EXPECT_EQ(logLines(), Words{});
}

// Both handlers adopt the enumerator's persona, and do their work in any case.
class FileEnumeratorPersona : public FileEnumeratorNotifications,
                              public ::testing::WithParamInterface<const char *> {
 protected:
  FileEnumeratorPersona() {
    qvc_block_remember_persona = [](QVBlock block) { return block; };
    configuration_.personas = {{"work", true}, {"school", true}};
    configuration_.processPersona = "work";
    UMSetConfiguration(configuration_);
    enumerator_ = makeForRoot();
    dispatch_sync(enumerator_->_queue, [&] { enumerator_->_startObservingAccountChangesIfNeeded(); });
    log.clear();
    host->whenSignalled([this](const std::string &) { during_ = currentPersona(); });
  }
  ~FileEnumeratorPersona() override {
    qvc_block_remember_persona = nullptr;
    UMSetConfiguration({});
  }

  static std::optional<std::string> currentPersona() {
    return UMUserManager::sharedManager().currentPersona()->userPersonaUniqueString();
  }
  // Posts the notification on a thread that runs under `persona`.
  void postUnder(const std::optional<std::string> &persona) {
    configuration_.processPersona = persona;
    UMSetConfiguration(configuration_);
    const NSData anchor = currentAnchor(*enumerator_);
    post(GetParam());
    EXPECT_NE(currentAnchor(*enumerator_), anchor);
    EXPECT_EQ(host->signalCount(), 1u);
  }
  void refuseArbitraryPersonas() { configuration_.mayUseArbitraryPersonas = false; }
  void failSwitching(NSError error) { configuration_.failSwitching = std::move(error); }
  void failSaving(NSError error) { configuration_.failSaving = std::move(error); }

  std::optional<std::string> during_;

 private:
  UMConfiguration configuration_;
  std::shared_ptr<OpenFileEnumerator> enumerator_;
};

TEST_P(FileEnumeratorPersona, isLeftAloneWhenItIsTheCurrentOne) {
  refuseArbitraryPersonas();
  failSwitching(NSError(NSPOSIXErrorDomain, EPERM));
  postUnder("work");
  EXPECT_EQ(during_, "work");
  EXPECT_EQ(currentPersona(), "work");
  for (const std::string &line : logLines()) EXPECT_EQ(line.find("adopt"), std::string::npos) << line;
}

TEST_P(FileEnumeratorPersona, isAdoptedAndThePostersIsRestored) {
  postUnder("school");
  EXPECT_EQ(during_, "work");
  EXPECT_EQ(currentPersona(), "school");
}

TEST_P(FileEnumeratorPersona, isAdoptedFromTheDefaultOne) {
  postUnder(std::nullopt);
  EXPECT_EQ(during_, "work");
  EXPECT_EQ(currentPersona(), std::nullopt);
}

TEST_P(FileEnumeratorPersona, isDispensedWithWhereItMayNotBeAdopted) {
  refuseArbitraryPersonas();
  postUnder("school");
  EXPECT_EQ(during_, "school");
  EXPECT_EQ(currentPersona(), "school");
  EXPECT_EQ(logLines().front(), "debug: [DEBUG] Not allowed to adopt persona - should fallback persona");
}

TEST_P(FileEnumeratorPersona, isDispensedWithWhenTheSwitchFails) {
  const NSError error(NSPOSIXErrorDomain, EPERM);
  failSwitching(error);
  postUnder("school");
  EXPECT_EQ(during_, "school");
  EXPECT_EQ(currentPersona(), "school");
  EXPECT_EQ(logLines().front(), "error: [ERROR] Can't adopt persona work: " + error.description());
}

TEST_P(FileEnumeratorPersona, isAdoptedEvenIfThePostersCanNotBeSaved) {
  const NSError error(NSPOSIXErrorDomain, ENOMEM);
  failSaving(error);
  postUnder("school");
  EXPECT_EQ(during_, "work");
  EXPECT_EQ(logLines().front(), "error: [ERROR] won't restore persona: " + error.description());
}

INSTANTIATE_TEST_SUITE_P(Handlers, FileEnumeratorPersona,
                         ::testing::Values(QVAccountTokenDidChangeNotification,
                                           QVContainerListDidChangeNotification),
                         [](const auto &handler) { return std::string(handler.param); });

}  // namespace
}  // namespace droxa
