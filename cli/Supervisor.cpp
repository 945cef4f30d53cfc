#include "cli/Supervisor.h"

#include <algorithm>
#include <cerrno>
#include <signal.h>
#include <sys/wait.h>

namespace droxa {

namespace {

using namespace std::chrono_literals;
using Clock = ChildProcess::Clock;

constexpr std::chrono::milliseconds kPatience = 5s;
constexpr std::chrono::milliseconds kLook = 200ms;  // how often pauses are looked at

sigset_t supervisorSignals() {
  sigset_t signals;
  sigemptyset(&signals);
  for (const int number : {SIGCHLD, SIGINT, SIGTERM, SIGHUP}) sigaddset(&signals, number);
  return signals;
}

// The next signal, 0 when none comes in time.
int nextSignal(std::chrono::milliseconds longest) {
  const sigset_t signals = supervisorSignals();
  const timespec time{longest.count() / 1000, longest.count() % 1000 * 1'000'000};
  const int number = sigtimedwait(&signals, nullptr, &time);
  return std::max(number, 0);
}

}  // namespace

void blockSupervisorSignals() {
  const sigset_t signals = supervisorSignals();
  pthread_sigmask(SIG_BLOCK, &signals, nullptr);
}

Supervisor::~Supervisor() {
  stop();
}

bool Supervisor::add(ChildProcess child, std::string *problem) {
  children_.push_back(std::move(child));
  if (children_.back().start(problem)) return true;
  children_.pop_back();
  return false;
}

bool Supervisor::keepRunning(std::chrono::milliseconds duration) {
  const auto until = Clock::now() + duration;
  for (auto now = Clock::now(); now < until; now = Clock::now()) {
    const int number = nextSignal(std::min(kLook, std::chrono::ceil<std::chrono::milliseconds>(until - now)));
    if (number != 0 && number != SIGCHLD) return true;
    reap();
    startAgain();
  }
  return false;
}

void Supervisor::reap() {
  for (ChildProcess &child : children_) {
    int status = 0;
    if (!child.isRunning() || waitpid(child.identifier(), &status, WNOHANG) != child.identifier()) continue;
    const auto identifier = child.identifier();
    child.ended(status, Clock::now());
    err_ << "droxa: " << child.name() << " (process " << identifier << ") ended: " << child.lastEnd()
         << "; it is started again (log: " << child.logFile() << ")" << std::endl;
  }
}

void Supervisor::startAgain() {
  for (ChildProcess &child : children_) {
    if (child.isRunning() || Clock::now() < child.startAgainAt()) continue;
    std::string problem;
    if (child.start(&problem)) {
      err_ << "droxa: " << child.name() << " runs again as process " << child.identifier() << std::endl;
    } else {
      err_ << "droxa: " << problem << std::endl;
    }
  }
}

void Supervisor::stop() {
  for (auto child = children_.rbegin(); child != children_.rend(); ++child) {
    if (!child->isRunning()) continue;
    child->signal(SIGTERM);
    awaitEnd(*child, kPatience);
    if (!child->isRunning()) continue;
    err_ << "droxa: " << child->name() << " does not end, so it is killed" << std::endl;
    child->signal(SIGKILL);
    awaitEnd(*child, kPatience);
  }
}

void Supervisor::awaitEnd(const ChildProcess &child, std::chrono::milliseconds longest) {
  const auto until = Clock::now() + longest;
  while (child.isRunning() && Clock::now() < until) {
    for (ChildProcess &one : children_) {
      int status = 0;
      if (one.isRunning() && waitpid(one.identifier(), &status, WNOHANG) == one.identifier())
        one.ended(status, Clock::now());
    }
    if (child.isRunning()) nextSignal(20ms);
  }
}

}  // namespace droxa
