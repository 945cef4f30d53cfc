#include <cerrno>
#include <thread>

#include "extension/QVPersonaRemembering.h"
#include "platform/dispatch/dispatch.h"
#include "tests/extension/ExtensionFixture.h"

namespace droxa {
namespace {

const std::string kBlockFault = "fault: [CRIT] UNREACHABLE: Failed to adopt persona for block adoption";
const std::string kActivityFault =
    "fault: [CRIT] UNREACHABLE: Can't adopt persona for xpc activity, deferring the activity";
const std::string kNotAllowed = "debug: [DEBUG] Not allowed to adopt persona - should fallback persona";

class RecordingActivity final : public xpc_activity {
 public:
  explicit RecordingActivity(bool accepts = true) : accepts_(accepts) {}
  bool setState(std::int64_t state) override {
    states.push_back(state);
    personas.push_back(currentPersona());
    return accepts_;
  }
  std::vector<std::int64_t> states;
  Lines personas;

 private:
  const bool accepts_;
};

// A block that notes under which persona it ran.
struct NotesPersona {
  void operator()() const { seen->push_back(currentPersona()); }
  std::shared_ptr<Lines> seen = std::make_shared<Lines>();
};

class PersonaRemembering : public ManagedExtensionTest {
 protected:
  static void onAnotherThread(const std::function<void()> &work) { std::thread(work).join(); }
  static void forbid(UMConfiguration &configuration) { configuration.mayUseArbitraryPersonas = false; }
};

TEST_F(PersonaRemembering, withoutAPersonaTheBlockIsGivenBackUnwrapped) {
  runThreadUnder(std::nullopt);
  const NotesPersona note;
  const QVBlock block = QVRememberPersonaOfBlock(note);
  EXPECT_TRUE(block.target<NotesPersona>()) << "not wrapped";
  runThreadUnder("work", forbid);
  block();
  EXPECT_EQ(*note.seen, Lines{"work"}) << "it runs under whatever persona its thread has";
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(PersonaRemembering, aBlockRunsUnderThePersonaInWhichItWasMade) {
  runThreadUnder("work");
  const NotesPersona note;
  Lines afterwards;
  const QVBlock block = QVRememberPersonaOfBlock(note);
  onAnotherThread([&] {
    UMUserManager::sharedManager().currentPersona()->generateAndRestorePersonaContextWithPersonaUniqueString(
        "school");
    block();
    block();
    afterwards.push_back(currentPersona());
  });
  EXPECT_EQ(*note.seen, (Lines{"work", "work"}));
  EXPECT_EQ(afterwards, Lines{"school"});
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(PersonaRemembering, aBlockOnAQueueRunsUnderItsPersona) {
  runThreadUnder("work");
  const NotesPersona note;
  const QVBlock block = QVRememberPersonaOfBlock(note);
  runThreadUnder(std::nullopt);
  const auto queue = dispatch_queue_create("personas", DISPATCH_QUEUE_SERIAL);
  std::string afterwards;
  dispatch_async(queue, block);
  dispatch_sync(queue, [&] { afterwards = currentPersona(); });
  EXPECT_EQ(*note.seen, Lines{"work"});
  EXPECT_EQ(afterwards, "personal");
}

TEST_F(PersonaRemembering, aBlockOfTheCurrentPersonaNeedsNoRightToSwitch) {
  runThreadUnder("work", forbid);
  const NotesPersona note;
  QVRememberPersonaOfBlock(note)();
  EXPECT_EQ(*note.seen, Lines{"work"});
}

TEST_F(PersonaRemembering, aBlockWithoutTheRightToSwitchIsNeverRun) {
  runThreadUnder("work");
  const NotesPersona note;
  const QVBlock block = QVRememberPersonaOfBlock(note);
  runThreadUnder("school", forbid);
  block();
  EXPECT_EQ(*note.seen, Lines{});
  EXPECT_EQ(currentPersona(), "school");
  EXPECT_EQ(logged(), (Lines{kNotAllowed, kBlockFault}));
}

TEST_F(PersonaRemembering, aBlockWhosePersonaCantBeAdoptedIsNotRun) {
  runThreadUnder("work");
  const NotesPersona note;
  const QVBlock block = QVRememberPersonaOfBlock(note);
  const NSError failure(NSPOSIXErrorDomain, EPERM);
  runThreadUnder("school", [&](UMConfiguration &configuration) { configuration.failSwitching = failure; });
  block();
  EXPECT_EQ(*note.seen, Lines{});
  EXPECT_EQ(logged(),
            (Lines{"error: [ERROR] Can't adopt persona work: " + failure.description(), kBlockFault}));
}

TEST_F(PersonaRemembering, aBlockRunsThoughThePersonaBeforeCantBeSaved) {
  runThreadUnder("work");
  const NotesPersona note;
  const QVBlock block = QVRememberPersonaOfBlock(note);
  const NSError failure(NSPOSIXErrorDomain, EIO);
  runThreadUnder("school", [&](UMConfiguration &configuration) { configuration.failSaving = failure; });
  block();
  EXPECT_EQ(*note.seen, Lines{"work"});
  EXPECT_EQ(logged(), Lines{"error: [ERROR] won't restore persona: " + failure.description()});
}

TEST_F(PersonaRemembering, aBlockRememberedUnderTheDefaultPersonaLeavesTheSeparatedOne) {
  runThreadUnder(std::nullopt, [](UMConfiguration &c) { c.personalUniqueString = QVDefaultPersonaID; });
  std::optional<std::string> seen = "not run";
  const QVBlock block =
      QVRememberPersonaOfBlock([&seen] { seen = qv_currentPersonaID(UMUserManager::sharedManager()); });
  runThreadUnder("work");
  block();
  EXPECT_EQ(seen, QVDefaultPersonaID);
  EXPECT_EQ(currentPersona(), "work");
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(PersonaRemembering, withoutAPersonaTheActivityHandlerIsGivenBackUnwrapped) {
  runThreadUnder(std::nullopt);
  std::string seen;
  const xpc_activity_handler_t handler =
      QVRememberPersonaOfActivity([&seen](const xpc_activity_t &) { seen = currentPersona(); });
  runThreadUnder("work", forbid);
  handler(std::make_shared<RecordingActivity>());
  EXPECT_EQ(seen, "work");
}

TEST_F(PersonaRemembering, anActivityIsPassedOnUnderItsPersona) {
  runThreadUnder("work");
  xpc_activity_t seen;
  std::string persona;
  const xpc_activity_handler_t handler = QVRememberPersonaOfActivity([&](const xpc_activity_t &activity) {
    seen = activity;
    persona = currentPersona();
  });
  runThreadUnder("school");
  const auto activity = std::make_shared<RecordingActivity>();
  handler(activity);
  EXPECT_EQ(seen, activity);
  EXPECT_EQ(persona, "work");
  EXPECT_EQ(currentPersona(), "school");
  EXPECT_EQ(activity->states, std::vector<std::int64_t>{});
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(PersonaRemembering, anActivityWhosePersonaCantBeAdoptedIsDeferred) {
  runThreadUnder("work");
  bool ran = false;
  const xpc_activity_handler_t handler =
      QVRememberPersonaOfActivity([&](const xpc_activity_t &) { ran = true; });
  runThreadUnder("school", forbid);
  const auto activity = std::make_shared<RecordingActivity>();
  handler(activity);
  EXPECT_FALSE(ran);
  EXPECT_EQ(activity->states, std::vector<std::int64_t>{3});
  EXPECT_EQ(activity->personas, Lines{"school"});
  EXPECT_EQ(logged(), (Lines{kNotAllowed, kActivityFault}));
}

TEST_F(PersonaRemembering, anActivityThatCantBeDeferredIsToldOf) {
  runThreadUnder("work");
  const xpc_activity_handler_t handler = QVRememberPersonaOfActivity([](const xpc_activity_t &) { FAIL(); });
  const NSError failure(NSPOSIXErrorDomain, EPERM);
  runThreadUnder("school", [&](UMConfiguration &configuration) { configuration.failSwitching = failure; });
  handler(std::make_shared<RecordingActivity>(false));
  EXPECT_EQ(logged(),
            (Lines{"error: [ERROR] Can't adopt persona work: " + failure.description(), kActivityFault,
                   "debug: [DEBUG] Failed to defer the activity after persona failure."}));
}

}  // namespace
}  // namespace droxa
