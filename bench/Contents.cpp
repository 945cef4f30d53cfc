// One call about contents, timed: what bench/bench_contents is made of. Prints "name value unit" lines.
//
//   bench_contents_calls HOME download PATH [READERS]   until all of them have it
//   bench_contents_calls HOME evict PATH
//   bench_contents_calls HOME wait                      until all is in the cloud
//   bench_contents_calls HOME settled OTHER-HOME        until both have the same names
//   bench_contents_calls HOME push OTHER-HOME COUNT     from a change here until a watch there sees it

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <future>
#include <poll.h>
#include <string>
#include <sys/inotify.h>
#include <thread>
#include <unistd.h>
#include <vector>

#include "bench/RunningDrive.h"
#include "platform/foundation/Paths.h"
#include "tessaly/QVDaemonConnectionOverXPC.h"

namespace droxa::bench {
namespace {

using Clock = std::chrono::steady_clock;
constexpr std::chrono::seconds kLongest{600};

double microsecondsSince(Clock::time_point begin) {
  return std::chrono::duration<double, std::micro>(Clock::now() - begin).count();
}

std::string documentsOf(const std::string &home) {
  return DroxaHome(home).replica() + "/com.quorva.Tessaly.default/Documents";
}

// Waits for one answer, or for the error handler's.
class Answer {
 public:
  QVContentsErrorReply reply() const {
    return [promise = promise_, given = given_](const NSError &error) {
      if (!given->exchange(true)) promise->set_value(error);
    };
  }
  void check(const std::string &what) {
    if (future_.wait_for(kLongest) != std::future_status::ready) fail(what + " didn't end");
    if (const NSError error = future_.get()) fail(what + ": " + error.description());
  }

