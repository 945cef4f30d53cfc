#include <cerrno>
#include <fcntl.h>
#include <limits.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include "fileproviderd/mount/DocumentState.h"
#include "fileproviderd/mount/LinkTargets.h"
#include "fileproviderd/mount/Operations.h"

namespace droxa::requests {

namespace {

std::string linkOf(int descriptor) {
  return "/proc/self/fd/" + std::to_string(descriptor);
}

void replyWithAttributes(fuse_req_t request, NodeId node) {
  MountedDrive &drive = driveOf(request);
  struct stat status;
  if (const int error = drive.statusOf(node, &status); error != 0) {
    fuse_reply_err(request, error);
    return;
  }
  const auto view = drive.nodes.view(node);
  if (view) status.st_ino = view->number;
  const NodeId parent = view && view->parent != 0 ? view->parent : kRootNode;
  fuse_reply_attr(request, &status, drive.attributeTimeout(parent, status));
}

timespec timeOf(int which, int set, int now, const timespec &wanted) {
  if ((which & now) != 0) return {0, UTIME_NOW};
  if ((which & set) != 0) return wanted;
  return {0, UTIME_OMIT};
}

// Everything but the size.
int setPlainAttributes(const Descriptor &file, const struct stat &wanted, int which) {
  if ((which & FUSE_SET_ATTR_MODE) != 0 && ::chmod(linkOf(file.get()).c_str(), wanted.st_mode & 07777) != 0)
    return errno;
  if ((which & (FUSE_SET_ATTR_UID | FUSE_SET_ATTR_GID)) != 0) {
    const uid_t user = (which & FUSE_SET_ATTR_UID) != 0 ? wanted.st_uid : static_cast<uid_t>(-1);
    const gid_t group = (which & FUSE_SET_ATTR_GID) != 0 ? wanted.st_gid : static_cast<gid_t>(-1);
    if (::fchownat(file.get(), "", user, group, AT_EMPTY_PATH) != 0) return errno;
  }
  const timespec times[2] = {timeOf(which, FUSE_SET_ATTR_ATIME, FUSE_SET_ATTR_ATIME_NOW, wanted.st_atim),
                             timeOf(which, FUSE_SET_ATTR_MTIME, FUSE_SET_ATTR_MTIME_NOW, wanted.st_mtim)};
  const bool hasTimes = times[0].tv_nsec != UTIME_OMIT || times[1].tv_nsec != UTIME_OMIT;
  if (hasTimes && ::utimensat(file.get(), "", times, AT_EMPTY_PATH) != 0) return errno;
  return 0;
}

// A size that is set with a time is set first: it would change the time.
int setSize(const Descriptor &file, off_t size) {
  const Descriptor writable(::open(linkOf(file.get()).c_str(), O_WRONLY | O_CLOEXEC));
  return writable && ::ftruncate(writable.get(), size) == 0 ? 0 : errno;
}

void setAll(fuse_req_t request, NodeId node, const struct stat &wanted, int which) {
  MountedDrive &drive = driveOf(request);
  int error = 0;
  {
    const SharedDescriptor file = drive.path(node, &error);
    OwnChange change(drive, node);
    if (file) {
      if ((which & FUSE_SET_ATTR_SIZE) != 0) error = setSize(*file, wanted.st_size);
      if (error == 0) error = setPlainAttributes(*file, wanted, which);
      change.setDescriptor(file->get());
      if (error != 0) fuse_reply_err(request, error);
    } else {
      fuse_reply_err(request, error);
    }
    if (error != 0) return;
  }
  replyWithAttributes(request, node);
}

// A document that is cut to something needs its contents first; one that is emptied doesn't.
bool needsContents(MountedDrive &drive, NodeId node, const struct stat &wanted, int which) {
  if ((which & FUSE_SET_ATTR_SIZE) == 0 || wanted.st_size == 0) return false;
  int error = 0;
  const SharedDescriptor file = drive.path(node, &error);
  return file && stateOfPath(file->get()) == DocumentState::dataless;
}

std::string shownTarget(MountedDrive &drive, NodeId link, const std::string &target) {
  const auto view = drive.nodes.view(link);
  const auto folder = view && view->parent != 0 ? drive.shownPath(view->parent) : std::nullopt;
  if (!folder) return target;
  ShownFolders shown = drive.roots->folders();
  shown[""] = drive.roots->root();
  return shownLinkTarget(target, *folder, drive.replicaPath(view->parent), shown);
}

}  // namespace

void getAttributes(fuse_req_t request, fuse_ino_t node, fuse_file_info * /*info*/) {
  replyWithAttributes(request, node);
}

void setAttributes(fuse_req_t request, fuse_ino_t node, struct stat *wanted, int which,
                   fuse_file_info * /*info*/) {
  MountedDrive &drive = driveOf(request);
  // The announcer asks for what has been done already.
  if (drive.playing.isAnnouncer(fuse_req_ctx(request)->pid)) return replyWithAttributes(request, node);
  if (!needsContents(drive, node, *wanted, which)) return setAll(request, node, *wanted, which);
  int error = 0;
  Descriptor placeholder = drive.open(node, O_RDONLY, &error);
  if (!placeholder) {
    fuse_reply_err(request, error);
    return;
  }
  const auto file = std::make_shared<OpenFile>(node, O_RDONLY, std::move(placeholder), true);
  whenHere(request, file, [request, node, which, file, wanted = *wanted](int problem) {
    if (problem != 0)
      fuse_reply_err(request, problem);
    else
      setAll(request, node, wanted, which);
  });
}

void readLink(fuse_req_t request, fuse_ino_t node) {
  int error = 0;
  const SharedDescriptor file = driveOf(request).path(node, &error);
  char target[PATH_MAX + 1];
  const ssize_t length = file ? ::readlinkat(file->get(), "", target, PATH_MAX) : -1;
  if (length < 0) {
    fuse_reply_err(request, file ? errno : error);
    return;
  }
  target[length] = '\0';
  fuse_reply_readlink(request, shownTarget(driveOf(request), node, target).c_str());
}

void statusOfFileSystem(fuse_req_t request, fuse_ino_t /*node*/) {
  int error = 0;
  const SharedDescriptor root = driveOf(request).folder(kRootNode, &error);
  struct statvfs status {};
  if (!root || ::fstatvfs(root->get(), &status) != 0)
    fuse_reply_err(request, root ? errno : error);
  else
    fuse_reply_statfs(request, &status);
}

}  // namespace droxa::requests
