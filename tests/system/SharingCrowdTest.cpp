#include <csignal>

#include "tests/system/SharingFixture.h"

namespace droxa::testing {
namespace {

#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
constexpr bool kMemoryIsMeasured = false;  // freed memory is kept for a while
#elif defined(__has_feature)
#if __has_feature(address_sanitizer) || __has_feature(thread_sanitizer)
constexpr bool kMemoryIsMeasured = false;
#else
constexpr bool kMemoryIsMeasured = true;
#endif
#else
constexpr bool kMemoryIsMeasured = true;
#endif
// What may stay of a thousand clients. A connection takes tens of kilobytes: losing one in five would show.
constexpr long kMostGrowth = 8L * 1024;

// Many clients, and those that burden the others.
class SharingCrowd : public EntitledSharingTests {
 protected:
  void SetUp() override {
    EntitledSharingTests::SetUp();
    if (IsSkipped()) return;
    entitleClients(allSharingEntitlements());
    drive.start();
    makeDocument(drive, "letter.txt", "dear");
    share(drive, {"create", "letter.txt"});
  }

  struct Costs {
    std::size_t descriptors = 0;
    long kilobytes = 0;
  };
  std::vector<pid_t> processes() { return {drive.host().pid(), drive.extensionPid(), drive.keld().pid()}; }
  void runClients(int count) {
    const Result crowd = runShareClient(drive, "letter.txt", {"crowd", std::to_string(count), "50"});
    EXPECT_EQ(crowd.status, 0) << crowd.output << crowd.errors;
  }
  // An application is served, by each of the services that others may be holding up.
  void expectOthersToBeServed() {
    EXPECT_EQ(share(drive, {"letter.txt"}).value("shared", false), true);
    const Result calls = runShareClient(drive, "letter.txt", {"calls"});
    EXPECT_EQ(calls.status, 0) << calls.errors;
    EXPECT_EQ(calls.output.find("NSCocoaErrorDomain"), std::string::npos) << calls.output;
    EXPECT_NE(calls.output.find("toPrepFolderForSharingAt\t\t0\t\n"), std::string::npos) << calls.output;
  }
  std::unique_ptr<Process> startBurden(const std::vector<std::string> &words) {
    auto burden = startShareClient(drive, "letter.txt", words, "burden");
    const std::string said = words[0] == "hoard" ? "granted" : "called";
    EXPECT_TRUE(eventually([&] { return hasSaid(*burden, said) || !burden->isRunning(); }, kPatience));
    EXPECT_TRUE(hasSaid(*burden, said)) << burden->errors();
    return burden;
  }

  // Neither while it lives nor when it has been killed.
  void expectToHoldUpNobodyAndLeaveNothing(const std::vector<std::string> &words) {
    expectOthersToBeServed();
    const pid_t extension = drive.extensionPid();
    const std::size_t extensions = fewestDescriptors(extension);
    const std::size_t keldsOwn = fewestDescriptors(drive.keld().pid());
    const auto burden = startBurden(words);
    expectOthersToBeServed();
    burden->signal(SIGKILL);
    burden->wait();
    ASSERT_EQ(drive.extensionPid(), extension) << "it was started anew";
    expectAtMost(extensions, extension);
    expectAtMost(keldsOwn, drive.keld().pid());
    expectOthersToBeServed();
  }

  Drive drive;
};

TEST_F(SharingCrowd, aThousandClientsThatDieLeaveNothingBehind) {
  runClients(150);
  const std::vector<pid_t> all = processes();
  std::vector<Costs> before;
  for (const pid_t process : all) before.push_back({fewestDescriptors(process), residentKilobytes(process)});
  runClients(1000);
  ASSERT_EQ(processes(), all) << "one of them was started anew";
  for (std::size_t i = 0; i < all.size(); ++i) {
    expectAtMost(before[i].descriptors, all[i]);
    const long grown = residentKilobytes(all[i]) - before[i].kilobytes;
    RecordProperty("grownKilobytes" + std::to_string(i), std::to_string(grown));
    if (kMemoryIsMeasured) {
      EXPECT_LT(grown, kMostGrowth) << "process " << i;
    }
  }
  expectOthersToBeServed();
}

TEST_F(SharingCrowd, oneThatKeepsAllEndpointsIsRefusedAtItsLimitAndOthersAreServed) {
  const auto burden = startBurden({"hoard", "10000"});
  EXPECT_TRUE(hasSaid(*burden, "granted 32 refused 9968 failed 0")) << burden->output();
  expectOthersToBeServed();
  const std::size_t held = openDescriptors(drive.extensionPid());
  burden->signal(SIGKILL);
  burden->wait();
  EXPECT_TRUE(eventually([&] { return openDescriptors(drive.extensionPid()) + 32 <= held; }, kPatience));
  EXPECT_TRUE(hasSaid(*startBurden({"hoard", "32"}), "granted 32 refused 0 failed 0"));
}

TEST_F(SharingCrowd, oneThatNeverReadsItsRepliesHoldsUpNobody) {
  expectToHoldUpNobodyAndLeaveNothing({"deaf", "4000"});
}

TEST_F(SharingCrowd, oneThatNeverReturnsFromACallbackHoldsUpNobody) {
  expectToHoldUpNobodyAndLeaveNothing({"mute", "64"});
}

}  // namespace
}  // namespace droxa::testing
