#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>

#include "keld/ItemRecord.h"

namespace droxa::keld {

// What a watcher saw: something happened to `name` in a folder, which is told by its number or by its inode.
// An empty name stands for the folder itself.
struct ReplicaHint {
  ItemNumber folder = 0;
  std::uint64_t inode = 0;  // not 0: the folder by its inode
  std::string name;
  bool operator==(const ReplicaHint &) const = default;
};

// Receives what watchers see. Called on the watcher's thread.
class ReplicaWatcherSink {
 public:
  virtual ~ReplicaWatcherSink() = default;
  virtual void replicaChanged(ReplicaHint hint) = 0;
  // Changes were lost: everything is to be looked at again.
  virtual void replicaChangesLost(const std::string &why) = 0;
};

enum class WatcherKind : std::uint8_t { best, fanotify, inotify, scan };

// Tells its sink of what changes in the replica. Made running.
// Thread contract: folderAppeared and folderVanished on the keeper's thread; description() on any thread. The
// sink is not called any more when the destructor has returned.
class ReplicaWatcher {
 public:
  virtual ~ReplicaWatcher() = default;
  // The folder is about to be read: what changes in it from now on must be told. `descriptor` is open on it.
  virtual void folderAppeared(ItemNumber folder, int descriptor) = 0;
  virtual void folderVanished(ItemNumber folder) = 0;
  // "fanotify", "inotify", "scanning" and why.
  virtual std::string description() const = 0;
  // The replica must be looked at from time to time, because not every change is told.
  virtual bool needsScanning() const = 0;
};

// Each is null, with `problem` saying why, where the system doesn't permit it.
std::unique_ptr<ReplicaWatcher> MakeFanotifyWatcher(const std::string &replicaPath, ReplicaWatcherSink &sink,
                                                    std::string *problem);
std::unique_ptr<ReplicaWatcher> MakeInotifyWatcher(ReplicaWatcherSink &sink, std::string *problem);
std::unique_ptr<ReplicaWatcher> MakeScanningWatcher(std::string why);

// The wanted one; `best` is the first that works of fanotify, inotify and scanning, and a wanted one that
// doesn't work is replaced by scanning, which is logged.
std::unique_ptr<ReplicaWatcher> MakeReplicaWatcher(WatcherKind kind, const std::string &replicaPath,
                                                   ReplicaWatcherSink &sink);

}  // namespace droxa::keld
