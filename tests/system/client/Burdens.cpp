#include <atomic>
#include <cerrno>
#include <chrono>
#include <condition_variable>
#include <csignal>
#include <cstdio>
#include <mutex>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

#include "tests/system/client/Calls.h"
#include "tests/system/client/Commands.h"
#include "tests/system/client/Service.h"

namespace droxa::testing {

namespace {

[[noreturn]] void waitToBeKilled() {
  for (;;) pause();
}

void say(const std::string &line) {
  std::printf("%s\n", line.c_str());
  std::fflush(stdout);
}

// Connects, has one answer, has begun more, and dies of a signal. What fails before that is the exit status.
[[noreturn]] void liveAndDie(const ClientArguments &arguments, int number) {
  const auto host = connectToHost(arguments.home);
  const Service service(*host, arguments.path);
  if (service.error()) {
    std::fprintf(stderr, "%s\n", service.error().description().c_str());
    _exit(1);
  }
  NSError error;
  service.waitingRemote([&](const NSError &failure) { error = failure; })
      ->copyCurrentUserNameAndDisplayHandleWithReply(
          [](const auto &, const auto &, const auto &, const auto &, const auto &) {});
  if (error) {
    std::fprintf(stderr, "%s\n", error.description().c_str());
    _exit(4);
  }
  const auto remote = service.remote([](const NSError &) {});
  for (int i = 0; i < 4; ++i) makeCall((number + i) % kCalls, *remote, service.url(), [](const NSError &) {});
  kill(getpid(), SIGKILL);
  waitToBeKilled();
}

// What never comes back from being told anything.
class Mute final : public QVOperationClient {
 public:
  void progressCallbackWithTopic(const std::string &, const NSUserInfo &) override { waitToBeKilled(); }
  void setRemoteOperationProxy(std::shared_ptr<QVCancellable>, const NSUserInfo &) override {
    waitToBeKilled();
  }
  void invalidate() override {}
};

}  // namespace

// Forks while it has no thread and no library set up, so that a process costs little.
int runCrowd(const ClientArguments &arguments) {
  int running = 0;
  int failed = 0;
  const auto reap = [&] {
    int status = 0;
    if (wait(&status) < 0) return;
    --running;
    if (!WIFSIGNALED(status)) ++failed;
  };
  for (int i = 0; i < arguments.count; ++i) {
    if (running == arguments.atOnce) reap();
    const pid_t child = fork();
    if (child < 0) return 1;
    if (child == 0) liveAndDie(arguments, i);
    ++running;
  }
  while (running > 0) reap();
  std::printf("%d of %d didn't come so far as to be killed\n", failed, arguments.count);
  return failed == 0 ? 0 : 1;
}

int runHoard(const ClientArguments &arguments) {
  const auto host = connectToHost(arguments.home);
  NSError error;
  std::string identifier;
  waitingControl(*host, &error)->itemAtPath(arguments.path, [&](const auto &item, const NSError &) {
    identifier = item ? item->itemIdentifier() : "";
  });
  std::mutex mutex;
  std::condition_variable answered;
  std::vector<std::shared_ptr<FPDService>> hoard;
  int refused = 0;
  int failed = 0;
  const auto take = [&](const std::shared_ptr<FPDService> &service, const NSError &problem) {
    const std::lock_guard lock(mutex);
    if (service)
      hoard.push_back(service);
    else
      ++(problem.is(NSPOSIXErrorDomain, EMFILE) ? refused : failed);
    answered.notify_all();
  };
  const auto control = host->remoteObjectProxyWithErrorHandler<FPDControlProtocol>(
      [&](const NSError &failure) { take(nullptr, failure); });
  for (int i = 0; i < arguments.count; ++i)
    control->listenerEndpointForServiceName("com.quorva.Tessaly.private.SharingOperation", identifier, take);
  std::unique_lock lock(mutex);
  const auto all = static_cast<std::size_t>(arguments.count);
  answered.wait(lock, [&] { return hoard.size() + static_cast<std::size_t>(refused + failed) == all; });
  say("granted " + std::to_string(hoard.size()) + " refused " + std::to_string(refused) + " failed " +
      std::to_string(failed));
  waitToBeKilled();
}

int runDeaf(const ClientArguments &arguments) {
  const auto host = connectToHost(arguments.home);
  const Service service(*host, arguments.path);
  if (service.error()) return 1;
  std::atomic<bool> answered{false};
  const auto remote = service.remote([](const NSError &) {});
  for (int i = 0; i < arguments.count; ++i)
    makeCall(0, *remote, service.url(), [&](const NSError &) { answered = true; });
  while (!answered) usleep(100);  // they are on their way
  say("called");
  raise(SIGSTOP);
  waitToBeKilled();
}

int runMute(const ClientArguments &arguments) {
  const auto host = connectToHost(arguments.home);
  const Service service(*host, arguments.path);
  if (service.error()) return 1;
  const auto remote = service.remote([](const NSError &) {});
  for (int i = 0; i < arguments.count; ++i)
    remote->startOperation_toPrepFolderForSharingAt(std::make_shared<Mute>(), service.url(),
                                                    [](const NSError &) {});
  service.waitingRemote([](const NSError &) {})
      ->copyCurrentUserNameAndDisplayHandleWithReply(
          [](const auto &, const auto &, const auto &, const auto &, const auto &) {});
  say("called");
  waitToBeKilled();
}

}  // namespace droxa::testing
