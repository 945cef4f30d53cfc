#pragma once

#include <functional>
#include <thread>
#include <unordered_map>

#include "fileproviderd/mount/Descriptor.h"
#include "fileproviderd/mount/NodeTable.h"

namespace droxa {

// Sees what happens in those folders of the replica that the kernel knows.
// Thread contract: start() and stop() on one thread, the rest on any. lock_ guards the table. `seen` and
// `missed` are called on the watch's own thread.
class ReplicaWatch {
 public:
  // `name` in `folder` was made or came there (`isNew`), was changed or removed; "": the folder itself was
  // changed.
  using Seen = std::function<void(NodeId folder, const std::string &name, bool isNew)>;
  using Missed = std::function<void()>;  // some were not told

  ReplicaWatch() = default;
  ~ReplicaWatch() { stop(); }
  ReplicaWatch(const ReplicaWatch &) = delete;
  ReplicaWatch &operator=(const ReplicaWatch &) = delete;

  bool start(Seen seen, Missed missed);
  void stop();

  // False when the system has no room for another watch.
  bool add(NodeId folder, int pathDescriptor);
  void remove(NodeId folder);
  bool isWatched(NodeId folder) const;
  std::size_t size() const;

 private:
  void run();
  void readEvents();

  Descriptor events_;
  Descriptor end_;
  Seen seen_;
  Missed missed_;
  std::thread thread_;
  mutable Mutex lock_;
  std::unordered_map<int, NodeId> folders_ GUARDED_BY(lock_);
  std::unordered_map<NodeId, int> watches_ GUARDED_BY(lock_);
};

}  // namespace droxa
