#include "fileproviderd/mount/FuseNotices.h"

namespace droxa {

FuseNotices::FuseNotices(fuse_session *session, std::shared_ptr<MountedDrive> drive,
                         std::shared_ptr<Announcer> announcer, std::string mountPoint)
    : session_(session),
      drive_(std::move(drive)),
      announcer_(std::move(announcer)),
      mountPoint_(std::move(mountPoint)) {}

std::string FuseNotices::mountedPath(NodeId folder, const std::string &name) const {
  const auto path = drive_->shownPath(folder);
  if (!path) return {};
  return mountPoint_ + "/" + (path->empty() ? "" : *path + "/") + name;
}

bool FuseNotices::play(Announcer::Play play, NodeId folder, const std::string &name, bool isMaking) {
  const std::string path = announcer_ ? mountedPath(folder, name) : std::string();
  if (path.empty()) return false;
  drive_->playing.begin({folder, name, isMaking});
  const bool isPlayed = announcer_->play(play, path);
  drive_->playing.end();
  return isPlayed;
}

void FuseNotices::playChange(Announcer::Play play, NodeId node) {
  const auto view = announcer_ ? drive_->nodes.view(node) : std::nullopt;
  if (!view || view->parent == 0) return;
  const std::string path = mountedPath(view->parent, view->name);
  if (!path.empty()) announcer_->play(play, path);
}

void FuseNotices::contentsChanged(NodeId node) {
  fuse_lowlevel_notify_inval_inode(session_, node, 0, 0);
  playChange(Announcer::Play::changeContents, node);
}

void FuseNotices::attributesChanged(NodeId node, bool isToldToWatchers) {
  fuse_lowlevel_notify_inval_inode(session_, node, -1, 0);
  if (isToldToWatchers) playChange(Announcer::Play::changeAttributes, node);
}

void FuseNotices::listingChanged(NodeId folder) {
  fuse_lowlevel_notify_inval_inode(session_, folder, 0, 0);
}

// Playing it puts the kernel's names right as well; the listing that it may have kept goes in any case.
void FuseNotices::appeared(NodeId folder, const std::string &name, const struct stat &status) {
  const auto how = S_ISDIR(status.st_mode)   ? Announcer::Play::makeFolder
                   : S_ISLNK(status.st_mode) ? Announcer::Play::makeLink
                                             : Announcer::Play::makeFile;
  if (!play(how, folder, name, true))
    fuse_lowlevel_notify_inval_entry(session_, folder, name.c_str(), name.size());
  listingChanged(folder);
}

// What the announcer couldn't play, since something is left below the name, is forgotten by the kernel.
void FuseNotices::disappeared(NodeId folder, const std::string &name, NodeId node, mode_t type) {
  play(S_ISDIR(type) ? Announcer::Play::removeFolder : Announcer::Play::removeFile, folder, name, false);
  fuse_lowlevel_notify_delete(session_, folder, node, name.c_str(), name.size());
  listingChanged(folder);
}

}  // namespace droxa
