#include <cerrno>
#include <fcntl.h>
#include <unistd.h>
#include <vector>

#include "fileproviderd/mount/Operations.h"

namespace droxa::requests {

namespace {

void writeNow(fuse_req_t request, const OpenFile &file, const char *bytes, std::size_t size, off_t offset) {
  const SharedDescriptor descriptor = file.file();
  ssize_t written = 0;
  int error = 0;
  {
    OwnChange change(driveOf(request), file.node);
    change.setDescriptor(descriptor->get());
    written = ::pwrite(descriptor->get(), bytes, size, offset);
    if (written < 0) error = errno;
  }
  if (error != 0)
    fuse_reply_err(request, error);
  else
    fuse_reply_write(request, static_cast<std::size_t>(written));
}

}  // namespace

void write(fuse_req_t request, fuse_ino_t /*node*/, const char *bytes, std::size_t size, off_t offset,
           fuse_file_info *info) {
  const OpenFilePointer file = openFileOf(info);
  if (!file->isDataless()) return writeNow(request, *file, bytes, size, offset);
  auto kept = std::make_shared<const std::vector<char>>(bytes, bytes + size);
  whenHere(request, file, [request, file, kept, offset](int error) {
    if (error != 0)
      fuse_reply_err(request, error);
    else
      writeNow(request, *file, kept->data(), kept->size(), offset);
  });
}

void sync(fuse_req_t request, fuse_ino_t /*node*/, int dataOnly, fuse_file_info *info) {
  const OpenFilePointer file = openFileOf(info);
  const int descriptor = file->file()->get();
  const int result = dataOnly != 0 ? ::fdatasync(descriptor) : ::fsync(descriptor);
  fuse_reply_err(request, result == 0 ? 0 : errno);
}

void allocate(fuse_req_t request, fuse_ino_t /*node*/, int mode, off_t offset, off_t length,
              fuse_file_info *info) {
  const OpenFilePointer file = openFileOf(info);
  whenHere(request, file, [request, file, mode, offset, length](int error) {
    if (error == 0) {
      const SharedDescriptor descriptor = file->file();
      OwnChange change(driveOf(request), file->node);
      change.setDescriptor(descriptor->get());
      if (::fallocate(descriptor->get(), mode, offset, length) != 0) error = errno;
    }
    fuse_reply_err(request, error);
  });
}

void copyRange(fuse_req_t request, fuse_ino_t /*source*/, off_t sourceOffset, fuse_file_info *sourceInfo,
               fuse_ino_t /*target*/, off_t targetOffset, fuse_file_info *targetInfo, std::size_t length,
               int flags) {
  const OpenFilePointer source = openFileOf(sourceInfo);
  const OpenFilePointer target = openFileOf(targetInfo);
  // Whoever gets this reads and writes instead, which waits for contents.
  if (source->isDataless() || target->isDataless()) {
    fuse_reply_err(request, EOPNOTSUPP);
    return;
  }
  ssize_t copied = 0;
  int error = 0;
  {
    const SharedDescriptor from = source->file();
    const SharedDescriptor to = target->file();
    OwnChange change(driveOf(request), target->node);
    change.setDescriptor(to->get());
    copied = ::copy_file_range(from->get(), &sourceOffset, to->get(), &targetOffset, length,
                               static_cast<unsigned>(flags));
    if (copied < 0) error = errno;
  }
  if (error != 0)
    fuse_reply_err(request, error);
  else
    fuse_reply_write(request, static_cast<std::size_t>(copied));
}

}  // namespace droxa::requests
