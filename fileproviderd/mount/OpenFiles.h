#pragma once

#include <atomic>
#include <unordered_map>

#include "fileproviderd/mount/Descriptor.h"
#include "fileproviderd/mount/NodeTable.h"

namespace droxa {

// A document that a program has open through the mount. It holds the replica's file open for as long, so that
// nobody lets go of contents that are being read. While the contents aren't here that is the placeholder,
// open for reading: who fetches contents gives way to writers.
// Thread contract: any thread; lock_ guards the descriptor.
class OpenFile {
 public:
  // `flags`: how to open it for what the program does with it.
  OpenFile(NodeId ofNode, int openFlags, Descriptor opened, bool isWithoutContents)
      : node(ofNode),
        flags(openFlags),
        isDataless_(isWithoutContents),
        file_(std::make_shared<const Descriptor>(std::move(opened))) {}

  const NodeId node;
  const int flags;

  bool isDataless() const { return isDataless_.load(); }
  SharedDescriptor file() const {
    const Lock held(lock_);
    return file_;
  }
  void replace(Descriptor file) {
    auto shared = std::make_shared<const Descriptor>(std::move(file));
    {
      const Lock held(lock_);
      file_.swap(shared);
    }
    isDataless_ = false;
  }

 private:
  std::atomic<bool> isDataless_;
  mutable Mutex lock_;
  SharedDescriptor file_ GUARDED_BY(lock_);
};

using OpenFilePointer = std::shared_ptr<OpenFile>;

// Which documents are open, by their nodes. Thread contract: any thread; lock_ guards the table.
class OpenFiles {
 public:
  void add(const OpenFilePointer &file);
  void remove(const OpenFilePointer &file);
  SharedDescriptor anyOf(NodeId node) const;  // null: it isn't open
  std::size_t size() const;

 private:
  mutable Mutex lock_;
  std::unordered_multimap<NodeId, OpenFilePointer> files_ GUARDED_BY(lock_);
};

}  // namespace droxa
