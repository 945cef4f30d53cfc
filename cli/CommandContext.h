#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <ostream>
#include <string>

#include "cli/ControlClient.h"
#include "platform/foundation/NSError.h"

namespace droxa {

class QVDaemonConnection;

// What a command works with; a test gives doubles.
// Thread contract: one thread.
struct CommandContext {
  std::ostream &out;
  std::ostream &err;
  std::shared_ptr<ControlClient> host;
  std::shared_ptr<QVDaemonConnection> daemon;
  std::chrono::milliseconds timeout{30'000};
  // Waits for Ctrl-C or SIGTERM, at most that long; true when one came. For the commands that stay.
  std::function<bool(std::chrono::milliseconds)> waitForStop;
  bool isTerminal = false;  // `out` is shown to a person as it is written
};

// Says on the error output what went wrong with `asked`; gives the exit status for it.
int reportError(const CommandContext &context, const std::string &asked, const NSError &error);

}  // namespace droxa
