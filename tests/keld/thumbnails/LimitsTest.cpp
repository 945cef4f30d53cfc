// What a maker that was taken over can do: nothing but cost its own thumbnail.

#include <chrono>
#include <csignal>
#include <filesystem>
#include <thread>

#include "keld/thumbnails/MakerProcess.h"
#include "tests/keld/thumbnails/ThumbnailFiles.h"
#include "tests/support/Eventually.h"

namespace droxa::keld {
namespace {

class Limits : public ThumbnailFiles {
 protected:
  static ThumbnailerOptions options() {
    ThumbnailerOptions made;
    made.program = HOSTILE_THUMBNAILER;
    made.limits.outputBytes = 1 << 20;
    made.limits.memoryBytes = 256 << 20;
    return made;
  }
  ThumbnailResult order(const std::string &what) { return make(thumbnailer, what, "image/png"); }
  void isRefused(const std::string &what, const std::string &why) {
    const ThumbnailResult result = order(what);
    EXPECT_EQ(result.outcome, Outcome::refused) << what;
    EXPECT_NE(result.why.find(why), std::string::npos) << what << ": " << result.why;
    goesOn();
  }
  void goesOn() {
    const std::string png = draw("plain", 3, 3, "good.png");
    const ThumbnailResult next = order("print " + png);
    EXPECT_EQ(next.outcome, Outcome::made) << next.why;
  }
  void limitTime(std::uint32_t cpuSeconds, std::uint32_t wallMilliseconds) {
    ThumbnailerOptions brief = options();
    brief.limits.cpuSeconds = cpuSeconds;
    brief.limits.wallMilliseconds = wallMilliseconds;
    brief_ = std::make_unique<SandboxedThumbnailer>(brief);
  }
  ThumbnailResult briefly(const std::string &what) { return make(*brief_, what, "image/png"); }

  SandboxedThumbnailer thumbnailer{options()};
  std::unique_ptr<SandboxedThumbnailer> brief_;
};

TEST_F(Limits, whoeverSpinsIsEnded) {
  limitTime(1, 60'000);
  const ThumbnailResult result = briefly("spin");
  EXPECT_EQ(result.outcome, Outcome::refused);
  EXPECT_NE(result.why.find("of the processor"), std::string::npos) << result.why;
}

TEST_F(Limits, whoeverHangsIsEnded) {
  limitTime(20, 300);
  const ThumbnailResult result = briefly("hang");
  EXPECT_EQ(result.outcome, Outcome::refused);
  EXPECT_NE(result.why.find("within 300 ms"), std::string::npos) << result.why;
}

TEST_F(Limits, whoeverHoardsMemoryIsRefused) {
  isRefused("allocate", "memory");
}

TEST_F(Limits, whoeverWritesWithoutEndIsEnded) {
  isRefused("write", "writes more");
}

TEST_F(Limits, whoeverCrashesCostsTheThumbnail) {
  isRefused("crash", "crashed");
}

TEST_F(Limits, whoeverSaysNothingCostsTheThumbnail) {
  isRefused("exit", "failed");
}

TEST_F(Limits, garbageIsNoThumbnail) {
  isRefused("print garbage", "something else");
  isRefused("print " + PngThatClaims(1025, 10), "something else");
  isRefused("print " + PngThatClaims(10, 10) + "more", "something else");
}

TEST_F(Limits, aReasonIsOneLineOfPlainText) {
  const ThumbnailResult result = order("refuse two\nlines \x1b[31m" + std::string(5000, 'x'));
  EXPECT_EQ(result.outcome, Outcome::refused);
  EXPECT_LE(result.why.size(), 200U);
  EXPECT_EQ(result.why.substr(0, 10), "two?lines ");
  EXPECT_EQ(result.why.find('\x1b'), std::string::npos);
}

TEST_F(Limits, noProcessNoProgramNoSignal) {
  isRefused("fork", "could not fork");
  isRefused("execute", "could not execute");
  isRefused("kill", "could not kill");
}

TEST_F(Limits, noNetwork) {
  isRefused("connect", "could not connect");
}

TEST_F(Limits, noFileOfAnybody) {
  folder.write("secret", "mine");
  isRefused("read " + at("secret"), "could not read");
  isRefused("read /etc/passwd", "could not read");
  isRefused("create " + at("new"), "could not create");
  isRefused("create " + at("secret"), "could not create");
  EXPECT_FALSE(std::filesystem::exists(at("new")));
  EXPECT_EQ(read("secret"), "mine");
}

TEST_F(Limits, aCancellationEndsWhatIsUnderWay) {
  folder.write("contents", "hang");
  const OwnedDescriptor file(::open(at("contents").c_str(), O_RDONLY | O_CLOEXEC));
  CKCancellation cancellation;
  std::thread canceller([&] { cancellation.cancel(); });
  const ThumbnailResult result = thumbnailer.make(file.get(), "image/png", cancellation);
  canceller.join();
  EXPECT_EQ(result.outcome, Outcome::cancelled);
}

TEST_F(Limits, aProgramThatSomebodyEndedIsStartedAnew) {
  std::string problem;
  const auto process = MakerProcess::start(HOSTILE_THUMBNAILER, &problem);
  ASSERT_TRUE(process) << problem;
  ::kill(process->process(), SIGKILL);
  folder.write("contents", "hang");
  const OwnedDescriptor file(::open(at("contents").c_str(), O_RDONLY | O_CLOEXEC));
  const auto outcome = process->run({}, file.get(), never);
  EXPECT_EQ(outcome.kind, MakerProcess::Outcome::Kind::lost);
  EXPECT_FALSE(process->isUsable());
  goesOn();
}

TEST_F(Limits, whatIsMadeEndsWithItsProgram) {
  std::string problem;
  auto process = MakerProcess::start(HOSTILE_THUMBNAILER, &problem);
  ASSERT_TRUE(process) << problem;
  const pid_t parent = process->process();
  const auto children = [parent] {
    std::string text;
    std::ifstream("/proc/" + std::to_string(parent) + "/task/" + std::to_string(parent) + "/children") >>
        text;
    return text;
  };
  folder.write("contents", "hang");
  const OwnedDescriptor file(::open(at("contents").c_str(), O_RDONLY | O_CLOEXEC));
  CKCancellation cancellation;
  std::thread maker([&] { (void)process->run({}, file.get(), cancellation); });
  EXPECT_TRUE(eventually([&] { return !children().empty(); }));
  const std::string child = children();
  cancellation.cancel();
  maker.join();
  process.reset();
  EXPECT_TRUE(eventually([&] { return !std::filesystem::exists("/proc/" + child); })) << child;
}

TEST_F(Limits, allProtectionsAreThereOnThisKernel) {
  std::string problem;
  const auto process = MakerProcess::start(HOSTILE_THUMBNAILER, &problem);
  ASSERT_TRUE(process) << problem;
  EXPECT_EQ(process->protections() & kMakerSystemCalls, kMakerSystemCalls);
}

}  // namespace
}  // namespace droxa::keld
