// What both the cloud and the replica have, and the cloud has in a newer state.

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "keld/ItemAttributes.h"
#include "keld/sync/CloudApplier.h"
#include "keld/sync/ConflictName.h"
#include "platform/foundation/NSDate.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

void CloudApplier::change(const DocumentRecord &document, const Place &place, SyncRow row,
                          const ItemRecord &item) {
  auto location = context_.files.locate(item.id, nullptr);
  if (!location) {
    // Its folder can't be opened now; the next fetch tries again.
    context_.store.fetchAgain(document.record);
    touch(context_.files.pathOf(item.id));
    return;
  }
  const bool sendsMetadata =
      applyMetadata(document, location->folder.get(), location->name, location->item.metadata, &row);
  if (sendsMetadata) context_.store.enqueue(item.id, false, false);
  touch(location->path);
  const bool isMoved = document.parent != row.parent || document.name != row.name;
  if (isMoved && move(document, place, &*location)) {
    row.parent = document.parent;
    row.name = document.name;
    noteTrash(document, location->name);
  } else if (isMoved) {
    // It can't be there: what it is called here goes to the cloud again.
    row.parent = document.parent;
    row.name = document.name;
    context_.store.enqueue(item.id, false, false);
  }
  if (document.kind != NSFileProviderItemKind::document) {
    const bool changesMode =
        document.kind == NSFileProviderItemKind::folder && document.content.mode != row.content.mode;
    if (changesMode)
      ::fchmodat(location->folder.get(), location->name.c_str(), document.content.mode & 0777U, 0);
    if (!document.target.empty()) changeLink(document, &row, *location);
    row.tag = document.tag;
    row.content = document.content;
    context_.store.put(row);
    touch(location->path);
    return;
  }
  // Whether it may be written isn't part of what was changed here.
  const bool changesAccess = ((document.content.mode ^ row.content.mode) & 0222U) != 0;
  if (context_.scope.isShared() && changesAccess)
    ::fchmodat(location->folder.get(), location->name.c_str(), document.content.mode & 0777U, 0);
  changeContents(document, std::move(row), *location);
}

bool CloudApplier::applyMetadata(const DocumentRecord &document, int folder, const std::string &name,
                                 ItemMetadata here, SyncRow *row) {
  if (!document.target.empty() || !document.metadata || *document.metadata == row->metadata) return false;
  ReadMetadataOfFile(folder, name, &here);
  const bool isChangedHere = here != row->metadata;
  row->metadata = *document.metadata;
  if (here == row->metadata) return false;
  // Both sides changed it: what was written here is saved last.
  if (isChangedHere) return true;
  const int error = ApplyMetadataToFile(folder, name, QVItemMetadataChange::to(row->metadata));
  // Kept as it is here, and left alone in the cloud.
  if (error != 0) row->metadata = here;
  const bool canBear = error != ENOTSUP && error != ENOENT;  // as a promise can't
  if (error != 0 && canBear)
    os_log_error(qvc_default_log(), "[ERROR] can't write the tags of %s: %s", name,
                 std::string(std::strerror(error)));
  return false;
}

bool CloudApplier::move(const DocumentRecord &document, const Place &place, FileLocation *location) {
  int code = 0;
  std::string name = document.name;
  for (unsigned number = 0; number < 1000; ++number) {
    const std::string path = place.folderPath + "/" + name;
    if (path == location->path) return number == 0;
    if (::renameat2(location->folder.get(), location->name.c_str(), place.folder.get(), name.c_str(),
                    RENAME_NOREPLACE) == 0) {
      touch(location->path);
      touch(path);
      location->folder = context_.files.openFolder(place.folderPath, &code);
      location->name = name;
      location->path = path;
      return true;
    }
    if (errno != EEXIST) return false;
    name = ConflictName(document.name, document.device, NSDate::now().nanosecondsSince1970(), number + 1);
  }
  return false;
}

