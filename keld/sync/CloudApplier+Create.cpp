// What the cloud has and the replica doesn't.

#include <cerrno>
#include <cstdio>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "keld/sync/CloudApplier.h"
#include "keld/sync/ConflictName.h"
#include "keld/sync/PutBackNotes.h"
#include "platform/foundation/NSDate.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

constexpr unsigned kMostTries = 100;

std::optional<FileFacts> factsAt(const FileLocation &location) {
  return ReadFileFacts(location.folder.get(), location.name, 0);
}

}  // namespace

void CloudApplier::create(const DocumentRecord &document, const Place &place, SyncRow row) {
  row.tag = document.tag;
  row.parent = document.parent;
  row.name = document.name;
  row.kind = document.kind;
  row.content = document.content;
  row.isDataless = document.kind == NSFileProviderItemKind::document && document.content.size > 0;
  bool made = false;
  if (document.kind == NSFileProviderItemKind::folder)
    made = createFolder(document, place, &row);
  else if (document.kind == NSFileProviderItemKind::document)
    made = createDocument(document, place, &row);
  else
    made = createLink(document, place, &row);
  if (!made) {
    // It is tried again with the next fetch.
    row.tag.clear();
    context_.store.fetchAgain(document.record);
  }
  context_.store.put(row);
  // What was here already won't be looked at again: nothing about its file has changed.
  const bool isDocument = row.kind == NSFileProviderItemKind::document;
  if (made && row.item != 0) context_.states.show({row.item, row.isDataless, true, row.local, isDocument});
}

// What the file that is there now is to bear.
void CloudApplier::placed(const DocumentRecord &document, const Place &place, const std::string &name,
                          SyncRow *row) {
  noteTrash(document, name);
  row->metadata = {};
  const bool sendsMetadata = applyMetadata(document, place.folder.get(), name, {}, row);
  if (sendsMetadata && row->item != 0) context_.store.enqueue(row->item, false, false);
}

void CloudApplier::noteTrash(const DocumentRecord &document, const std::string &name) {
  if (!document.putBack) return;
  PutBackNotes(context_.files, context_.store).write(name, *document.putBack);
  if (!context_.files.folderPath(document.putBack->parent)) early_[name] = *document.putBack;
}

// The folder that something in the trash was in may come after it.
void CloudApplier::noteTrashAgain() {
  for (auto each = early_.begin(); each != early_.end();) {
    const bool isKnown = context_.files.folderPath(each->second.parent).has_value();
    if (isKnown) PutBackNotes(context_.files, context_.store).write(each->first, each->second);
    each = isKnown ? early_.erase(each) : std::next(each);
  }
}

// Has `put` try the record's name, and others where that one is somebody else's.
bool CloudApplier::putAtFreeName(const DocumentRecord &document, const Place &place, SyncRow *row,
                                 const std::function<ContentsOutcome(const std::string &name)> &put) {
  std::string name = document.name;
  for (unsigned attempt = 1; attempt <= kMostTries; ++attempt) {
    const ContentsOutcome outcome = put(name);
    if (outcome == ContentsOutcome::done) {
      touch(place.folderPath + "/" + name);
      placed(document, place, name, row);
      return true;
    }
    if (outcome != ContentsOutcome::nameTaken) return false;
    const Taken taken = resolveTaken(document, place, name, row);
    if (taken == Taken::isIt) {
      placed(document, place, name, row);
      return true;
    }
    if (taken == Taken::useOtherName)
      name = ConflictName(document.name, document.device, NSDate::now().nanosecondsSince1970(), attempt);
  }
  return false;
}

bool CloudApplier::createFolder(const DocumentRecord &document, const Place &place, SyncRow *row) {
  PreparedResult prepared = context_.storage.prepareFolder(markerOf(document), document.content.mode & 0777U);
  if (!prepared.result.isDone()) return false;
  return putAtFreeName(document, place, row, [&](const std::string &name) {
    return context_.storage.publishNew(prepared.file, place.folder.get(), name).outcome;
  });
}

bool CloudApplier::createLink(const DocumentRecord &document, const Place &place, SyncRow *row) {
  if (document.target.empty()) return false;
  return putAtFreeName(document, place, row, [&](const std::string &name) {
    if (::symlinkat(document.target.c_str(), place.folder.get(), name.c_str()) == 0)
      return ContentsOutcome::done;
    return errno == EEXIST ? ContentsOutcome::nameTaken : ContentsOutcome::error;
  });
}

bool CloudApplier::createDocument(const DocumentRecord &document, const Place &place, SyncRow *row) {
  PreparedResult prepared = context_.storage.preparePlaceholder(
      markerOf(document), document.content.mode & 0777U, {0, document.content.modified});
  if (!prepared.result.isDone()) return false;
  return putAtFreeName(document, place, row, [&](const std::string &name) {
    const ContentsResult result = context_.storage.publishNew(prepared.file, place.folder.get(), name);
    if (result.isDone()) row->local = LocalFileOf(result.facts);
    return result.outcome;
  });
}

// --- The name is taken.

