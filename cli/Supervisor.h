#pragma once

#include <chrono>
#include <functional>
#include <ostream>
#include <string>
#include <vector>

#include "cli/ChildProcess.h"

namespace droxa {

// Keeps a list of programs running until it is told to stop.
// Thread contract: the main thread only. SIGCHLD, SIGINT, SIGTERM and SIGHUP must be blocked in every thread.
class Supervisor {
 public:
  explicit Supervisor(std::ostream &err) : err_(err) {}
  ~Supervisor();  // ends what still runs

  // Starts one more. False with `problem`.
  bool add(ChildProcess child, std::string *problem);
  // Keeps them running for `duration`, or until SIGINT, SIGTERM or SIGHUP; true in that case.
  bool keepRunning(std::chrono::milliseconds duration);
  // Ends them in the reverse order of their start, each within five seconds.
  void stop();

  std::vector<ChildProcess> &children() { return children_; }

 private:
  // Sees to whoever ended. False when nobody did.
  void reap();
  void startAgain();
  void awaitEnd(const ChildProcess &child, std::chrono::milliseconds longest);

  std::ostream &err_;
  std::vector<ChildProcess> children_;
};

// The signals that keepRunning() waits for, blocked for the calling thread and those that it starts later.
void blockSupervisorSignals();

}  // namespace droxa
