#pragma once

#include "fileproviderd/mount/Fuse.h"
#include "fileproviderd/mount/Invalidation.h"

namespace droxa {

// Notices over the session. Thread contract: as KernelNotices; the session outlives it.
class FuseNotices final : public KernelNotices {
 public:
  explicit FuseNotices(fuse_session *session) : session_(session) {}
  void contentsChanged(NodeId node) override { fuse_lowlevel_notify_inval_inode(session_, node, 0, 0); }
  void attributesChanged(NodeId node) override { fuse_lowlevel_notify_inval_inode(session_, node, -1, 0); }
  void listingChanged(NodeId folder) override { fuse_lowlevel_notify_inval_inode(session_, folder, 0, 0); }
  void appeared(NodeId folder, const std::string &name, const struct stat &status) override;
  void disappeared(NodeId folder, const std::string &name, NodeId node, mode_t type) override;

 private:
  fuse_session *const session_;
};

}  // namespace droxa
