#pragma once

#include <cstdint>
#include <deque>
#include <optional>
#include <string>
#include <sys/stat.h>
#include <unordered_map>
#include <vector>

#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// What the kernel calls a node by: its slot, and above that how often the slot was used before.
using NodeId = std::uint64_t;
inline constexpr NodeId kRootNode = 1;

// What tells one state of a file from another: its contents by size and date, its attributes by `changed`.
struct FileStamp {
  std::uint64_t inode = 0;
  std::uint64_t size = 0;
  std::int64_t modified = 0;  // nanoseconds
  std::int64_t changed = 0;

  static FileStamp of(const struct stat &status);
  bool hasSameContents(const FileStamp &other) const {
    return size == other.size && modified == other.modified;
  }
  bool operator==(const FileStamp &) const = default;
};

// One node as it was when it was asked for.
struct NodeView {
  NodeId parent = 0;  // 0: it has no name any more
  std::string name;
  std::uint64_t number = 0;  // shown as st_ino
  mode_t type = 0;           // S_IFMT bits
  FileStamp told;            // what the kernel was told last
};

// The files and folders that the kernel knows, each by the folder and the name under which it was found last.
// A node lives while the kernel or a node below it refers to it. It stands for one file of the replica
// (device and inode). When a document's file is replaced by one of the same size and date, as its placeholder
// is by its contents, the node goes over to that file and keeps the inode number that programs saw.
//
// A node takes about 100 bytes and its name: slots are chained by number, not by pointer.
// Thread contract: any thread; lock_ guards everything and is held for look-ups alone.
class NodeTable {
 public:
  struct Entered {
    NodeId node = 0;
    std::uint64_t number = 0;
    bool isNew = false;
    bool hasChanged = false;  // its contents aren't those that the kernel may have pages of
  };
  // Folders that are gone with a forgotten node.
  using Freed = std::vector<NodeId>;

  NodeTable();
  ~NodeTable();
  NodeTable(const NodeTable &) = delete;
  NodeTable &operator=(const NodeTable &) = delete;

  // The kernel is told of `name` in `parent` once more: finds its node, or makes one. `status` becomes what
  // the kernel was told.
  Entered enter(NodeId parent, const std::string &name, const struct stat &status);
  Freed forget(NodeId node, std::uint64_t times);

  std::optional<NodeView> view(NodeId node) const;
  NodeId find(NodeId parent, const std::string &name) const;  // 0: none
  // The names from below the root or the place that `isFixed` tells to the node, outermost first; the first
  // is the root or a fixed one. Empty when the node, or a folder above it, has no name any more.
  std::vector<NodeId> chain(NodeId node) const;
  std::vector<NodeId> all() const;
  std::size_t size() const;

  void renamed(NodeId parent, const std::string &name, NodeId newParent, const std::string &newName);
  void exchanged(NodeId parent, const std::string &name, NodeId newParent, const std::string &newName);
  // The name is gone. The node stays for whoever has it open; `isLost` when its file went with the name,
  // whose inode may be another's at once. renamed() does the same to what was at the new name.
  void removed(NodeId parent, const std::string &name, bool isLost);

  // The kernel is told of the node's file again. nullopt when `status` is another file's; else whether the
  // contents have changed, and nobody here changed them.
  std::optional<bool> see(NodeId node, const struct stat &status);
  // Between these the file is being changed through the mount, which the kernel knows of.
  void beginOwnChange(NodeId node);
  void endOwnChange(NodeId node, const struct stat *now);
  bool isBeingChanged(NodeId node) const;
  // Whether the kernel's pages of the node may be kept when it is opened; they are taken for renewed then.
  bool mayKeepPages(NodeId node);

 private:
  using Slot = std::uint32_t;
  struct Node;
  struct Chains {  // a hash table of slots, linked through the nodes
    std::vector<Slot> heads;
    std::size_t count = 0;
  };

  Slot slotOf(NodeId node) const REQUIRES(lock_);
  NodeId idOf(Slot slot) const REQUIRES(lock_);
  Slot findByName(Slot parent, const std::string &name) const REQUIRES(lock_);
  Slot findByFile(std::uint64_t device, std::uint64_t inode) const REQUIRES(lock_);
  Slot make(Slot parent, const std::string &name, const struct stat &status) REQUIRES(lock_);
  Slot place(Slot parent, const std::string &name, const struct stat &status, bool *isNew) REQUIRES(lock_);
  void linkName(Slot slot, Slot parent, const std::string &name) REQUIRES(lock_);
  void unlinkName(Slot slot) REQUIRES(lock_);
  void linkFile(Slot slot, const struct stat &status) REQUIRES(lock_);
  void unlinkFile(Slot slot) REQUIRES(lock_);
  void growIfNeeded() REQUIRES(lock_);
  void release(Slot slot, Freed *freed) REQUIRES(lock_);
  bool goesOver(Slot slot, const struct stat &status) REQUIRES(lock_);
  bool tell(Slot slot, const struct stat &status) REQUIRES(lock_);
  std::uint64_t freeNumber(std::uint64_t inode) REQUIRES(lock_);

  mutable Mutex lock_;
  std::deque<Node> nodes_ GUARDED_BY(lock_);
  std::vector<Slot> free_ GUARDED_BY(lock_);
  Chains byName_ GUARDED_BY(lock_);
  Chains byFile_ GUARDED_BY(lock_);
  // Numbers that are shown though the file that had them has gone.
  std::unordered_map<std::uint64_t, Slot> keptNumbers_ GUARDED_BY(lock_);
  std::uint64_t lastOwnNumber_ GUARDED_BY(lock_) = std::uint64_t{1} << 62U;
  std::size_t live_ GUARDED_BY(lock_) = 0;
};

}  // namespace droxa
