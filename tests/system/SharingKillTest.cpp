#include <csignal>
#include <random>
#include <thread>

#include "tests/system/SharingFixture.h"

namespace droxa::testing {
namespace {

// The last number that a writer said after the word; 0 when there is none.
int lastNumber(const std::string &output, const std::string &word) {
  int last = 0;
  for (std::size_t at = 0; (at = output.find(word + " ", at)) != std::string::npos; at += word.size()) {
    const std::size_t end = output.find('\n', at);
    if (end == std::string::npos) break;  // it was killed while it wrote that
    last = std::max(last, std::stoi(output.substr(at + word.size() + 1, end - at)));
  }
  return last;
}

// The application that changes a share: killed and started again, it goes on counting.
class Writer {
 public:
  Writer(const Drive &drive, std::string path) : drive_(drive), path_(std::move(path)) { start(); }
  void kill() {
    process_->signal(SIGKILL);
    process_->wait();
    look();
    start();
  }
  // Ends it by its own will.
  bool finish() {
    process_->signal(SIGTERM);
    const bool hasEnded = process_->wait(120s) == 0;
    look();
    return hasEnded;
  }
  bool hasSavedAgain() const { return lastNumber(process_->output(), "saved") > 0; }
  int saved() const { return saved_; }
  int tried() const { return tried_; }
  std::string output() const { return process_->output(); }

 private:
  void start() {
    process_ = startShareClient(drive_, path_, {"write", std::to_string(tried_ + 1)},
                                "writer" + std::to_string(runs_++));
    EXPECT_TRUE(eventually([this] { return hasSaid(*process_, "writing"); }, kPatience)) << output();
  }
  void look() {
    saved_ = std::max(saved_, lastNumber(process_->output(), "saved"));
    tried_ = std::max(tried_, lastNumber(process_->output(), "tried"));
  }

  const Drive &drive_;
  const std::string path_;
  std::unique_ptr<Process> process_;
  int runs_ = 0;
  int saved_ = 0;
  int tried_ = 0;
};

class SharingKill : public EntitledSharingTests {
 protected:
  void SetUp() override {
    EntitledSharingTests::SetUp();
    if (IsSkipped()) return;
    entitleClients(allSharingEntitlements());
    drive.start({"--account", "anna"});
    makeDocument(drive, "letter.txt", "dear");
    share(drive, {"create", "letter.txt"});
    for (int i = 0; i < 3; ++i) startAsker();
  }

  void startAsker() {
    askers.push_back(
        startShareClient(drive, "letter.txt", {"ask"}, "asker" + std::to_string(askersStarted++)));
    EXPECT_TRUE(eventually([&] { return hasSaid(*askers.back(), "asking"); }, kPatience));
  }
  void killAsker() {
    askers.front()->signal(SIGKILL);
    askers.front()->wait();
    askers.erase(askers.begin());
    startAsker();
  }
  void killExtension() {
    const pid_t extension = drive.extensionPid();
    if (extension > 0) kill(extension, SIGKILL);
  }
  void killKeld() {
    drive.keld().signal(SIGKILL);
    ASSERT_EQ(drive.keld().wait(), 128 + SIGKILL);
    drive.startKeld({"--account", "anna"});
  }
  void waitAMoment(unsigned most) { std::this_thread::sleep_for(std::chrono::milliseconds(random() % most)); }
  // All who still live have had each call answered once.
  void expectEachAnsweredOnce() {
    for (const auto &asker : askers) asker->signal(SIGTERM);
    for (const auto &asker : askers) {
      EXPECT_EQ(asker->wait(150s), 0) << asker->output() << asker->errors();
      EXPECT_TRUE(hasSaid(*asker, "unanswered 0 twice 0")) << asker->output();
    }
    askers.clear();
  }
  // The cloud has what was acknowledged last, or a later one whose answer was lost.
  void expectTheCloudToHave(const Writer &writer) {
    nlohmann::json there;
    ASSERT_TRUE(eventually(
        [&] {
          const Result result = drive.droxa({"share", "letter.txt", "--json"});
          there = nlohmann::json::parse(result.output, nullptr, false);
          return result.status == 0 && there.is_object();
        },
        kPatience));
    ASSERT_TRUE(there["title"].is_string()) << there;
    const int title = std::stoi(there["title"].get<std::string>());
    EXPECT_GT(writer.saved(), 0) << writer.output();
    EXPECT_GE(title, writer.saved());
    EXPECT_LE(title, writer.tried());
  }

  // What those hold who went through it all, beside what they hold when they are started anew.
  void expectSurvivorsToHoldNoMoreThanNewOnes() {
    const std::size_t extension = fewestDescriptors(drive.extensionPid());
    const std::size_t keld = fewestDescriptors(drive.keld().pid());
    killExtension();
    killKeld();
    ASSERT_TRUE(eventually(
        [&] {
          return drive.droxa({"share", "letter.txt", "--json"}).status == 0;
        },
        kPatience));
    EXPECT_LE(extension, openDescriptors(drive.extensionPid()) + kFewMore);
    EXPECT_LE(keld, openDescriptors(drive.keld().pid()) + kFewMore);
  }

  static constexpr std::size_t kFewMore = 4;  // made once, on first use
  Drive drive;
  std::vector<std::unique_ptr<Process>> askers;
  int askersStarted = 0;
  const unsigned seed = std::random_device()();
  std::mt19937 random{seed};
};

TEST_F(SharingKill, atRandomMomentsEachCallIsAnsweredOnceAndNoAcknowledgedSaveIsLost) {
  SCOPED_TRACE("seed " + std::to_string(seed));
  Writer writer(drive, "letter.txt");
  ASSERT_TRUE(eventually([&] { return writer.hasSavedAgain(); }, kPatience)) << writer.output();
  for (int round = 0; round < 12; ++round) {
    waitAMoment(500);
    switch (round % 4) {
      case 0:
        killAsker();
        break;
      case 1:
        killKeld();
        break;
      case 2:
        writer.kill();
        break;
      default:
        killExtension();
    }
  }
  // Everybody is served again, whoever was killed.
  EXPECT_TRUE(eventually([&] { return writer.hasSavedAgain(); }, kPatience)) << writer.output();
  EXPECT_TRUE(writer.finish()) << writer.output();
  expectEachAnsweredOnce();
  expectTheCloudToHave(writer);
  expectSurvivorsToHoldNoMoreThanNewOnes();
}

TEST_F(SharingKill, ofClientsLeavesNoDescriptorBehind) {
  Writer warming(drive, "letter.txt");
  ASSERT_TRUE(eventually([&] { return warming.hasSavedAgain(); }, kPatience)) << warming.output();
  EXPECT_TRUE(warming.finish());
  expectEachAnsweredOnce();
  const pid_t extension = drive.extensionPid();
  const std::size_t extensions = fewestDescriptors(extension);
  const std::size_t keldsOwn = fewestDescriptors(drive.keld().pid());
  for (int i = 0; i < 3; ++i) startAsker();
  Writer writer(drive, "letter.txt");
  for (int round = 0; round < 12; ++round) {
    waitAMoment(150);
    if (round % 3 == 2)
      writer.kill();
    else
      killAsker();
  }
  EXPECT_TRUE(writer.finish());
  expectEachAnsweredOnce();
  ASSERT_EQ(drive.extensionPid(), extension);
  expectAtMost(extensions, extension);
  expectAtMost(keldsOwn, drive.keld().pid());
}

}  // namespace
}  // namespace droxa::testing
