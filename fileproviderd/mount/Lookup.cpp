#include <cerrno>

#include "fileproviderd/mount/Operations.h"

namespace droxa::requests {

fuse_entry_param entryFor(MountedDrive &drive, NodeId parent, const std::string &name, struct stat status) {
  fuse_entry_param entry{};
  const NodeTable::Entered entered = drive.nodes.enter(parent, name, status);
  if (entered.hasChanged && drive.news) drive.news->contentsChanged(entered.node);
  if (S_ISDIR(status.st_mode)) drive.watchFolder(entered.node, parent, name, &status);
  entry.ino = entered.node;
  entry.attr = status;
  entry.attr.st_ino = entered.number;
  entry.entry_timeout = drive.entryTimeout(parent);
  entry.attr_timeout = drive.attributeTimeout(parent, status);
  return entry;
}

void replyWithEntry(fuse_req_t request, NodeId parent, const std::string &name) {
  MountedDrive &drive = driveOf(request);
  struct stat status;
  if (const int error = drive.look(parent, name, &status); error != 0) {
    fuse_reply_err(request, error);
    return;
  }
  const fuse_entry_param entry = entryFor(drive, parent, name, status);
  // Interrupted meanwhile: the kernel doesn't know the node then.
  if (fuse_reply_entry(request, &entry) == -ENOENT) drive.forget(entry.ino, 1);
}

void lookUp(fuse_req_t request, fuse_ino_t parent, const char *name) {
  MountedDrive &drive = driveOf(request);
  const pid_t process = fuse_req_ctx(request)->pid;
  // What is played as being made isn't there yet.
  if (drive.playing.isPlayed(process, parent, name, true)) {
    fuse_reply_err(request, ENOENT);
    return;
  }
  struct stat status;
  const int error = drive.look(parent, name, &status);
  if (error == ENOENT) {
    fuse_entry_param nothing{};
    nothing.entry_timeout = drive.absenceTimeout(parent);
    fuse_reply_entry(request, &nothing);
    return;
  }
  if (error != 0) {
    fuse_reply_err(request, error);
    return;
  }
  const fuse_entry_param entry = entryFor(drive, parent, name, status);
  if (fuse_reply_entry(request, &entry) == -ENOENT) drive.forget(entry.ino, 1);
}

void forget(fuse_req_t request, fuse_ino_t node, std::uint64_t times) {
  driveOf(request).forget(node, times);
  fuse_reply_none(request);
}

void forgetMany(fuse_req_t request, std::size_t count, fuse_forget_data *forgets) {
  for (std::size_t index = 0; index < count; ++index)
    driveOf(request).forget(forgets[index].ino, forgets[index].nlookup);
  fuse_reply_none(request);
}

}  // namespace droxa::requests