 private:
  std::shared_ptr<std::promise<NSError>> promise_ = std::make_shared<std::promise<NSError>>();
  std::shared_ptr<std::atomic<bool>> given_ = std::make_shared<std::atomic<bool>>(false);
  std::future<NSError> future_ = promise_->get_future();
};

QVTransferStatus transfers(QVDaemonConnectionOverXPC &keld) {
  Answer answer;
  const auto status = std::make_shared<QVTransferStatus>();
  keld.remoteObjectProxyWithErrorHandler(answer.reply())
      ->getTransferStatus(
          [status, done = answer.reply()](const QVTransferStatus &told, const NSError &error) {
            *status = told;
            done(error);
          });
  answer.check("the transfers' status");
  return *status;
}

void download(QVDaemonConnectionOverXPC &keld, const std::string &path, std::size_t readers) {
  const QVTransferStatus before = transfers(keld);
  std::vector<Answer> answers(readers);
  std::vector<std::shared_ptr<QVTransfer>> kept(readers);
  const Clock::time_point begin = Clock::now();
  for (std::size_t i = 0; i < readers; ++i) {
    const auto done = answers[i].reply();
    keld.remoteObjectProxyWithErrorHandler(done)->startDownloadAtURL(
        NSURL::fileURLWithPath(path), QVDownloadForReader,
        [done, slot = &kept[i]](const std::shared_ptr<QVTransfer> &transfer, const NSError &error) {
          if (!transfer) return done(error);
          *slot = transfer;
          transfer->remoteObjectProxyWithErrorHandler(done)->waitWithReply(done);
        });
  }
  for (Answer &answer : answers) answer.check("the download of " + path);
  std::printf("download %.0f us\n", microsecondsSince(begin));
  const QVTransferStatus after = transfers(keld);
  std::printf("transfers %llu\nreceived %llu bytes\n",
              static_cast<unsigned long long>(after.downloads.done - before.downloads.done),
              static_cast<unsigned long long>(after.downloads.bytesDone - before.downloads.bytesDone));
}

void evict(QVDaemonConnectionOverXPC &keld, const std::string &path) {
  Answer answer;
  const Clock::time_point begin = Clock::now();
  keld.remoteObjectProxyWithErrorHandler(answer.reply())
      ->evictItemAtURL(NSURL::fileURLWithPath(path),
                       [done = answer.reply()](const QVContentsResult &result, const NSError &error) {
                         if (!error && result.refused > 0)
                           fail(std::to_string(result.refused) + " were kept");
                         done(error);
                       });
  answer.check("the eviction of " + path);
  std::printf("evict %.0f us\n", microsecondsSince(begin));
}

void wait(QVDaemonConnectionOverXPC &keld) {
  Answer answer;
  const Clock::time_point begin = Clock::now();
  keld.remoteObjectProxyWithErrorHandler(answer.reply())->waitForUploadAtURL(NSURL(), answer.reply());
  answer.check("the wait for uploads");
  std::printf("wait %.0f us\n", microsecondsSince(begin));
}

std::size_t countBelow(const std::string &folder) {
  std::error_code ignored;
  std::size_t count = 0;
  for (auto it = std::filesystem::recursive_directory_iterator(folder, ignored); it != decltype(it)(); ++it)
    ++count;
  return count;
}

void settled(const std::string &home, const std::string &other) {
  const Clock::time_point begin = Clock::now();
  while (countBelow(documentsOf(home)) != countBelow(documentsOf(other))) {
    if (Clock::now() > begin + kLongest) fail("the other device doesn't get everything");
    std::this_thread::sleep_for(std::chrono::milliseconds(20));
  }
  std::printf("settled %.0f us\n", microsecondsSince(begin));
}

// A new document here, until the file system tells a watch of the other device's folder about it.
double onePush(const std::string &from, int watch, int number) {
  const std::string name = "pushed " + std::to_string(number);
  const Clock::time_point begin = Clock::now();
  std::ofstream(documentsOf(from) + "/" + name) << "change " << number << "\n";
  for (;;) {
    pollfd waiting{watch, POLLIN, 0};
    if (::poll(&waiting, 1, 60'000) <= 0) fail("a change didn't arrive");
    alignas(inotify_event) char buffer[65536];
    const ssize_t size = ::read(watch, buffer, sizeof buffer);
    for (ssize_t at = 0; at < size;) {
      const auto *event = reinterpret_cast<const inotify_event *>(buffer + at);
      if (event->len > 0 && name == event->name) return microsecondsSince(begin);
      at += static_cast<ssize_t>(sizeof(inotify_event) + event->len);
    }
  }
}

void push(const std::string &from, const std::string &to, int count) {
  const int watch = ::inotify_init1(IN_CLOEXEC);
  ::inotify_add_watch(watch, documentsOf(to).c_str(), IN_CREATE | IN_MOVED_TO);
  std::vector<double> times;
  for (int number = 0; number < count; ++number) times.push_back(onePush(from, watch, number));
  std::sort(times.begin(), times.end());
  const auto at = [&](double share) {
    return times[static_cast<std::size_t>(share * static_cast<double>(times.size() - 1))] / 1000;
  };
  std::printf("push median %.1f ms, 99th percentile %.1f ms\n", at(0.5), at(0.99));
}

int run(const std::vector<std::string> &words) {
  if (words.size() < 2) fail("HOME and a command are needed");
  const std::string home = DroxaHome(words[0]).root(), command = words[1];
  const std::string argument = words.size() > 2 ? words[2] : "";
  const int number = words.size() > 3 ? std::atoi(words[3].c_str()) : 1;
  const auto keld = std::make_shared<QVDaemonConnectionOverXPC>(DroxaHome(home).daemonSocket());
  if (command == "download")
    download(*keld, argument, static_cast<std::size_t>(number));
  else if (command == "evict")
    evict(*keld, argument);
  else if (command == "wait")
    wait(*keld);
  else if (command == "settled")
    settled(home, DroxaHome(argument).root());
  else if (command == "push")
    push(home, DroxaHome(argument).root(), number);
  else
    fail("no such command: " + command);
  return 0;
}

}  // namespace
}  // namespace droxa::bench

int main(int argc, char **argv) {
  return droxa::bench::run({argv + 1, argv + argc});
}
