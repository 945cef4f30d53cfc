#pragma once

#include <chrono>
#include <memory>
#include <optional>

#include "cli/CallResult.h"
#include "tessaly/QVDaemonConnection.h"

namespace droxa {

// The daemon's calls that `droxa` makes itself, each waited for, at most for the timeout.
// Thread contract: one thread.
class DaemonClient {
 public:
  using Account = std::optional<QVAccountDescription>;

  DaemonClient(std::shared_ptr<QVDaemonConnection> connection, std::chrono::milliseconds timeout);
  CallResult<QVDaemonStatus> status();
  CallResult<Account> account();
  CallResult<Account> signIn(const std::string &name);
  NSError signOut();

 private:
  const std::shared_ptr<QVDaemonConnection> connection_;
  const std::chrono::milliseconds timeout_;
};

}  // namespace droxa
