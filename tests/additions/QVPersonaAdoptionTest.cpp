#include <cerrno>
#include <gtest/gtest.h>
#include <stdexcept>
#include <string>
#include <vector>

#include "additions/QVPersonaAdoption.h"
#include "tessaly/QVPersona.h"
#include "tests/support/LogLines.h"

namespace droxa {
namespace {

using Lines = std::vector<std::string>;
using Persona = std::optional<std::string>;

const Lines kNotAllowed{"debug: [DEBUG] Not allowed to adopt persona - should fallback persona"};

// The unique string of the calling thread's persona; "personal" for the default one.
std::string currentPersona() {
  return UMUserManager::sharedManager().currentPersona()->userPersonaUniqueString().value_or("personal");
}

// Two managed personas, and a thread that runs under the one that the test names.
class PersonaAdoption : public testing::Test {
 protected:
  ~PersonaAdoption() override { UMSetConfiguration({}); }

  void startUnder(const Persona &persona, const std::function<void(UMConfiguration &)> &change = {}) {
    UMConfiguration configuration;
    configuration.personas = {{"work", true}, {"school", true}};
    configuration.processPersona = persona;
    if (change) change(configuration);
    UMSetConfiguration(configuration);
  }

  // Runs work under `persona`; what it ran under, "not run" when it wasn't.
  std::string personaOfWork(const Persona &persona) {
    std::string seen = "not run";
    const bool ran = QVAdoptPersona(persona, [&seen] { seen = currentPersona(); });
    EXPECT_EQ(ran, seen != "not run");
    return seen;
  }

  Lines logged() const { return logLines(capture_); }

