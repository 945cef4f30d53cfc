#include <cerrno>
#include <fcntl.h>
#include <optional>
#include <sched.h>
#include <utility>

#include "fileproviderd/mount/DocumentState.h"
#include "fileproviderd/mount/Operations.h"

namespace droxa::requests {

namespace {

// What the kernel keeps to itself: where a write goes (it tells offsets), how its pages are read, and what
// making a file means.
int flagsForReplica(int flags) {
  return flags & ~(O_APPEND | O_DIRECT | O_CREAT | O_EXCL | O_NOCTTY | O_NOFOLLOW);
}

// Looks at the document after it is open, so that nobody lets go of its contents in between; before it is
// opened for writing, since who puts contents in place gives way to writers.
OpenFilePointer openDocument(MountedDrive &drive, NodeId node, int flags, int *error) {
  if ((flags & O_TRUNC) != 0 || (flags & O_ACCMODE) == O_RDONLY) {
    // Only emptying it is a change: what others did meanwhile mustn't be taken for it.
    std::optional<OwnChange> change;
    if ((flags & O_TRUNC) != 0) change.emplace(drive, node);
    Descriptor file = drive.open(node, flags, error);
    if (!file) return nullptr;
    if (change) change->setDescriptor(file.get());
    const bool isDataless = stateOfOpenDocument(file.get()) == DocumentState::dataless;
    auto opened = std::make_shared<OpenFile>(node, flags & ~O_TRUNC, std::move(file), isDataless);
    drive.openFiles.add(opened);
    return opened;
  }
  Descriptor readable = drive.open(node, O_RDONLY, error);
  const bool isDataless = readable && stateOfOpenDocument(readable.get()) == DocumentState::dataless;
  if (!readable && *error != EACCES) return nullptr;
  Descriptor file = isDataless ? std::move(readable) : drive.open(node, flags, error);
  if (!file) return nullptr;
  auto opened = std::make_shared<OpenFile>(node, flags, std::move(file), isDataless);
  drive.openFiles.add(opened);
  return opened;
}

void putInto(fuse_file_info *info, const OpenFilePointer &file, bool keepsPages) {
  info->fh = reinterpret_cast<std::uint64_t>(new OpenFilePointer(file));
  info->keep_cache = keepsPages;
}

void dropFrom(MountedDrive &drive, const fuse_file_info *info) {
  const auto *held = reinterpret_cast<OpenFilePointer *>(info->fh);
  drive.openFiles.remove(*held);
  delete held;
}

void interrupted(fuse_req_t request, void *ticket) {
  driveOf(request).materialising->interrupt(reinterpret_cast<Materialising::Ticket>(ticket));
}

void waitForContents(fuse_req_t request, const OpenFilePointer &file, int attempts,
                     std::function<void(int)> goOn);

void contentsEnded(fuse_req_t request, const OpenFilePointer &file, int attempts, int error,
                   const std::function<void(int)> &goOn) {
  if (error != 0) return goOn(error);
  int problem = 0;
  if (!file->isDataless() || driveOf(request).isHereByNow(*file, &problem)) return goOn(0);
  if (problem != 0) return goOn(problem);
  // They were let go of again before it was opened.
  if (attempts > 1) return waitForContents(request, file, attempts - 1, goOn);
  goOn(EIO);
}

void waitForContents(fuse_req_t request, const OpenFilePointer &file, int attempts,
                     std::function<void(int)> goOn) {
  MountedDrive &drive = driveOf(request);
  const std::string path = drive.replicaPath(file->node);
  if (path.empty()) return goOn(ESTALE);
  const auto ticket = drive.materialising->newTicket();
  fuse_req_interrupt_func(request, interrupted, reinterpret_cast<void *>(ticket));
  drive.materialising->wait(ticket, path, fuse_req_ctx(request)->pid,
                            [request, file, attempts, pending = pendingOf(request), goOn = std::move(goOn)](
                                int error) { contentsEnded(request, file, attempts, error, goOn); });
}

}  // namespace

// A thread of the session gets a mask of its own the first time.
void useNoMask() {
  static thread_local bool isSet = false;
  if (isSet || ::unshare(CLONE_FS) != 0) return;
  ::umask(0);
  isSet = true;
}

OpenFilePointer openFileOf(const fuse_file_info *info) {
  return *reinterpret_cast<OpenFilePointer *>(info->fh);
}

void whenHere(fuse_req_t request, const OpenFilePointer &file, std::function<void(int error)> goOn) {
  constexpr int kAttempts = 3;
  if (!file->isDataless()) return goOn(0);
  int error = 0;
  if (driveOf(request).isHereByNow(*file, &error)) return goOn(0);
  if (error != 0) return goOn(error);
  waitForContents(request, file, kAttempts, std::move(goOn));
}

void open(fuse_req_t request, fuse_ino_t node, fuse_file_info *info) {
  MountedDrive &drive = driveOf(request);
  int error = 0;
  const OpenFilePointer file = openDocument(drive, node, flagsForReplica(info->flags), &error);
  if (!file) {
    fuse_reply_err(request, error);
    return;
  }
  const bool isWatched = drive.entryTimeout(drive.nodes.view(node).value_or(NodeView{}).parent) > 1;
  putInto(info, file, drive.nodes.mayKeepPages(node) && isWatched);
  if (fuse_reply_open(request, info) == -ENOENT) dropFrom(drive, info);
}

void create(fuse_req_t request, fuse_ino_t parent, const char *name, mode_t mode, fuse_file_info *info) {
  MountedDrive &drive = driveOf(request);
  int error = 0;
  const SharedDescriptor folder = drive.folder(parent, &error);
  if (!folder || drive.isOwnName(parent, name)) {
    fuse_reply_err(request, folder ? EPERM : error);
    return;
  }
  useNoMask();
  const BusyNames::Guard guard(drive.busy, {{parent, name}});
  const int flags = flagsForReplica(info->flags);
  const int made = O_CREAT | O_NOFOLLOW | O_CLOEXEC | (info->flags & O_EXCL);
  Descriptor file(::openat(folder->get(), name, flags | made, mode & 07777));
  struct stat status;
  if (!file || ::fstat(file.get(), &status) != 0) {
    fuse_reply_err(request, errno);
    return;
  }
  const bool isDataless = stateOfOpenDocument(file.get()) == DocumentState::dataless;
  const fuse_entry_param entry = entryFor(drive, parent, name, status);
  const auto opened = std::make_shared<OpenFile>(entry.ino, flags & ~O_TRUNC, std::move(file), isDataless);
  drive.openFiles.add(opened);
  putInto(info, opened, false);
  if (fuse_reply_create(request, &entry, info) != -ENOENT) return;
  dropFrom(drive, info);
  drive.forget(entry.ino, 1);
}

void close(fuse_req_t request, fuse_ino_t /*node*/, fuse_file_info *info) {
  dropFrom(driveOf(request), info);
  fuse_reply_err(request, 0);
}

}  // namespace droxa::requests
