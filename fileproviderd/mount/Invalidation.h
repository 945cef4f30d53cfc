#pragma once

#include <condition_variable>
#include <deque>
#include <functional>
#include <map>
#include <set>
#include <thread>

#include "fileproviderd/mount/MountedDrive.h"

namespace droxa {

// Tells the kernel, and through it the programs that watch folders of the mount.
// Thread contract: called on the invalidation's thread alone, without a lock; may wait for the kernel.
class KernelNotices {
 public:
  virtual ~KernelNotices() = default;
  virtual void contentsChanged(NodeId node) = 0;  // and attributes
  // `isToldToWatchers`: the programs that watch its folder are to know.
  virtual void attributesChanged(NodeId node, bool isToldToWatchers) = 0;
  virtual void listingChanged(NodeId folder) = 0;
  virtual void appeared(NodeId folder, const std::string &name, const struct stat &status) = 0;
  virtual void disappeared(NodeId folder, const std::string &name, NodeId node, mode_t type) = 0;
};

// Compares what happened in the replica with what the kernel was told, and has it told the difference. What
// was done through the mount makes none.
// Thread contract: seen(), missed() and contentsChanged() on any thread; lock_ guards what waits. All notices
// come from a thread of its own, which answers no requests: the kernel may make it wait for one.
class Invalidation final : public KernelNews {
 public:
  Invalidation(std::shared_ptr<MountedDrive> drive, std::shared_ptr<KernelNotices> notices);
  ~Invalidation() override { stop(); }
  Invalidation(const Invalidation &) = delete;
  Invalidation &operator=(const Invalidation &) = delete;

  void start();
  void stop();
  // As ReplicaWatch::Seen.
  void seen(NodeId folder, const std::string &name, bool isNew);
  void missed();  // everything may have changed
  void contentsChanged(NodeId node) override;

 private:
  using Name = std::pair<NodeId, std::string>;
  void run();
  void compare(const Name &name, bool isNew);
  void compareFolder(NodeId folder);
  void compareEverything();
  bool hasMuchToDo();
  void differs(NodeId folder, const std::string &name, NodeId node, const struct stat &now);

  const std::shared_ptr<MountedDrive> drive_;
  const std::shared_ptr<KernelNotices> notices_;
  std::thread thread_;
  Mutex lock_;
  std::condition_variable_any changed_;
  std::deque<Name> names_ GUARDED_BY(lock_);
  std::map<Name, bool> waiting_ GUARDED_BY(lock_);  // the same; whether the name is new
  std::set<NodeId> contents_ GUARDED_BY(lock_);
  bool isEverything_ GUARDED_BY(lock_) = false;
  bool isStopped_ GUARDED_BY(lock_) = false;
};

}  // namespace droxa
