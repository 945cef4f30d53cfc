#pragma once

#include <list>
#include <unordered_map>

#include "fileproviderd/mount/Descriptor.h"
#include "fileproviderd/mount/NodeTable.h"

namespace droxa {

// The folders that were used last, each open as a path alone. Thread contract: any thread.
class FolderDescriptors {
 public:
  explicit FolderDescriptors(std::size_t most) : most_(most) {}

  SharedDescriptor find(NodeId node);
  SharedDescriptor keep(NodeId node, Descriptor folder);
  void drop(NodeId node);

 private:
  using Entry = std::pair<NodeId, SharedDescriptor>;

  const std::size_t most_;
  Mutex lock_;
  std::list<Entry> entries_ GUARDED_BY(lock_);  // the one used last first
  std::unordered_map<NodeId, std::list<Entry>::iterator> byNode_ GUARDED_BY(lock_);
};

}  // namespace droxa
