#pragma once

#include "fileproviderd/mount/Fuse.h"
#include "fileproviderd/mount/MountedDrive.h"

// The requests of the kernel, each answered once. Called on the session's threads; those that have to wait
// for a document's contents are answered from the pool.

namespace droxa::requests {

// What the session is made with.
struct Session {
  std::shared_ptr<MountedDrive> drive;
  // Shared by the requests that are answered later: without other holders none is left.
  std::shared_ptr<int> pending = std::make_shared<int>();
};

inline MountedDrive &driveOf(fuse_req_t request) {
  return *static_cast<Session *>(fuse_req_userdata(request))->drive;
}
// To be held by whatever answers the request later, until it has.
inline std::shared_ptr<int> pendingOf(fuse_req_t request) {
  return static_cast<Session *>(fuse_req_userdata(request))->pending;
}

// Lookup.cpp
void lookUp(fuse_req_t request, fuse_ino_t parent, const char *name);
void forget(fuse_req_t request, fuse_ino_t node, std::uint64_t times);
void forgetMany(fuse_req_t request, std::size_t count, fuse_forget_data *forgets);
// Makes the kernel know `name`, whose file is `status`: its node has one look-up more, which the answer has
// to tell.
fuse_entry_param entryFor(MountedDrive &drive, NodeId parent, const std::string &name, struct stat status);
void replyWithEntry(fuse_req_t request, NodeId parent, const std::string &name);

// Attributes.cpp
void getAttributes(fuse_req_t request, fuse_ino_t node, fuse_file_info *info);
void setAttributes(fuse_req_t request, fuse_ino_t node, struct stat *wanted, int which, fuse_file_info *info);
void readLink(fuse_req_t request, fuse_ino_t node);
void statusOfFileSystem(fuse_req_t request, fuse_ino_t node);

// Directories.cpp
void openFolder(fuse_req_t request, fuse_ino_t node, fuse_file_info *info);
void readFolder(fuse_req_t request, fuse_ino_t node, std::size_t size, off_t offset, fuse_file_info *info);
void readFolderPlus(fuse_req_t request, fuse_ino_t node, std::size_t size, off_t offset,
                    fuse_file_info *info);
void closeFolder(fuse_req_t request, fuse_ino_t node, fuse_file_info *info);
void syncFolder(fuse_req_t request, fuse_ino_t node, int dataOnly, fuse_file_info *info);

// Opening.cpp
void open(fuse_req_t request, fuse_ino_t node, fuse_file_info *info);
void create(fuse_req_t request, fuse_ino_t parent, const char *name, mode_t mode, fuse_file_info *info);
void close(fuse_req_t request, fuse_ino_t node, fuse_file_info *info);
OpenFilePointer openFileOf(const fuse_file_info *info);
// Goes on when the contents of the open document are here: at once on this thread, or later on the pool. Its
// argument is 0 or an errno.
void whenHere(fuse_req_t request, const OpenFilePointer &file, std::function<void(int error)> goOn);
// Makes files with the modes that programs ask for, whatever the process's own mask says.
void useNoMask();

// Reading.cpp
void read(fuse_req_t request, fuse_ino_t node, std::size_t size, off_t offset, fuse_file_info *info);
void seek(fuse_req_t request, fuse_ino_t node, off_t offset, int whence, fuse_file_info *info);

// Writing.cpp
void write(fuse_req_t request, fuse_ino_t node, const char *bytes, std::size_t size, off_t offset,
           fuse_file_info *info);
void sync(fuse_req_t request, fuse_ino_t node, int dataOnly, fuse_file_info *info);
void allocate(fuse_req_t request, fuse_ino_t node, int mode, off_t offset, off_t length,
              fuse_file_info *info);
void copyRange(fuse_req_t request, fuse_ino_t source, off_t sourceOffset, fuse_file_info *sourceInfo,
               fuse_ino_t target, off_t targetOffset, fuse_file_info *targetInfo, std::size_t length,
               int flags);

// Mutations.cpp
void makeNode(fuse_req_t request, fuse_ino_t parent, const char *name, mode_t mode, dev_t device);
void makeFolder(fuse_req_t request, fuse_ino_t parent, const char *name, mode_t mode);
void makeLink(fuse_req_t request, const char *target, fuse_ino_t parent, const char *name);
void link(fuse_req_t request, fuse_ino_t node, fuse_ino_t parent, const char *name);
void remove(fuse_req_t request, fuse_ino_t parent, const char *name);
void removeFolder(fuse_req_t request, fuse_ino_t parent, const char *name);
void rename(fuse_req_t request, fuse_ino_t parent, const char *name, fuse_ino_t newParent,
            const char *newName, unsigned flags);

// ExtendedAttributes.cpp
void getExtendedAttribute(fuse_req_t request, fuse_ino_t node, const char *name, std::size_t size);
void setExtendedAttribute(fuse_req_t request, fuse_ino_t node, const char *name, const char *value,
                          std::size_t size, int flags);
void listExtendedAttributes(fuse_req_t request, fuse_ino_t node, std::size_t size);
void removeExtendedAttribute(fuse_req_t request, fuse_ino_t node, const char *name);

}  // namespace droxa::requests
