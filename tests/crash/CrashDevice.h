#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "tessaly/QVDaemonConnectionOverXPC.h"
#include "tests/crash/Model.h"
#include "tests/system/Process.h"

namespace droxa::crash {

// One device: a daemon's process that is killed and started again, its replica on the disk, and calls to it
// that may meet a dead daemon but must end. Thread contract: start(), kill() and stop() on one thread; calls
// on any.
class CrashDevice {
 public:
  CrashDevice(const std::string &folder, std::string name, Model &model);

  void start();
  void kill();  // as when the power of one process goes: SIGKILL, and its end is waited for
  bool isRunning() { return process_ && process_->isRunning(); }

  const std::string &name() const { return name_; }
  std::string home() const { return home_; }
  std::string documents() const { return home_ + "/replica/com.quorva.Tessaly.default/Documents"; }
  std::string at(const std::string &path) const {
    return path.empty() ? documents() : documents() + "/" + path;
  }
  std::string outside() const { return outside_; }  // on the same file system, and not in the drive

  // nil: acknowledged. A call that doesn't end is a finding.
  NSError download(const std::string &path);
  NSError evict(const std::string &path);
  NSError waitForUpload();
  NSError confirmDeletions();
  NSError transferStatus(QVTransferStatus *status);
  NSError daemonStatus(QVDaemonStatus *status);

 private:
  using Done = std::function<void(const NSError &error)>;
  NSError call(const std::string &what, const std::function<void(QVProtocol &, Done)> &start);

  const std::string name_, cloud_, home_, outside_;
  Model &model_;
  const std::shared_ptr<QVDaemonConnectionOverXPC> connection_;
  std::unique_ptr<testing::Process> process_;
  int runs_ = 0;
};

}  // namespace droxa::crash
