#include "fileproviderd/mount/NodeTable.h"

#include <algorithm>
#include <functional>
#include <memory>
#include <string_view>
#include <utility>

namespace droxa {

namespace {

constexpr std::uint32_t kRootSlot = 1;
constexpr std::size_t kFirstBuckets = 1024;

std::int64_t nanoseconds(const timespec &time) {
  return std::int64_t{time.tv_sec} * 1'000'000'000 + time.tv_nsec;
}

std::size_t hashOfFile(std::uint64_t device, std::uint64_t inode) {
  return (inode ^ (device << 40U)) * 0x9e3779b97f4a7c15U >> 16U;
}

std::size_t hashOfName(std::uint32_t parent, std::string_view name) {
  return std::hash<std::string_view>()(name) ^ (parent * std::size_t{0x9e3779b97f4a7c15U});
}

}  // namespace

FileStamp FileStamp::of(const struct stat &status) {
  return {status.st_ino, static_cast<std::uint64_t>(status.st_size), nanoseconds(status.st_mtim),
          nanoseconds(status.st_ctim)};
}

struct NodeTable::Node {
  std::unique_ptr<char[]> name;  // null: no name
  std::uint64_t device = 0;
  std::uint64_t number = 0;
  std::uint64_t lookups = 0;
  FileStamp told;
  Slot parent = 0;
  Slot nextByName = 0;
  Slot nextByFile = 0;
  std::uint32_t generation = 0;
  std::uint32_t children = 0;
  mode_t type = 0;
  std::uint16_t ownChanges = 0;  // under way
  bool hasStalePages = false;
  bool isUsed = false;
  bool hasFile = false;

