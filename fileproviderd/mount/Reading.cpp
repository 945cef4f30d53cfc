#include <cerrno>
#include <unistd.h>
#include <vector>

#include "fileproviderd/mount/Operations.h"

namespace droxa::requests {

namespace {

// From here on pages are moved to the kernel instead of copied.
constexpr std::size_t kMoved = 64 * 1024;

void readNow(fuse_req_t request, const OpenFile &file, std::size_t size, off_t offset) {
  const SharedDescriptor descriptor = file.file();
  if (size >= kMoved) {
    fuse_bufvec buffer = FUSE_BUFVEC_INIT(size);
    buffer.buf[0].flags = static_cast<fuse_buf_flags>(FUSE_BUF_IS_FD | FUSE_BUF_FD_SEEK);
    buffer.buf[0].fd = descriptor->get();
    buffer.buf[0].pos = offset;
    fuse_reply_data(request, &buffer, FUSE_BUF_SPLICE_MOVE);
    return;
  }
  static thread_local std::vector<char> bytes(kMoved);
  const ssize_t length = ::pread(descriptor->get(), bytes.data(), size, offset);
  if (length < 0)
    fuse_reply_err(request, errno);
  else
    fuse_reply_buf(request, bytes.data(), static_cast<std::size_t>(length));
}

}  // namespace

void read(fuse_req_t request, fuse_ino_t /*node*/, std::size_t size, off_t offset, fuse_file_info *info) {
  const OpenFilePointer file = openFileOf(info);
  if (!file->isDataless()) return readNow(request, *file, size, offset);
  whenHere(request, file, [request, file, size, offset](int error) {
    if (error != 0)
      fuse_reply_err(request, error);
    else
      readNow(request, *file, size, offset);
  });
}

// Where the data of a document lies that isn't here, only its contents can tell.
void seek(fuse_req_t request, fuse_ino_t /*node*/, off_t offset, int whence, fuse_file_info *info) {
  const OpenFilePointer file = openFileOf(info);
  whenHere(request, file, [request, file, offset, whence](int error) {
    const off_t found = error == 0 ? ::lseek(file->file()->get(), offset, whence) : -1;
    if (found < 0)
      fuse_reply_err(request, error != 0 ? error : errno);
    else
      fuse_reply_lseek(request, found);
  });
}

}  // namespace droxa::requests
