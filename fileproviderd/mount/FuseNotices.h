#pragma once

#include "fileproviderd/mount/Announcer.h"
#include "fileproviderd/mount/Fuse.h"
#include "fileproviderd/mount/Invalidation.h"

namespace droxa {

// Notices over the session, and to watchers of the mount by an announcer, where there is one.
// Thread contract: as KernelNotices; the session outlives it.
class FuseNotices final : public KernelNotices {
 public:
  FuseNotices(fuse_session *session, std::shared_ptr<MountedDrive> drive,
              std::shared_ptr<Announcer> announcer, std::string mountPoint);

  void contentsChanged(NodeId node) override;
  void attributesChanged(NodeId node, bool isToldToWatchers) override;
  void listingChanged(NodeId folder) override;
  void appeared(NodeId folder, const std::string &name, const struct stat &status) override;
  void disappeared(NodeId folder, const std::string &name, NodeId node, mode_t type) override;

 private:
  // "" when the folder has no path any more.
  std::string mountedPath(NodeId folder, const std::string &name) const;
  bool play(Announcer::Play play, NodeId folder, const std::string &name, bool isMaking);
  void playChange(Announcer::Play play, NodeId node);

  fuse_session *const session_;
  const std::shared_ptr<MountedDrive> drive_;
  const std::shared_ptr<Announcer> announcer_;  // may be null
  const std::string mountPoint_;
};

}  // namespace droxa