  std::string_view text() const { return name ? std::string_view(name.get()) : std::string_view(); }
};

NodeTable::NodeTable() {
  byName_.heads.resize(kFirstBuckets);
  byFile_.heads.resize(kFirstBuckets);
  nodes_.resize(kRootSlot + 1);
  Node &root = nodes_[kRootSlot];
  root.isUsed = true;
  root.lookups = 1;
  root.type = S_IFDIR;
  root.number = kRootNode;
  live_ = 1;
}

NodeTable::~NodeTable() = default;

NodeTable::Slot NodeTable::slotOf(NodeId node) const {
  const auto slot = static_cast<Slot>(node);
  const bool isKnown = slot < nodes_.size() && nodes_[slot].isUsed && nodes_[slot].generation == node >> 32U;
  return isKnown ? slot : 0;
}

NodeId NodeTable::idOf(Slot slot) const {
  return slot == 0 ? 0 : (NodeId{nodes_[slot].generation} << 32U) | slot;
}

NodeTable::Slot NodeTable::findByName(Slot parent, const std::string &name) const {
  Slot slot = byName_.heads[hashOfName(parent, name) & (byName_.heads.size() - 1)];
  while (slot != 0 && (nodes_[slot].parent != parent || nodes_[slot].text() != name))
    slot = nodes_[slot].nextByName;
  return slot;
}

NodeTable::Slot NodeTable::findByFile(std::uint64_t device, std::uint64_t inode) const {
  Slot slot = byFile_.heads[hashOfFile(device, inode) & (byFile_.heads.size() - 1)];
  while (slot != 0 && (nodes_[slot].told.inode != inode || nodes_[slot].device != device))
    slot = nodes_[slot].nextByFile;
  return slot;
}

void NodeTable::linkName(Slot slot, Slot parent, const std::string &name) {
  Node &node = nodes_[slot];
  node.name = std::make_unique<char[]>(name.size() + 1);
  std::copy(name.begin(), name.end(), node.name.get());
  node.parent = parent;
  ++nodes_[parent].children;
  Slot &head = byName_.heads[hashOfName(parent, name) & (byName_.heads.size() - 1)];
  node.nextByName = std::exchange(head, slot);
  ++byName_.count;
}

// Leaves the parent's count of children: whoever gives the node a new name, or none, sees to that.
void NodeTable::unlinkName(Slot slot) {
  Node &node = nodes_[slot];
  if (!node.name) return;
  Slot *at = &byName_.heads[hashOfName(node.parent, node.text()) & (byName_.heads.size() - 1)];
  while (*at != slot) at = &nodes_[*at].nextByName;
  *at = node.nextByName;
  node.name.reset();
  --byName_.count;
}

void NodeTable::linkFile(Slot slot, const struct stat &status) {
  Node &node = nodes_[slot];
  node.device = status.st_dev;
  node.told = FileStamp::of(status);
  node.hasFile = true;
  Slot &head = byFile_.heads[hashOfFile(node.device, node.told.inode) & (byFile_.heads.size() - 1)];
  node.nextByFile = std::exchange(head, slot);
  ++byFile_.count;
}

void NodeTable::unlinkFile(Slot slot) {
  Node &node = nodes_[slot];
  if (!node.hasFile) return;
  Slot *at = &byFile_.heads[hashOfFile(node.device, node.told.inode) & (byFile_.heads.size() - 1)];
  while (*at != slot) at = &nodes_[*at].nextByFile;
  *at = node.nextByFile;
  node.hasFile = false;
  --byFile_.count;
}

void NodeTable::growIfNeeded() {
  if (live_ < byName_.heads.size()) return;
  const std::size_t buckets = byName_.heads.size() * 2;
  byName_.heads.assign(buckets, 0);
  byFile_.heads.assign(buckets, 0);
  for (Slot slot = kRootSlot; slot < nodes_.size(); ++slot) {
    Node &node = nodes_[slot];
    if (node.isUsed && node.name)
      node.nextByName =
          std::exchange(byName_.heads[hashOfName(node.parent, node.text()) & (buckets - 1)], slot);
    if (node.isUsed && node.hasFile)
      node.nextByFile =
          std::exchange(byFile_.heads[hashOfFile(node.device, node.told.inode) & (buckets - 1)], slot);
  }
}

// A number is only shown twice if a file got the inode of one whose node went over to its contents.
std::uint64_t NodeTable::freeNumber(std::uint64_t inode) {
  return keptNumbers_.contains(inode) || inode == kRootNode ? ++lastOwnNumber_ : inode;
}

NodeTable::Slot NodeTable::make(Slot parent, const std::string &name, const struct stat &status) {
  growIfNeeded();
  Slot slot = 0;
  if (free_.empty()) {
    slot = static_cast<Slot>(nodes_.size());
    nodes_.emplace_back();
  } else {
    slot = free_.back();
    free_.pop_back();
  }
  ++live_;
  Node &node = nodes_[slot];
  node.isUsed = true;
  node.number = freeNumber(status.st_ino);
  node.type = status.st_mode & S_IFMT;
  linkFile(slot, status);
  linkName(slot, parent, name);
  return slot;
}

// Whether the node now stands for the file that is at its name, because that holds the same contents.
bool NodeTable::goesOver(Slot slot, const struct stat &status) {
  Node &node = nodes_[slot];
  FileStamp told = node.told;
  if (!S_ISREG(node.type) || !S_ISREG(status.st_mode) || !node.hasFile) return false;
  if (!told.hasSameContents(FileStamp::of(status))) return false;
  keptNumbers_[node.number] = slot;
  unlinkFile(slot);
  linkFile(slot, status);
  told.inode = status.st_ino;
  node.told = told;
  return true;
}

// True when the contents are others than the kernel was told of, by nobody's change through the mount.
bool NodeTable::tell(Slot slot, const struct stat &status) {
  Node &node = nodes_[slot];
  if (node.ownChanges > 0) return false;  // its end says how the file is then
  const FileStamp now = FileStamp::of(status);
  const bool hasChanged = S_ISREG(node.type) && !node.told.hasSameContents(now);
  node.told = now;
  node.hasStalePages = node.hasStalePages || hasChanged;
  return hasChanged;
}

// The node for a file that was found under a name; names and files of others are put right on the way.
NodeTable::Slot NodeTable::place(Slot parent, const std::string &name, const struct stat &status,
                                 bool *isNew) {
  const Slot named = findByName(parent, name);
  Slot slot = findByFile(status.st_dev, status.st_ino);
  if (slot != 0 && nodes_[slot].type != (status.st_mode & S_IFMT)) {
    unlinkFile(slot);  // its inode is another's by now
    unlinkName(slot);
    slot = 0;
  }
  if (slot != 0 && slot == named) return slot;
  if (slot == 0 && named != 0 && goesOver(named, status)) return named;
  if (named != 0) unlinkName(named);
  if (slot == 0) {
    *isNew = true;
    return make(parent, name, status);
  }
  unlinkName(slot);
  const Slot before = nodes_[slot].parent;
  linkName(slot, parent, name);
  if (before != 0) release(before, nullptr);
  return slot;
}

NodeTable::Entered NodeTable::enter(NodeId parent, const std::string &name, const struct stat &status) {
  const Lock held(lock_);
  const Slot folder = slotOf(parent);
  if (folder == 0) return {};
  Entered entered;
  const Slot slot = place(folder, name, status, &entered.isNew);
  Node &node = nodes_[slot];
  ++node.lookups;
  entered.node = idOf(slot);
  entered.number = node.number;
  entered.hasChanged = tell(slot, status);
  return entered;
}

// One child less, or one reason less to stay.
void NodeTable::release(Slot slot, Freed *freed) {
  if (slot == 0) return;
  --nodes_[slot].children;
  while (slot != kRootSlot && nodes_[slot].lookups == 0 && nodes_[slot].children == 0) {
    Node &node = nodes_[slot];
    if (freed && S_ISDIR(node.type)) freed->push_back(idOf(slot));
    unlinkName(slot);
    unlinkFile(slot);
    const auto kept = keptNumbers_.find(node.number);
    if (kept != keptNumbers_.end() && kept->second == slot) keptNumbers_.erase(kept);
    const Slot parent = node.parent;
    const std::uint32_t generation = node.generation + 1;
    node = Node();
    node.generation = generation;
    free_.push_back(slot);
    --live_;
    slot = parent;
    if (slot != 0) --nodes_[slot].children;
  }
}

NodeTable::Freed NodeTable::forget(NodeId node, std::uint64_t times) {
  const Lock held(lock_);
  Freed freed;
  const Slot slot = slotOf(node);
  if (slot == 0 || slot == kRootSlot) return freed;
  nodes_[slot].lookups -= std::min(times, nodes_[slot].lookups);
  ++nodes_[slot].children;  // release() takes one away
  release(slot, &freed);
  return freed;
}

std::optional<NodeView> NodeTable::view(NodeId id) const {
  const Lock held(lock_);
  const Slot slot = slotOf(id);
  if (slot == 0) return std::nullopt;
  const Node &node = nodes_[slot];
  return NodeView{node.name ? idOf(node.parent) : 0, std::string(node.text()), node.number, node.type,
                  node.told};
}

NodeId NodeTable::find(NodeId parent, const std::string &name) const {
  const Lock held(lock_);
  const Slot folder = slotOf(parent);
  return folder == 0 ? 0 : idOf(findByName(folder, name));
}

std::vector<NodeId> NodeTable::chain(NodeId node) const {
  const Lock held(lock_);
  std::vector<NodeId> chain;
  for (Slot slot = slotOf(node); slot != 0; slot = nodes_[slot].parent) {
    chain.push_back(idOf(slot));
    if (slot == kRootSlot) {
      std::reverse(chain.begin(), chain.end());
      return chain;
    }
    if (!nodes_[slot].name) break;
  }
  return {};
}

std::vector<NodeId> NodeTable::all() const {
  const Lock held(lock_);
  std::vector<NodeId> all;
  all.reserve(live_);
  for (Slot slot = kRootSlot; slot < nodes_.size(); ++slot)
    if (nodes_[slot].isUsed) all.push_back(idOf(slot));
  return all;
}

std::size_t NodeTable::size() const {
  const Lock held(lock_);
  return live_;
}

void NodeTable::renamed(NodeId parent, const std::string &name, NodeId newParent,
                        const std::string &newName) {
  const Lock held(lock_);
  const Slot from = slotOf(parent);
  const Slot to = slotOf(newParent);
  if (from == 0 || to == 0) return;
  const Slot slot = findByName(from, name);
  const Slot replaced = findByName(to, newName);
  if (slot == replaced) return;
  if (replaced != 0) {
    unlinkName(replaced);
    unlinkFile(replaced);
  }
  if (slot == 0) return;
  unlinkName(slot);
  const Slot before = nodes_[slot].parent;
  linkName(slot, to, newName);
  release(before, nullptr);
}

void NodeTable::exchanged(NodeId parent, const std::string &name, NodeId newParent,
                          const std::string &newName) {
  const Lock held(lock_);
  const Slot from = slotOf(parent);
  const Slot to = slotOf(newParent);
  if (from == 0 || to == 0) return;
  const Slot one = findByName(from, name);
  const Slot other = findByName(to, newName);
  for (const Slot slot : {one, other})
    if (slot != 0) unlinkName(slot);
  if (one != 0) linkName(one, to, newName);
  if (other != 0) linkName(other, from, name);
  if (one != 0) release(from, nullptr);
  if (other != 0) release(to, nullptr);
}

void NodeTable::removed(NodeId parent, const std::string &name, bool isLost) {
  const Lock held(lock_);
  const Slot folder = slotOf(parent);
  const Slot slot = folder == 0 ? 0 : findByName(folder, name);
  if (slot == 0) return;
  unlinkName(slot);
  if (isLost) unlinkFile(slot);
}

std::optional<bool> NodeTable::see(NodeId node, const struct stat &status) {
  const Lock held(lock_);
  const Slot slot = slotOf(node);
  if (slot == 0) return std::nullopt;
  if (slot == kRootSlot) return false;
  const bool isSame =
      nodes_[slot].told.inode == status.st_ino && nodes_[slot].type == (status.st_mode & S_IFMT);
  if (!isSame && !goesOver(slot, status)) return std::nullopt;
  return tell(slot, status);
}

void NodeTable::beginOwnChange(NodeId node) {
  const Lock held(lock_);
  if (const Slot slot = slotOf(node); slot != 0) ++nodes_[slot].ownChanges;
}

void NodeTable::endOwnChange(NodeId node, const struct stat *now) {
  const Lock held(lock_);
  const Slot slot = slotOf(node);
  if (slot == 0) return;
  --nodes_[slot].ownChanges;
  if (now && nodes_[slot].told.inode == now->st_ino) nodes_[slot].told = FileStamp::of(*now);
}

bool NodeTable::isBeingChanged(NodeId node) const {
  const Lock held(lock_);
  const Slot slot = slotOf(node);
  return slot != 0 && nodes_[slot].ownChanges > 0;
}

bool NodeTable::mayKeepPages(NodeId node) {
  const Lock held(lock_);
  const Slot slot = slotOf(node);
  return slot != 0 && !std::exchange(nodes_[slot].hasStalePages, false);
}

}  // namespace droxa
