#include "cli/ChildProcess.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

namespace droxa {

namespace {

using namespace std::chrono_literals;

constexpr auto kLongEnough = 10s;  // a run of that length starts the pauses anew
constexpr auto kFirstPause = 200ms;
constexpr std::chrono::milliseconds kLongestPause = 10s;
constexpr int kCannotExecute = 127;

std::string endText(int waitStatus) {
  if (WIFSIGNALED(waitStatus)) return "killed by signal " + std::to_string(WTERMSIG(waitStatus));
  return "exit status " + std::to_string(WEXITSTATUS(waitStatus));
}

}  // namespace

ChildProcess::ChildProcess(std::string name, std::vector<std::string> command, std::string logFile)
    : name_(std::move(name)), command_(std::move(command)), logFile_(std::move(logFile)) {}

bool ChildProcess::start(std::string *problem) {
  const int log = open(logFile_.c_str(), O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0600);
  if (log < 0) {
    *problem = "can't open " + logFile_ + ": " + std::strerror(errno);
    return false;
  }
  std::vector<char *> argv;
  for (const std::string &word : command_) argv.push_back(const_cast<char *>(word.c_str()));
  argv.push_back(nullptr);
  const pid_t parent = getpid();
  const pid_t child = fork();
  if (child == 0) runChild(argv.data(), log, parent);
  const int code = errno;
  close(log);
  if (child < 0) {
    *problem = "can't start " + name_ + ": " + std::strerror(code);
    return false;
  }
  identifier_ = child;
  startedAt_ = Clock::now();
  return true;
}

// Between fork and exec of a process with threads: system calls alone.
void ChildProcess::runChild(char *const *argv, int log, pid_t parent) const {
  // A terminal's Ctrl-C is for the supervisor, which ends its children in order; one that is killed takes
  // them along.
  setpgid(0, 0);
  prctl(PR_SET_PDEATHSIG, SIGTERM);
  if (getppid() != parent) _exit(kCannotExecute);
  sigset_t none;
  sigemptyset(&none);
  sigprocmask(SIG_SETMASK, &none, nullptr);
  const int null = open("/dev/null", O_RDONLY);
  dup2(null, STDIN_FILENO);
  dup2(log, STDOUT_FILENO);
  dup2(log, STDERR_FILENO);
  close_range(STDERR_FILENO + 1, ~0U, 0);
  execv(argv[0], argv);
  _exit(kCannotExecute);
}

void ChildProcess::ended(int waitStatus, Clock::time_point now) {
  identifier_ = 0;
  lastEnd_ = endText(waitStatus);
  if (now - startedAt_ >= kLongEnough) pause_ = 0ms;
  startAgainAt_ = now + pause_;
  pause_ = std::clamp<std::chrono::milliseconds>(pause_ * 2, kFirstPause, kLongestPause);
}

void ChildProcess::signal(int number) const {
  if (identifier_ != 0) kill(identifier_, number);
}

}  // namespace droxa
