#include <algorithm>
#include <fcntl.h>
#include <sys/stat.h>

#include "extension/QVFileProviderExtension.h"
#include "platform/foundation/NSFileHandle.h"
#include "platform/foundation/NSFileHandleTesting.h"
#include "tests/extension/ExtensionFixture.h"

namespace droxa {
namespace {

// How many descriptors of this process lead to `path`.
std::size_t openDescriptorsOf(const std::string &path) {
  std::size_t count = 0;
  for (const auto &entry : std::filesystem::directory_iterator("/proc/self/fd")) {
    std::error_code error;
    const auto target = std::filesystem::read_symlink(entry.path(), error);
    if (!error && target == path) ++count;
  }
  return count;
}

std::size_t registrations(const std::shared_ptr<QVFileProviderExtension> &extension) {
  return NSNotificationCenter::defaultCenter().registrationCount(extension.get());
}

using Extension = ExtensionTest;

TEST_F(Extension, withoutPersonasRemembersNoneAndAssertsNothing) {
  const auto extension = QVFileProviderExtension::init();
  ASSERT_TRUE(extension);
  EXPECT_EQ(extension->personaID(), std::nullopt);
  EXPECT_EQ(extension->witness(), nullptr);
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(Extension, followsTheDaemonsAccountChangesFromItsMakingOn) {
  const auto extension = QVFileProviderExtension::init();
  EXPECT_EQ(asked(), Lines{"subscribeToNotifications()"});
  EXPECT_EQ(registrations(extension), 1u);
}

TEST_F(Extension, stopsFollowingWhenItGoes) {
  auto extension = QVFileProviderExtension::init();
  const void *address = extension.get();
  extension.reset();
  EXPECT_EQ(NSNotificationCenter::defaultCenter().registrationCount(address), 0u);
  postAccountChange();
  EXPECT_EQ(host->signalCount(), 0u);
}

TEST_F(Extension, severalMayLiveInOneProcess) {
  const auto first = QVFileProviderExtension::init();
  auto second = QVFileProviderExtension::init();
  second.reset();
  postAccountChange();
  EXPECT_TRUE(host->waitForSignals(1));
  EXPECT_EQ(host->signalCount(), 1u);
}

class ManagedExtension : public ManagedExtensionTest {
 protected:
  ManagedExtension() { NSSetHomeDirectory(userHome.path()); }
  ~ManagedExtension() override { NSSetHomeDirectory(std::nullopt); }
  const TemporaryFolder userHome;
};

TEST_F(ManagedExtension, remembersItsPersonaAndHoldsTheHomeDirectoryOpen) {
  startUnder("work");
  auto extension = QVFileProviderExtension::init();
  EXPECT_EQ(extension->personaID(), "work");
  ASSERT_TRUE(extension->witness());
  const int descriptor = extension->witness()->fileDescriptor();
  EXPECT_EQ(fcntl(descriptor, F_GETFL) & O_ACCMODE, O_RDONLY);
  EXPECT_EQ(openDescriptorsOf(userHome.path()), 1u);
  EXPECT_EQ(logged(), Lines{});

  extension.reset();
  EXPECT_EQ(openDescriptorsOf(userHome.path()), 0u);
}

TEST_F(ManagedExtension, complainsOfAPersonaWithoutDataSeparationAndGoesOn) {
  startUnder(std::nullopt);
  const auto extension = QVFileProviderExtension::init();
  ASSERT_TRUE(extension);
  EXPECT_EQ(extension->personaID(), "__defaultPersonaID__");
  EXPECT_TRUE(extension->witness());
  EXPECT_EQ(logged(), Lines{"fault: [CRIT] Assertion failed: dataSeparated"});
}

TEST_F(ManagedExtension, complainsOfAHomeDirectoryThatCantBeOpenedAndGoesOn) {
  startUnder("work");
  NSSetHomeDirectory(userHome.path() + "/missing");
  const auto extension = QVFileProviderExtension::init();
  ASSERT_TRUE(extension);
  ASSERT_TRUE(extension->witness()) << "a handle is made of the negative descriptor too";
  EXPECT_LT(extension->witness()->fileDescriptor(), 0);
  EXPECT_EQ(logged(), Lines{"fault: [CRIT] Assertion failed: fd >= 0"});
}

TEST_F(ManagedExtension, complainsOfAWitnessThatIsntMadeAndGoesOn) {
  startUnder("work");
  const NSFileHandleInitFailure failure;
  const auto extension = QVFileProviderExtension::init();
  ASSERT_TRUE(extension);
  EXPECT_FALSE(extension->witness());
  EXPECT_EQ(logged(), Lines{"fault: [CRIT] Assertion failed: _witness != nil"});
  EXPECT_EQ(openDescriptorsOf(userHome.path()), 0u);
}

TEST_F(ManagedExtension, complainsOfEverythingInOrder) {
  startUnder(std::nullopt);
  NSSetHomeDirectory(userHome.path() + "/missing");
  const NSFileHandleInitFailure failure;
  const auto extension = QVFileProviderExtension::init();
  ASSERT_TRUE(extension);
  EXPECT_EQ(registrations(extension), 1u);
  EXPECT_EQ(logged(),
            (Lines{"fault: [CRIT] Assertion failed: dataSeparated", "fault: [CRIT] Assertion failed: fd >= 0",
                   "fault: [CRIT] Assertion failed: _witness != nil"}));
}

}  // namespace
}  // namespace droxa
