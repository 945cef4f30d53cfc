#include "tests/crash/CrashRun.h"

#include <condition_variable>
#include <cstdio>
#include <filesystem>
#include <pwd.h>
#include <stdexcept>
#include <stdlib.h>
#include <thread>
#include <unistd.h>

#include "tests/crash/Checker.h"
#include "tests/crash/CrashDevice.h"
#include "tests/crash/Schedule.h"
#include "tests/crash/Workload.h"

namespace droxa::crash {

namespace {

constexpr std::chrono::seconds kLongestSettling{90};

// Waits, unless the work is over before.
void pauseFor(std::chrono::microseconds duration) {
  std::this_thread::sleep_for(duration);  // the schedule's, not for anything to happen
}

std::string userName() {
  const passwd *entry = ::getpwuid(::getuid());
  return entry ? entry->pw_name : "user" + std::to_string(::getuid());
}

class CrashRun {
 public:
  explicit CrashRun(const CrashOptions &options)
      : options_(options),
        folder_(makeFolder()),
        one_(folder_, "anna", model_),
        other_(folder_, "ben", model_),
        cloud_(openCloud()),
        schedule_(options.seed),
        workload_({&one_, &other_}, cloud_, model_),
        checker_({&one_, &other_}, cloud_, model_) {}

  CrashReport run() {
    one_.start();
    other_.start();
    std::uint64_t unchecked = 0;
    while (report_.kills < options_.kills && model_.findings().empty()) {
      const std::uint64_t before = report_.kills;
      round(schedule_.next());
      unchecked += report_.kills - before;
      if (unchecked < options_.checkEvery) continue;
      unchecked = 0;
      settleAndCheck();
    }
    if (unchecked > 0 && model_.findings().empty()) settleAndCheck();
    return finish();
  }

 private:
  static std::string makeFolder() {
    std::string path = std::filesystem::temp_directory_path().string() + "/droxa-crash-XXXXXX";
    if (!::mkdtemp(path.data())) throw std::runtime_error("can't make a temporary folder");
    return path;
  }
  std::shared_ptr<CKCloud> openCloud() const {
    NSError error;
    auto cloud = EmbeddedCloud::open(folder_ + "/cloud", userName(), "checker", &error);
    if (!cloud) throw std::runtime_error("can't open the cloud: " + error.description());
    return cloud;
  }

  // Works, kills in the middle of it, and starts again what was killed while the work goes on.
  void round(const Round &round) {
    std::thread work([&] {
      for (const Step &step : round.steps) {
        pauseFor(step.pause);
        workload_.perform(step);
      }
    });
    pauseFor(round.untilKill);
    CrashDevice *const devices[2] = {&one_, &other_};
    for (std::size_t index = 0; index < 2; ++index) {
      if (!round.kills[index]) continue;
      devices[index]->kill();
      model_.note("killed " + devices[index]->name());
      ++report_.kills;
    }
    pauseFor(round.untilStart);
    for (std::size_t index = 0; index < 2; ++index)
      if (round.kills[index]) {
        model_.note("starting " + devices[index]->name());
        devices[index]->start();
      }
    work.join();
  }

  bool isQuiet() {
    for (CrashDevice *device : {&one_, &other_}) {
      QVDaemonStatus status;
      if (device->daemonStatus(&status) || !status.firstScanDone) return false;
      QVTransferStatus transfers;
      if (device->transferStatus(&transfers)) return false;
      if (transfers.heldDeletions > 0) device->confirmDeletions();
      if (const NSError error = device->waitForUpload()) {
        lastProblem_ = device->name() + ": " + error.description();
        return false;
      }
      if (transfers.downloads.active + transfers.downloads.queued > 0) return false;
      if (transfers.uploads.active + transfers.uploads.queued > 0) return false;
    }
    lastProblem_ = Difference(ReadTree(one_.documents()), ReadTree(other_.documents()));
    return lastProblem_.empty();
  }

  void settleAndCheck() {
    workload_.lookAtDeletedFolders();
    const auto end = std::chrono::steady_clock::now() + kLongestSettling;
    // Quiet once may be the moment before something arrives; twice in a row with a while between isn't.
    for (int quiet = 0; quiet < 2;) {
      quiet = isQuiet() ? quiet + 1 : 0;
      if (std::chrono::steady_clock::now() > end) {
        model_.finding("nothing settles: " + lastProblem_);
        break;
      }
      pauseFor(std::chrono::milliseconds(150));
    }
    checker_.check();
    if (options_.isVerbose)
      std::fprintf(stderr, "after %llu kills: %zu findings\n", static_cast<unsigned long long>(report_.kills),
                   model_.findings().size());
  }

  CrashReport finish() {
    one_.kill();
    other_.kill();
    report_.findings = model_.findings();
    report_.summary =
        "seed " + std::to_string(options_.seed) + ", " + std::to_string(report_.kills) + " kills";
    for (const auto &[what, count] : model_.counts())
      report_.summary += ", " + std::to_string(count) + " " + what;
    if (report_.findings.empty()) {
      std::error_code ignored;
      std::filesystem::remove_all(folder_, ignored);
    } else {
      report_.folder = folder_;
      testing::writeFile(folder_ + "/workload.txt", model_.notes());
    }
    return report_;
  }

  const CrashOptions options_;
  const std::string folder_;
  Model model_;
  CrashDevice one_, other_;
  const std::shared_ptr<CKCloud> cloud_;
  Schedule schedule_;
  Workload workload_;
  Checker checker_;
  CrashReport report_;
  std::string lastProblem_;
};

}  // namespace

CrashReport RunCrashes(const CrashOptions &options) {
  return CrashRun(options).run();
}

}  // namespace droxa::crash
