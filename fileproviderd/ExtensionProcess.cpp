#include "fileproviderd/ExtensionProcess.h"

#include <array>
#include <cerrno>
#include <cstring>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include "platform/dispatch/dispatch.h"
#include "platform/foundation/NSDate.h"

namespace droxa {

namespace {

constexpr int kChildSocket = 3;  // the first descriptor after the standard ones

// A process group of its own, so that a terminal's Ctrl-C reaches the host alone, which then ends it.
void prepareAttributes(posix_spawnattr_t *attributes) {
  sigset_t none;
  sigset_t all;
  sigemptyset(&none);
  sigfillset(&all);
  posix_spawnattr_init(attributes);
  posix_spawnattr_setsigmask(attributes, &none);
  posix_spawnattr_setsigdefault(attributes, &all);
  posix_spawnattr_setpgroup(attributes, 0);
  posix_spawnattr_setflags(attributes,
                           POSIX_SPAWN_SETSIGMASK | POSIX_SPAWN_SETSIGDEF | POSIX_SPAWN_SETPGROUP);
}

ExtensionProcess::End endOf(int status) {
  if (WIFSIGNALED(status)) {
    const int number = WTERMSIG(status);
    return {"killed by signal " + std::to_string(number),
            number == SIGKILL || number == SIGTERM || number == SIGINT};
  }
  return {"exit status " + std::to_string(WEXITSTATUS(status)), WEXITSTATUS(status) == 0};
}

}  // namespace

ExtensionProcess::ExtensionProcess(pid_t identifier)
    : identifier_(identifier), startedNanoseconds_(NSDate::now().nanosecondsSince1970()) {}

std::shared_ptr<ExtensionProcess> ExtensionProcess::start(const std::string &program, const std::string &home,
                                                          int socket, NSError *error) {
  std::array<std::string, 5> arguments{program, "--home", home, "--host-descriptor",
                                       std::to_string(kChildSocket)};
  std::array<char *, 6> argv{};
  for (std::size_t index = 0; index < arguments.size(); ++index) argv[index] = arguments[index].data();

  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  // Also when it has that number already: the copy isn't closed by the start.
  posix_spawn_file_actions_adddup2(&actions, socket, kChildSocket);
  posix_spawn_file_actions_addclosefrom_np(&actions, kChildSocket + 1);
  posix_spawnattr_t attributes;
  prepareAttributes(&attributes);
  pid_t identifier = 0;
  const int code = posix_spawn(&identifier, program.c_str(), &actions, &attributes, argv.data(), environ);
  posix_spawnattr_destroy(&attributes);
  posix_spawn_file_actions_destroy(&actions);
  if (code != 0) {
    *error = NSError::errorWithPOSIXCode(code, "can't start " + program + ": " + std::strerror(code));
    return nullptr;
  }
  return std::shared_ptr<ExtensionProcess>(new ExtensionProcess(identifier));
}

void ExtensionProcess::awaitEnd(Ended ended) {
  dispatch_async_global([self = shared_from_this(), ended = std::move(ended)] { ended(self->reap()); });
}

ExtensionProcess::End ExtensionProcess::reap() {
  // First without reaping, so that the number stays taken until nobody signals it any more.
  siginfo_t information{};
  while (waitid(P_PID, static_cast<id_t>(identifier_), &information, WEXITED | WNOWAIT) != 0 &&
         errno == EINTR) {
  }
  Lock held(lock_);
  isReaped_ = true;
  int status = 0;
  while (waitpid(identifier_, &status, 0) < 0 && errno == EINTR) {
  }
  return endOf(status);
}

void ExtensionProcess::signal(int number) {
  Lock held(lock_);
  if (!isReaped_) kill(identifier_, number);
}

}  // namespace droxa