void CloudApplier::changeContents(const DocumentRecord &document, SyncRow row, const FileLocation &location) {
  const DocumentLook look = context_.storage.classify(location.folder.get(), location.name);
  const bool isSameVersion = document.content.digest == row.content.digest;
  if (look.kind == DocumentClass::dataless || look.kind == DocumentClass::evicting) {
    if (!isSameVersion || document.content != row.content)
      return replacePlaceholder(document, std::move(row), location, look);
    row.tag = document.tag;
    context_.store.put(row);
    return;
  }
  const bool isIntact =
      look.kind == DocumentClass::present ||
      (look.kind == DocumentClass::plain && IsSameContents(LocalFileOf(look.facts), row.local));
  if (isSameVersion) {
    // Its contents are the same there; what was written here, if anything, is still to be sent.
    if (isIntact && document.content.mode != row.content.mode)
      ::fchmodat(location.folder.get(), location.name.c_str(), document.content.mode & 0777U, 0);
    row.tag = document.tag;
    row.content.mode = document.content.mode;
    row.newerTag.clear();
    context_.store.put(row);
    touch(location.path);
    return;
  }
  if (isIntact && look.marker && look.marker->digest == document.content.digest) {
    // It is that version already: what is known of it here is older than the file.
    row.tag = document.tag;
    row.content = document.content;
    row.local = LocalFileOf(look.facts);
    row.isDataless = false;
    row.newerTag.clear();
    context_.store.put(row);
    touch(location.path);
    return;
  }
  if (!isIntact && isBasedOn(document, row, look)) {
    row.tag = document.tag;
    row.content = document.content;
    row.isDataless = false;
    row.newerTag.clear();
    context_.store.put(row);
    context_.store.enqueue(row.item, false, false);
    return;
  }
  if (isIntact) {
    // The newer version is fetched first, and then put in its place at once.
    row.newerTag = document.tag;
    row.newer = document.content;
    context_.store.put(row);
    return;
  }
  // Changed on both sides.
  if (look.facts.size == document.content.size) {
    const OwnedDescriptor file(::openat(location.folder.get(), location.name.c_str(),
                                        O_RDONLY | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK));
    if (file && DigestOfFile(file.get()) == document.content.digest) {
      DocumentMarker marker = markerOf(document);
      marker.state = MarkerState::present;
      marker.modified = look.facts.modified;
      WriteMarker(file.get(), marker);
      row.tag = document.tag;
      row.content = document.content;
      row.content.modified = look.facts.modified;
      row.local = LocalFileOf(look.facts);
      row.isDataless = false;
      row.newerTag.clear();
      context_.store.put(row);
      context_.store.enqueue(row.item, false, false);
      touch(location.path);
      return;
    }
  }
  // The cloud's version is fetched first; then both are there at once, each under a name.
  row.newerTag = document.tag;
  row.newer = document.content;
  context_.store.put(row);
  if (look.kind != DocumentClass::partlyWritten) return;
  context_.store.enqueue(row.item, false, false);  // which keeps what was written
}

// Whether what was written here was written over that very version: the file's marker says so, or this device
// sent that version itself and lost the reply.
bool CloudApplier::isBasedOn(const DocumentRecord &document, const SyncRow &row, const DocumentLook &look) {
  const bool isMarked = look.marker && look.marker->recordName == row.record &&
                        (look.kind == DocumentClass::edited || look.kind == DocumentClass::overwritten);
  if (isMarked && look.marker->digest == document.content.digest) return true;
  return document.device == context_.cloud.deviceName() &&
         context_.store.wasSent(document.record, document.content.digest);
}

// Another target is another link: the item of that is found by its name.
void CloudApplier::changeLink(const DocumentRecord &document, SyncRow *row, const FileLocation &location) {
  char target[4096];
  const ssize_t length = ::readlinkat(location.folder.get(), location.name.c_str(), target, sizeof target);
  if (length <= 0 || document.target == std::string_view(target, static_cast<std::size_t>(length))) return;
  if (::unlinkat(location.folder.get(), location.name.c_str(), 0) != 0 ||
      ::symlinkat(document.target.c_str(), location.folder.get(), location.name.c_str()) != 0) {
    os_log_error(qvc_default_log(), "[ERROR] can't change the link %s", location.path);
    return;
  }
  row->item = 0;
  row->local = {};
}

void CloudApplier::replacePlaceholder(const DocumentRecord &document, SyncRow row,
                                      const FileLocation &location, const DocumentLook &look) {
  PreparedResult prepared = context_.storage.preparePlaceholder(
      markerOf(document), document.content.mode & 0777U, {0, document.content.modified});
  if (!prepared.result.isDone()) {
    context_.store.put(row);
    context_.store.fetchAgain(document.record);
    return;
  }
  const ContentsResult result =
      context_.storage.replaceContents(location.folder.get(), location.name, prepared.file, look.facts);
  if (result.isDone()) {
    row.tag = document.tag;
    row.content = document.content;
    row.local = LocalFileOf(result.facts);
    row.isDataless = true;
    row.newerTag.clear();
  } else {
    // Somebody wrote or read there just now: as a version that waits, it is put in place later.
    row.newerTag = document.tag;
    row.newer = document.content;
  }
  context_.store.put(row);
  touch(location.path);
}

}  // namespace droxa::keld
