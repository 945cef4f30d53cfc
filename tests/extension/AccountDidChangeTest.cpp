#include <algorithm>
#include <cerrno>

#include "tests/extension/ExtensionFixture.h"
#include "tests/support/Eventually.h"

namespace droxa {
namespace {

const std::string kReceived =
    "debug: [DEBUG] received account did update notification, signal changes to fileproviderd";

bool contains(const Lines &lines, const std::string &line) {
  return std::find(lines.begin(), lines.end(), line) != lines.end();
}

using AccountDidChange = ExtensionTest;

TEST_F(AccountDidChange, signalsTheRootContainerAlone) {
  const auto extension = makeExtension();
  postAccountChange();
  EXPECT_TRUE(host->waitForSignals(1));
  EXPECT_EQ(host->signals(), Lines{NSFileProviderRootContainerItemIdentifier});
  EXPECT_EQ(logged(), Lines{kReceived});
}

TEST_F(AccountDidChange, theDaemonsNotificationReachesIt) {
  const auto extension = makeExtension();
  daemon.notify(QVAccountTokenDidChangeNotification);
  EXPECT_TRUE(host->waitForSignals(1));
}

TEST_F(AccountDidChange, aSignalThatFailsIsLogged) {
  const auto extension = makeExtension();
  const NSError failure(NSPOSIXErrorDomain, EPIPE);
  host->answerWith(failure);
  postAccountChange();
  const std::string line =
      "error: [ERROR] failed to signal enumerator for root container: " + failure.description();
  EXPECT_TRUE(eventually([&] { return contains(logged(), line); }));
  EXPECT_EQ(logged(), (Lines{kReceived, line}));
  EXPECT_EQ(host->signalCount(), 1u) << "it isn't tried again";
}

class ManagedAccountDidChange : public ManagedExtensionTest {
 protected:
  // Under which persona the signal is sent after an account change that is posted under the current one.
  std::string personaOfSignal() {
    std::string seen = "no signal";
    host->whenSignalled([&seen](const std::string &) { seen = currentPersona(); });
    postAccountChange();
    host->whenSignalled({});
    return seen;
  }
};

TEST_F(ManagedAccountDidChange, signalsUnderTheRememberedPersona) {
  startUnder("work");
  const auto extension = makeExtension();
  runThreadUnder("school");
  EXPECT_EQ(personaOfSignal(), "work");
  EXPECT_EQ(currentPersona(), "school");
  EXPECT_EQ(logged(), Lines{kReceived});
}

TEST_F(ManagedAccountDidChange, signalsUnderTheDefaultPersonaWhenThatIsRemembered) {
  startUnder(std::nullopt);
  const auto extension = makeExtension();
  EXPECT_EQ(extension->personaID(), "__defaultPersonaID__");
  runThreadUnder("school");
  EXPECT_EQ(personaOfSignal(), "personal");
  EXPECT_EQ(currentPersona(), "school");
}

TEST_F(ManagedAccountDidChange, signalsEvenWithoutTheRightToSwitch) {
  startUnder("work");
  const auto extension = makeExtension();
  runThreadUnder("school",
                 [](UMConfiguration &configuration) { configuration.mayUseArbitraryPersonas = false; });
  EXPECT_EQ(personaOfSignal(), "school");
  EXPECT_EQ(host->signals(), Lines{NSFileProviderRootContainerItemIdentifier});
  EXPECT_EQ(logged(),
            (Lines{"debug: [DEBUG] Not allowed to adopt persona - should fallback persona", kReceived}));
}

TEST_F(ManagedAccountDidChange, signalsEvenWhenTheSwitchFails) {
  startUnder("work");
  const auto extension = makeExtension();
  const NSError failure(NSPOSIXErrorDomain, EPERM);
  runThreadUnder("school", [&](UMConfiguration &configuration) { configuration.failSwitching = failure; });
  EXPECT_EQ(personaOfSignal(), "school");
  EXPECT_EQ(logged(),
            (Lines{"error: [ERROR] Can't adopt persona work: " + failure.description(), kReceived}));
}

}  // namespace
}  // namespace droxa
