#pragma once

#include <memory>
#include <optional>
#include <string>
#include <sys/stat.h>

#include "fileproviderd/mount/BusyNames.h"
#include "fileproviderd/mount/FolderDescriptors.h"
#include "fileproviderd/mount/Materialising.h"
#include "fileproviderd/mount/MountRoots.h"
#include "fileproviderd/mount/NodeTable.h"
#include "fileproviderd/mount/OpenFiles.h"
#include "fileproviderd/mount/Playing.h"
#include "fileproviderd/mount/ReplicaWatch.h"

namespace droxa {

// Told of what the kernel has to be told.
// Thread contract: called on any thread, never waits.
class KernelNews {
 public:
  virtual ~KernelNews() = default;
  // The contents of the node's file are others than its pages.
  virtual void contentsChanged(NodeId node) = 0;
};

// The files of the drive as the mount shows them: finds the replica's file for each node, by descriptors of
// folders and single names, and never through a link. Numbers that are given back are errnos, 0 for success.
// Thread contract: any thread; the parts have locks of their own, and none is held during a call to another.
class MountedDrive {
 public:
  MountedDrive(std::shared_ptr<MountRoots> roots, std::shared_ptr<Materialising> materialising,
               std::shared_ptr<ExtensionCalls> calls);

  // The folder, open as a path alone; null with `error`.
  SharedDescriptor folder(NodeId node, int *error);
  // The node's file, open as a path alone, or as a program has it open.
  SharedDescriptor path(NodeId node, int *error);
  // An absolute path in the replica; "" for what has no name any more.
  std::string replicaPath(NodeId node) const;

  // The path from the mount's root, "" for the root itself; nullopt for what has no name any more.
  std::optional<std::string> shownPath(NodeId node) const;

  int look(NodeId parent, const std::string &name, struct stat *status);
  int statusOf(NodeId node, struct stat *status);
  // Whether the name stands for a folder that the mount's root is made of, or mustn't be seen.
  bool isOwnName(NodeId parent, const std::string &name) const;

  // Seconds for which the kernel may keep what it is told.
  double entryTimeout(NodeId parent) const;
  double absenceTimeout(NodeId parent) const;  // that there is nothing of a name
  double attributeTimeout(NodeId parent, const struct stat &status) const;
  // Watches a folder that the kernel is about to be told of; `status` is taken anew then.
  void watchFolder(NodeId node, NodeId parent, const std::string &name, struct stat *status);
  void forget(NodeId node, std::uint64_t times);

  // Opens the file at the node's name; nothing, with `error`, when it isn't the node's any more.
  Descriptor open(NodeId node, int flags, int *error);
  // Whether the document's contents are here by now; the open file goes over to them then.
  bool isHereByNow(OpenFile &file, int *error);

  NodeTable nodes;
  FolderDescriptors folders;
  OpenFiles openFiles;
  BusyNames busy;
  Playing playing;
  ReplicaWatch watch;
  const std::shared_ptr<MountRoots> roots;
  const std::shared_ptr<Materialising> materialising;
  const std::shared_ptr<ExtensionCalls> calls;
  KernelNews *news = nullptr;  // set before the first request

 private:
  Descriptor openFolder(NodeId node, const SharedDescriptor &parent, int *error);
  std::optional<std::string> fixedPath(NodeId node, const NodeView &view) const;
};

// A file that is changed through the mount, for as long as this lives.
class OwnChange {
 public:
  OwnChange(MountedDrive &drive, NodeId node) : drive_(drive), node_(node) {
    drive_.nodes.beginOwnChange(node_);
  }
  ~OwnChange();
  OwnChange(const OwnChange &) = delete;
  OwnChange &operator=(const OwnChange &) = delete;
  // The file as it is after the change.
  void setDescriptor(int descriptor) { descriptor_ = descriptor; }

 private:
  MountedDrive &drive_;
  const NodeId node_;
  int descriptor_ = -1;
};

}  // namespace droxa