CloudApplier::Taken CloudApplier::resolveTaken(const DocumentRecord &document, const Place &place,
                                               const std::string &name, SyncRow *row) {
  FileLocation there;
  int code = 0;
  there.path = place.folderPath + "/" + name;
  there.name = name;
  there.folder = context_.files.openFolder(place.folderPath, &code);
  const auto facts = there ? factsAt(there) : std::nullopt;
  if (!facts) return Taken::freed;  // it has just gone
  (void)context_.files.itemAtPath(there.path, &there.item);
  auto other = context_.store.byItem(there.item.id);
  const auto marker = ReadMarker(there.folder.get(), name);
  if (!other && marker && marker->recordName != document.record)
    other = context_.store.byRecord(marker->recordName);
  const bool isFolder = document.kind == NSFileProviderItemKind::folder;
  const bool isMarked = marker && marker->recordName == document.record;
  if (facts->kind == NSFileProviderItemKind::folder && isFolder) {
    // Two folders of one name are one folder; unless they are two in the cloud already.
    if (other && !other->tag.empty() && other->record != document.record)
      return freeName(there, other, document.record);
    const OwnedDescriptor folder(
        ::openat(there.folder.get(), name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    if (folder) WriteMarker(folder.get(), markerOf(document));
    if (other && other->record != document.record) context_.store.erase(other->record);
    row->item = there.item.id;
    if (row->item != 0) context_.store.enqueue(row->item, false, false);  // shown as sent, if it is that
    return Taken::isIt;
  }
  const bool isLink = IsLink(facts->kind);
  if (isLink && !document.target.empty()) {
    char target[4096];
    const ssize_t length = ::readlinkat(there.folder.get(), name.c_str(), target, sizeof target);
    if (length > 0 && document.target == std::string_view(target, static_cast<std::size_t>(length))) {
      if (other && other->record != document.record) context_.store.erase(other->record);
      row->item = there.item.id;
      if (row->item != 0) context_.store.enqueue(row->item, false, false);  // shown as sent, if it is that
      return Taken::isIt;
    }
  }
  if (facts->kind == NSFileProviderItemKind::document && document.kind == NSFileProviderItemKind::document &&
      (isMarked || !other || other->tag.empty()))
    return resolveTakenByDocument(document, there, other, row);
  return freeName(there, other, document.record);
}

CloudApplier::Taken CloudApplier::resolveTakenByDocument(const DocumentRecord &document,
                                                         const FileLocation &there,
                                                         const std::optional<SyncRow> &other, SyncRow *row) {
  const DocumentLook look = context_.storage.classify(there.folder.get(), there.name);
  const bool isIntact = look.kind == DocumentClass::present || look.kind == DocumentClass::dataless;
  const bool isOwn = look.marker && look.marker->recordName == document.record;
  bool isSame = isIntact && isOwn && look.marker->digest == document.content.digest;
  if (isIntact && isOwn && !isSame) {
    // An older version, from before the row was written down.
    PreparedResult prepared = context_.storage.preparePlaceholder(
        markerOf(document), document.content.mode & 0777U, {0, document.content.modified});
    if (prepared.result.isDone()) {
      const ContentsResult result =
          context_.storage.replaceContents(there.folder.get(), there.name, prepared.file, look.facts);
      if (result.isDone()) {
        row->local = LocalFileOf(result.facts);
        row->isDataless = true;
        row->item = there.item.id;
        touch(there.path);
        return Taken::isIt;
      }
    }
  }
  DocumentLook found = look;
  const bool mayBeSame = look.facts.size == document.content.size && look.kind != DocumentClass::dataless &&
                         look.kind != DocumentClass::partlyWritten && look.kind != DocumentClass::evicting;
  if (!isSame && mayBeSame) {
    const OwnedDescriptor file(
        ::openat(there.folder.get(), there.name.c_str(), O_RDONLY | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK));
    if (file && DigestOfFile(file.get()) == document.content.digest) {
      DocumentMarker marker = markerOf(document);
      marker.state = MarkerState::present;
      marker.modified = look.facts.modified;
      WriteMarker(file.get(), marker);
      isSame = true;
      found = context_.storage.classify(there.folder.get(), there.name);
    }
  }
  if (isSame) {
    row->item = there.item.id;
    row->local = LocalFileOf(found.facts);
    row->isDataless = found.kind == DocumentClass::dataless;
    if (row->item != 0) context_.store.enqueue(row->item, false, false);  // shown as sent, if it is that
    if (other && other->record != document.record) context_.store.erase(other->record);
    touch(there.path);
    return Taken::isIt;
  }
  return freeName(there, other, document.record);
}

// Of two records with one name the one with the smaller name of its own keeps it, so that all devices decide
// alike. What the cloud doesn't know yet always makes room.
CloudApplier::Taken CloudApplier::freeName(const FileLocation &there, const std::optional<SyncRow> &other,
                                           const std::string &record) {
  const bool isInCloud = other && !other->tag.empty();
  if (isInCloud && other->record < record) return Taken::useOtherName;
  if (!isInCloud) {
    std::string copy;
    const NSError problem = conflicts_.setAside(there, &copy);
    if (problem) return Taken::useOtherName;
    if (other) context_.store.erase(other->record);
    touch(there.path);
    touch(there.path.substr(0, there.path.size() - there.name.size()) + copy);
    return Taken::freed;
  }
  // A rename like any other, which the cloud is told of.
  for (unsigned number = 1; number < 1000; ++number) {
    const std::string name =
        ConflictName(there.name, context_.device, NSDate::now().nanosecondsSince1970(), number);
    if (::renameat2(there.folder.get(), there.name.c_str(), there.folder.get(), name.c_str(),
                    RENAME_NOREPLACE) == 0) {
      touch(there.path);
      touch(there.path.substr(0, there.path.size() - there.name.size()) + name);
      return Taken::freed;
    }
    if (errno != EEXIST) break;
  }
  return Taken::useOtherName;
}

}  // namespace droxa::keld
