// bench_push HOME [COUNT]: makes COUNT documents in the drive's root, one after the other, and prints how
// long each took from the file's change to the watch observer, in microseconds: median, 99th percentile,
// worst.

#include <algorithm>
#include <chrono>
#include <condition_variable>
#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <mutex>
#include <unistd.h>

#include "bench/RunningDrive.h"
#include "platform/foundation/Paths.h"

namespace {

using Clock = std::chrono::steady_clock;

class Watcher : public droxa::FPDWatchObserver {
 public:
  void receiveChanges(const std::vector<droxa::FPDChange> &changes, std::function<void()> reply) override {
    {
      const std::lock_guard lock(mutex_);
      for (const droxa::FPDChange &change : changes)
        if (change.item && change.item->filename == awaited_) {
          seen_ = Clock::now();
          arrived_ = true;
        }
    }
    condition_.notify_all();
    reply();
  }

  void await(const std::string &name) {
    const std::lock_guard lock(mutex_);
    awaited_ = name;
    arrived_ = false;
  }

  Clock::time_point wait() {
    std::unique_lock lock(mutex_);
    if (!condition_.wait_for(lock, std::chrono::seconds(10), [this] { return arrived_; }))
      droxa::bench::fail("a change was not pushed within ten seconds: " + awaited_);
    return seen_;
  }

 private:
  std::mutex mutex_;
  std::condition_variable condition_;
  std::string awaited_;
  bool arrived_ = false;
  Clock::time_point seen_;
};

}  // namespace

int main(int argc, char **argv) {
  if (argc < 2) {
    std::fprintf(stderr, "usage: %s HOME [COUNT]\n", argv[0]);
    return 2;
  }
  droxa::bench::RunningDrive drive(argv[1]);
  const int count = argc > 2 ? std::atoi(argv[2]) : 500;
  const std::string folder = droxa::DroxaHome(argv[1]).replica() + "/com.quorva.Tessaly.default/Documents/";

  const auto watcher = std::make_shared<Watcher>();
  std::shared_ptr<droxa::FPDWatch> watch;
  drive.host().watchContainer(
      droxa::NSFileProviderRootContainerItemIdentifier, watcher,
      [&](const std::shared_ptr<droxa::FPDWatch> &received, const droxa::NSError &error) {
        if (error) droxa::bench::fail(error.description());
        watch = received;
      });

  std::vector<double> microseconds;
  for (int i = 0; i < count; ++i) {
    const std::string name = "pushed " + std::to_string(i);
    watcher->await(name);
    const Clock::time_point start = Clock::now();
    const int file = open((folder + name).c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
    if (file < 0 || write(file, "x", 1) != 1) droxa::bench::fail("can't write " + folder + name);
    close(file);
    microseconds.push_back(std::chrono::duration<double, std::micro>(watcher->wait() - start).count());
    unlink((folder + name).c_str());
  }
  std::sort(microseconds.begin(), microseconds.end());
  const auto at = [&](double share) {
    return microseconds[std::min(microseconds.size() - 1,
                                 static_cast<std::size_t>(share * double(microseconds.size())))];
  };
  std::printf("push_us median %.0f p99 %.0f worst %.0f\n", at(0.5), at(0.99), microseconds.back());
}
