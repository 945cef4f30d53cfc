#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <sys/types.h>

#include "platform/foundation/NSError.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// One run of the extension's program.
// Thread contract: any thread. lock_ keeps the number from being signalled after the process was reaped.
class ExtensionProcess final : public std::enable_shared_from_this<ExtensionProcess> {
 public:
  struct End {
    std::string reason;        // "exit status 1", "killed by signal 11"
    bool wasAskedFor = false;  // somebody ended it: SIGKILL, SIGTERM, SIGINT or status 0
  };
  using Ended = std::function<void(const End &end)>;  // exactly once, on the pool

  // Starts `program`, which gets `socket` (and, beyond the standard ones, no other descriptor of this
  // process). Null with `error` set when it can't be started.
  static std::shared_ptr<ExtensionProcess> start(const std::string &program, const std::string &home,
                                                 int socket, NSError *error);
  // To be called once: waits for the end on a thread of the pool.
  void awaitEnd(Ended ended);
  void signal(int number);  // nothing once it has ended

  pid_t identifier() const { return identifier_; }
  std::int64_t startedNanoseconds() const { return startedNanoseconds_; }

 private:
  explicit ExtensionProcess(pid_t identifier);
  End reap();

  const pid_t identifier_;
  const std::int64_t startedNanoseconds_;
  Mutex lock_;
  bool isReaped_ GUARDED_BY(lock_) = false;
};

}  // namespace droxa