 private:
  const OSLogCapture capture_;
};

TEST_F(PersonaAdoption, theDefaultPersonaNeedsNoSwitchOnAThreadWithoutDataSeparation) {
  startUnder(std::nullopt, [](UMConfiguration &c) { c.mayUseArbitraryPersonas = false; });
  EXPECT_EQ(personaOfWork(QVDefaultPersonaID), "personal");
  EXPECT_EQ(personaOfWork(std::nullopt), "personal");
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(PersonaAdoption, theCurrentPersonaNeedsNoSwitch) {
  startUnder("work", [](UMConfiguration &c) { c.mayUseArbitraryPersonas = false; });
  EXPECT_EQ(personaOfWork("work"), "work");
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(PersonaAdoption, switchesFromTheDefaultPersonaAndRestoresIt) {
  startUnder(std::nullopt);
  EXPECT_EQ(personaOfWork("work"), "work");
  EXPECT_EQ(currentPersona(), "personal");
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(PersonaAdoption, switchesToTheDefaultPersonaAndRestoresTheSeparatedOne) {
  for (const Persona &remembered : {Persona(QVDefaultPersonaID), Persona()}) {
    startUnder("work");
    EXPECT_EQ(personaOfWork(remembered), "personal");
    EXPECT_EQ(currentPersona(), "work");
  }
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(PersonaAdoption, switchesBetweenSeparatedPersonas) {
  startUnder("work");
  EXPECT_EQ(personaOfWork("school"), "school");
  EXPECT_EQ(currentPersona(), "work");
}

TEST_F(PersonaAdoption, aPersonaWithoutDataSeparationCountsAsTheDefaultOne) {
  startUnder(std::nullopt, [](UMConfiguration &c) {
    c.personalUniqueString = "me";
    c.mayUseArbitraryPersonas = false;
  });
  EXPECT_EQ(personaOfWork(std::nullopt), "me") << "already wanted: the current string counts as nil";
  EXPECT_EQ(personaOfWork("me"), "not run") << "wanted by name: nil differs from it";
  EXPECT_EQ(logged(), kNotAllowed);
}

TEST_F(PersonaAdoption, isRefusedWhereTheProcessMayNotChoosePersonas) {
  startUnder(std::nullopt, [](UMConfiguration &c) { c.mayUseArbitraryPersonas = false; });
  EXPECT_EQ(personaOfWork("work"), "not run");
  EXPECT_EQ(currentPersona(), "personal");
  EXPECT_EQ(logged(), kNotAllowed);

  const QVPersonaAdoption adoption(Persona("work"));
  EXPECT_FALSE(adoption.adopted());
  EXPECT_EQ(adoption.error(), NSError(NSPOSIXErrorDomain, EINVAL));
}

TEST_F(PersonaAdoption, aPersonaThatCantBeSavedIsLeftAllTheSame) {
  const NSError failure(NSPOSIXErrorDomain, EIO);
  startUnder("work", [&](UMConfiguration &c) { c.failSaving = failure; });
  EXPECT_EQ(personaOfWork("school"), "school");
  EXPECT_EQ(currentPersona(), "school") << "nothing was saved, so nothing is restored";
  EXPECT_EQ(logged(), (Lines{"error: [ERROR] won't restore persona: " + failure.description()}));
}

TEST_F(PersonaAdoption, aFailedSwitchLeavesTheWorkUndone) {
  const NSError failure(NSPOSIXErrorDomain, EPERM);
  startUnder("work", [&](UMConfiguration &c) { c.failSwitching = failure; });
  EXPECT_EQ(personaOfWork("school"), "not run");
  EXPECT_EQ(currentPersona(), "work");
  EXPECT_EQ(logged(), (Lines{"error: [ERROR] Can't adopt persona school: " + failure.description()}));
}

TEST_F(PersonaAdoption, aFailedSwitchNamesThePersonaAsItWasRemembered) {
  const NSError failure(NSPOSIXErrorDomain, EPERM);
  startUnder("work", [&](UMConfiguration &c) { c.failSwitching = failure; });
  EXPECT_EQ(personaOfWork(QVDefaultPersonaID), "not run");
  EXPECT_EQ(personaOfWork(std::nullopt), "not run");
  EXPECT_EQ(logged(),
            (Lines{"error: [ERROR] Can't adopt persona __defaultPersonaID__: " + failure.description(),
                   "error: [ERROR] Can't adopt persona (null): " + failure.description()}));
}

TEST_F(PersonaAdoption, savingAndSwitchingMayBothFail) {
  const NSError saving(NSPOSIXErrorDomain, EIO);
  const NSError switching(NSPOSIXErrorDomain, EPERM);
  startUnder("work", [&](UMConfiguration &c) {
    c.failSaving = saving;
    c.failSwitching = switching;
  });
  EXPECT_EQ(personaOfWork("school"), "not run");
  EXPECT_EQ(logged(), (Lines{"error: [ERROR] won't restore persona: " + saving.description(),
                             "error: [ERROR] Can't adopt persona school: " + switching.description()}));
}

TEST_F(PersonaAdoption, aPersonaThatIsntKnownCantBeAdopted) {
  startUnder(std::nullopt);
  const QVPersonaAdoption adoption(Persona("nobody"));
  EXPECT_FALSE(adoption.adopted());
  EXPECT_TRUE(adoption.error().is(NSPOSIXErrorDomain, ENOENT));
  EXPECT_EQ(logged(),
            (Lines{"error: [ERROR] Can't adopt persona nobody: " + adoption.error().description()}));
}

TEST_F(PersonaAdoption, adoptionsNest) {
  startUnder(std::nullopt);
  Lines seen;
  QVAdoptPersona("work", [&] {
    QVAdoptPersona("school", [&] {
      QVAdoptPersona(QVDefaultPersonaID, [&] { seen.push_back(currentPersona()); });
      seen.push_back(currentPersona());
    });
    seen.push_back(currentPersona());
  });
  seen.push_back(currentPersona());
  EXPECT_EQ(seen, (Lines{"personal", "school", "work", "personal"}));
}

TEST_F(PersonaAdoption, workThatThrowsIsFollowedByTheRestoreToo) {
  startUnder("work");
  EXPECT_THROW(QVAdoptPersona("school", [] { throw std::runtime_error("work"); }), std::runtime_error);
  EXPECT_EQ(currentPersona(), "work");
}

// For those who do their work in any case: it comes before the restore.
TEST_F(PersonaAdoption, aScopeThatFailedLeavesTheCurrentPersonaInForce) {
  startUnder("work", [](UMConfiguration &c) { c.mayUseArbitraryPersonas = false; });
  {
    const QVPersonaAdoption adoption(Persona("school"));
    EXPECT_FALSE(adoption.adopted());
    EXPECT_EQ(currentPersona(), "work");
  }
  EXPECT_EQ(currentPersona(), "work");
}

}  // namespace
}  // namespace droxa
