#pragma once

#include <atomic>
#include <optional>
#include <string>
#include <sys/types.h>

#include "fileproviderd/mount/NodeTable.h"

namespace droxa {

// The change that the announcer plays at this moment (mount/Announcer.h): requests of its process are about
// what has been done already. Thread contract: any thread; lock_ guards the change.
class Playing {
 public:
  struct Change {
    NodeId folder = 0;
    std::string name;
    bool isMaking = false;
  };

  void setProcess(pid_t process) { process_ = process; }
  void begin(Change change) {
    const Lock held(lock_);
    change_ = std::move(change);
  }
  void end() {
    const Lock held(lock_);
    change_.reset();
  }

  bool isAnnouncer(pid_t process) const { return process != 0 && process == process_.load(); }
  // Whether `process` is the announcer, and plays that `name` in `folder` is made (else: is gone).
  bool isPlayed(pid_t process, NodeId folder, const std::string &name, bool isMaking) const {
    if (!isAnnouncer(process)) return false;
    const Lock held(lock_);
    return change_ && change_->folder == folder && change_->name == name && change_->isMaking == isMaking;
  }

 private:
  std::atomic<pid_t> process_{0};
  mutable Mutex lock_;
  std::optional<Change> change_ GUARDED_BY(lock_);
};

}  // namespace droxa
