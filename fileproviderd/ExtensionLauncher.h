#pragma once

#include <chrono>
#include <condition_variable>
#include <functional>
#include <memory>
#include <string>

#include "fileproviderd/ExtensionConnecting.h"
#include "fileproviderd/ExtensionProcess.h"
#include "platform/foundation/ThreadSafety.h"
#include "platform/xpc/NSXPCConnection.h"

namespace droxa {

// Starts the extension's process when somebody asks for the extension, and again at the next question after
// it has gone. One that keeps ending before it answers anything is left alone for a growing while. Thread
// contract: any thread. lock_ guards the run under way; it is held while the process is started, never while
// the connection's handlers or `ended` run.
class ExtensionLauncher final : public ExtensionConnecting,
                                public std::enable_shared_from_this<ExtensionLauncher> {
 public:
  struct Configuration {
    std::string program;
    std::string home;
    std::chrono::milliseconds callDeadline{
        25'000};                                  // below the clients' own, so that they are told the reason
    std::chrono::milliseconds firstPause{1'000};  // after kMostQuickEnds
    std::chrono::milliseconds longestPause{30'000};
  };
  struct Status {
    pid_t processIdentifier = 0;  // 0: not running
    std::int64_t startedNanoseconds = 0;
    std::uint64_t launches = 0;
    std::string lastEnd;
  };
  static constexpr int kMostQuickEnds = 3;

  // `ended` is called for each run that is over, on the pool.
  ExtensionLauncher(Configuration configuration, std::function<void()> ended);
  ~ExtensionLauncher() override;

  // What the extension may call; set before the first question.
  void setHost(std::shared_ptr<NSFileProviderHostProtocol> host);

  std::shared_ptr<NSFileProviderExtensionProtocol> extension(NSXPCErrorHandler handler,
                                                             NSError *error) override;
  void noteAnswer() override;
  std::string describeEnd() override;

  Status status() const;
  // Ends the process and starts no other; waits for the end, and forces it after two seconds.
  void stop();

 private:
  bool launch(NSError *error) REQUIRES(lock_);
  bool mayLaunch(NSError *error) REQUIRES(lock_);
  void connect(int socket) REQUIRES(lock_);
  void connectionEnded(std::uint64_t run);
  void processEnded(std::uint64_t run, const ExtensionProcess::End &end);
  // Waits until no process is left whose connection is gone.
  void awaitReaping(Lock &held, std::chrono::milliseconds longest) REQUIRES(lock_);

  const Configuration configuration_;
  const std::function<void()> ended_;

  mutable Mutex lock_;
  std::condition_variable_any reaped_;
  std::shared_ptr<NSFileProviderHostProtocol> host_ GUARDED_BY(lock_);
  std::shared_ptr<NSXPCConnection> connection_ GUARDED_BY(lock_);  // of the run under way
  std::shared_ptr<ExtensionProcess> process_ GUARDED_BY(lock_);    // until it is reaped
  std::uint64_t launches_ GUARDED_BY(lock_) = 0;                   // also the number of the newest run
  std::uint64_t endTold_ GUARDED_BY(lock_) = 0;  // the newest run that `ended` was called for
  std::string lastEnd_ GUARDED_BY(lock_);
  bool hasAnswered_ GUARDED_BY(lock_) = false;
  int quickEnds_ GUARDED_BY(lock_) = 0;
  std::chrono::steady_clock::time_point notBefore_ GUARDED_BY(lock_);
  bool isStopped_ GUARDED_BY(lock_) = false;
};

}  // namespace droxa
