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
