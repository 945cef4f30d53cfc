#include "keld/sync/ConflictCopies.h"

#include <cerrno>
#include <cstdio>
#include <fcntl.h>
#include <unistd.h>

#include "keld/sync/ConflictName.h"
#include "platform/foundation/NSDate.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {
constexpr unsigned kMostNumbers = 10000;
// What nameAside() has begun: the item, its inode and the new name.
constexpr char kAsideItem[] = "asideItem", kAsideInode[] = "asideInode", kAsideName[] = "asideName";
}  // namespace

// A document of its own doesn't bear another one's mark.
void ConflictCopies::becomeOwnDocument(const FileLocation &location, const std::string &newName) {
  ++made_;
  const OwnedDescriptor file(
      ::openat(location.folder.get(), newName.c_str(), O_RDONLY | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK));
  if (file) RemoveMarker(file.get());
  if (auto row = context_.store.byItem(location.item.id)) {
    row->item = 0;
    row->local = {};
    context_.store.put(*row);
  }
  os_log(qvc_default_log(), "[WARNING] %s was changed here and elsewhere: what was written here is now %s",
         location.path, newName);
}

NSError ConflictCopies::setAside(const FileLocation &location, std::string *newName) {
  const std::int64_t now = NSDate::now().nanosecondsSince1970();
  const int folder = location.folder.get();
  for (unsigned number = 1; number < kMostNumbers; ++number) {
    *newName = ConflictName(location.name, context_.device, now, number);
    if (::renameat2(folder, location.name.c_str(), folder, newName->c_str(), RENAME_NOREPLACE) == 0) {
      becomeOwnDocument(location, *newName);
      return NSError();
    }
    if (errno != EEXIST) break;
  }
  return NSError::errorWithPOSIXCode(errno, context_.files.absolute(location.path));
}

NSError ConflictCopies::nameAside(const FileLocation &location, std::string *newName) {
  const std::int64_t now = NSDate::now().nanosecondsSince1970();
  const int folder = location.folder.get();
  for (unsigned number = 1; number < kMostNumbers; ++number) {
    *newName = ConflictName(location.name, context_.device, now, number);
    if (::faccessat(folder, newName->c_str(), F_OK, AT_SYMLINK_NOFOLLOW) == 0) continue;
    const auto facts = ReadFileFacts(folder, location.name, 0);
    context_.store.transaction([&] {
      context_.store.setNumber(kAsideItem, location.item.id);
      context_.store.setNumber(kAsideInode, facts ? facts->inode : 0);
      context_.store.setText(kAsideName, *newName);
    });
    if (::linkat(folder, location.name.c_str(), folder, newName->c_str(), 0) == 0) return NSError();
    if (errno != EEXIST) break;
  }
  return NSError::errorWithPOSIXCode(errno, context_.files.absolute(location.path));
}

void ConflictCopies::nameAsideOver(const FileLocation &location, const std::string &newName,
                                   bool hasHappened) {
  if (hasHappened)
    becomeOwnDocument(location, newName);
  else
    ::unlinkat(location.folder.get(), newName.c_str(), 0);
  context_.store.setNumber(kAsideItem, 0);
}

void ConflictCopies::undoNameAside(bool isLast) {
  const ItemNumber item = context_.store.number(kAsideItem);
  if (item == 0) return;
  const std::uint64_t inode = context_.store.number(kAsideInode);
  const std::string name = context_.store.text(kAsideName);
  const auto location = context_.files.locate(item, nullptr);
  const auto own = location ? ReadFileFacts(location->folder.get(), location->name, 0) : std::nullopt;
  const auto other = location ? ReadFileFacts(location->folder.get(), name, 0) : std::nullopt;
  const bool isLeftBehind =
      own && other && location->name != name && own->inode == inode && other->inode == inode && inode != 0;
  if (isLeftBehind && ::unlinkat(location->folder.get(), name.c_str(), 0) == 0) {
    const std::string folder = location->path.substr(0, location->path.size() - location->name.size());
    context_.states.lookAt({location->path, folder + name});
  }
  if (own || isLast) context_.store.setNumber(kAsideItem, 0);
}

void ConflictCopies::placeRescuedFiles() {
  for (const RescuedFile &file : context_.storage.rescuedFiles()) {
    int code = 0;
    OwnedDescriptor folder = context_.files.openFolder(file.folderPath, &code);
    std::string folderPath = file.folderPath;
    if (!folder) {
      // Its folder is gone; it is kept where the drive's owner finds it.
      folderPath = std::string(QVUbiquitousDefaultContainerID) + "/" +
                   QVDocumentsFolderName(QVUbiquitousDefaultContainerID);
      folder = context_.files.openFolder(folderPath, &code);
    }
    if (!folder) continue;
    const std::int64_t now = NSDate::now().nanosecondsSince1970();
    for (unsigned number = 1; number < kMostNumbers; ++number) {
      const std::string name = ConflictName(file.name, context_.device, now, number);
      const ContentsResult result = context_.storage.placeRescued(file.id, folder.get(), name);
      if (result.outcome == ContentsOutcome::nameTaken) continue;
      if (result.isDone()) {
        ++made_;
        os_log(qvc_default_log(), "[WARNING] %s was written while it was replaced: it is kept as %s",
               file.folderPath + "/" + file.name, name);
        context_.states.lookAt({folderPath + "/" + name});
      }
      break;
    }
  }
}

}  // namespace droxa::keld
