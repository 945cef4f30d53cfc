#include <cerrno>
#include <fcntl.h>
#include <functional>
#include <linux/fs.h>
#include <stdio.h>
#include <unistd.h>

#include "fileproviderd/mount/Operations.h"

namespace droxa::requests {

namespace {

// Makes `name` by `make(folder's descriptor)`, and answers with what is there then.
void makeNamed(fuse_req_t request, NodeId parent, const char *name, const std::function<int(int)> &make) {
  MountedDrive &drive = driveOf(request);
  const pid_t process = fuse_req_ctx(request)->pid;
  if (drive.playing.isPlayed(process, parent, name, true)) return replyWithEntry(request, parent, name);
  int error = drive.isOwnName(parent, name) || drive.playing.isAnnouncer(process) ? EPERM : 0;
  const SharedDescriptor folder = error == 0 ? drive.folder(parent, &error) : nullptr;
  if (!folder) {
    fuse_reply_err(request, error);
    return;
  }
  useNoMask();
  const BusyNames::Guard guard(drive.busy, {{parent, name}});
  if (make(folder->get()) != 0)
    fuse_reply_err(request, errno);
  else
    replyWithEntry(request, parent, name);
}

// The folders that the root is made of stay where they are.
bool isFixed(MountedDrive &drive, NodeId parent, const char *name) {
  return parent == kRootNode && drive.roots->folderNamed(name);
}

void removeNamed(fuse_req_t request, NodeId parent, const char *name, int flags) {
  MountedDrive &drive = driveOf(request);
  const pid_t process = fuse_req_ctx(request)->pid;
  if (drive.playing.isAnnouncer(process)) {
    fuse_reply_err(request, drive.playing.isPlayed(process, parent, name, false) ? 0 : EPERM);
    return;
  }
  int error = isFixed(drive, parent, name) ? EBUSY : drive.isOwnName(parent, name) ? ENOENT : 0;
  const SharedDescriptor folder = error == 0 ? drive.folder(parent, &error) : nullptr;
  if (folder) {
    const BusyNames::Guard guard(drive.busy, {{parent, name}});
    if (::unlinkat(folder->get(), name, flags) != 0)
      error = errno;
    else
      drive.nodes.removed(parent, name, true);
  }
  fuse_reply_err(request, error);
}

int renameError(MountedDrive &drive, NodeId parent, const char *name, NodeId newParent, const char *newName) {
  if (isFixed(drive, parent, name) || isFixed(drive, newParent, newName)) return EBUSY;
  if (drive.isOwnName(parent, name)) return ENOENT;
  return drive.isOwnName(newParent, newName) ? EPERM : 0;
}

// A rename changes the file's time of change, which is no news for the kernel.
void seeRenamed(MountedDrive &drive, NodeId parent, const std::string &name) {
  const NodeId node = drive.nodes.find(parent, name);
  struct stat status;
  if (node == 0 || drive.look(parent, name, &status) != 0) return;
  drive.nodes.beginOwnChange(node);
  drive.nodes.endOwnChange(node, &status);
}

}  // namespace

void makeNode(fuse_req_t request, fuse_ino_t parent, const char *name, mode_t mode, dev_t device) {
  makeNamed(request, parent, name, [=](int folder) { return ::mknodat(folder, name, mode, device); });
}

void makeFolder(fuse_req_t request, fuse_ino_t parent, const char *name, mode_t mode) {
  makeNamed(request, parent, name, [=](int folder) { return ::mkdirat(folder, name, mode & 07777); });
}

void makeLink(fuse_req_t request, const char *target, fuse_ino_t parent, const char *name) {
  makeNamed(request, parent, name, [=](int folder) { return ::symlinkat(target, folder, name); });
}

void link(fuse_req_t request, fuse_ino_t node, fuse_ino_t parent, const char *name) {
  MountedDrive &drive = driveOf(request);
  int error = 0;
  const SharedDescriptor file = drive.path(node, &error);
  if (!file) {
    fuse_reply_err(request, error);
    return;
  }
  const OwnChange change(drive, node);
  const std::string source = "/proc/self/fd/" + std::to_string(file->get());
  makeNamed(request, parent, name,
            [&](int folder) { return ::linkat(AT_FDCWD, source.c_str(), folder, name, AT_SYMLINK_FOLLOW); });
}

void remove(fuse_req_t request, fuse_ino_t parent, const char *name) {
  removeNamed(request, parent, name, 0);
}

void removeFolder(fuse_req_t request, fuse_ino_t parent, const char *name) {
  removeNamed(request, parent, name, AT_REMOVEDIR);
}

void rename(fuse_req_t request, fuse_ino_t parent, const char *name, fuse_ino_t newParent,
            const char *newName, unsigned flags) {
  MountedDrive &drive = driveOf(request);
  int error = renameError(drive, parent, name, newParent, newName);
  const SharedDescriptor from = error == 0 ? drive.folder(parent, &error) : nullptr;
  const SharedDescriptor to = from ? drive.folder(newParent, &error) : nullptr;
  if (to) {
    const BusyNames::Guard guard(drive.busy, {{parent, name}, {newParent, newName}});
    if (::renameat2(from->get(), name, to->get(), newName, flags) != 0) {
      error = errno;
    } else if ((flags & RENAME_EXCHANGE) != 0) {
      drive.nodes.exchanged(parent, name, newParent, newName);
      seeRenamed(drive, parent, name);
      seeRenamed(drive, newParent, newName);
    } else {
      drive.nodes.renamed(parent, name, newParent, newName);
      seeRenamed(drive, newParent, newName);
    }
  }
  fuse_reply_err(request, error);
}

}  // namespace droxa::requests
