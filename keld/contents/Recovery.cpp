#include <array>
#include <climits>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "keld/contents/ContentsStorage.h"
#include "keld/contents/ExchangeNote.h"
#include "keld/contents/FileSteps.h"
#include "keld/contents/OutgoingDocument.h"
#include "keld/contents/PromiseFile.h"
#include "keld/contents/StorageNames.h"

// The part of ContentsStorage that knows whose a file in the storage is. The rule: what may be the user's is
// never removed. A temporary without a note was never exchanged; with a note, it is whichever of the two
// files it is, and goes only if nobody wrote into it.
namespace droxa::keld {

namespace {

std::string pathOf(int folder) {
  const std::string link = "/proc/self/fd/" + std::to_string(folder);
  std::array<char, PATH_MAX> path;
  const ssize_t length = ::readlink(link.c_str(), path.data(), path.size());
  if (length <= 0 || static_cast<std::size_t>(length) == path.size()) return {};
  return std::string(path.data(), static_cast<std::size_t>(length));
}

// The folder's path below the replica's; empty also when it can't be told.
std::string pathBelow(int replica, int folder) {
  const std::string root = pathOf(replica);
  const std::string path = pathOf(folder);
  if (root.empty() || path.size() <= root.size() + 1 || path.compare(0, root.size(), root) != 0) return {};
  if (root != "/" && path[root.size()] != '/') return {};
  return path.substr(root == "/" ? 1 : root.size() + 1);
}

std::optional<ExchangeNote> readNote(int folder, const std::string &temporary) {
  std::string bytes;
  if (ReadSmallFile(folder, NoteNameFor(temporary), kMostNoteBytes, &bytes) != 0) return std::nullopt;
  return ParseNote(bytes);
}

ExchangeNote::File fileOf(const FileFacts &facts) {
  return {facts.inode, facts.size, facts.modified};
}

}  // namespace

int ContentsStorage::writeNote(const std::string &temporary, int folder, const std::string &name,
                               const OutgoingDocument &outgoing, const FileFacts &incoming) const {
  ExchangeNote note;
  note.incoming = fileOf(incoming);
  note.outgoing = fileOf(outgoing.facts());
  note.wasDataless = outgoing.isDataless();
  note.folderPath = pathBelow(replica_.get(), folder);
  note.folderInode = ReadFolderFacts(folder, device_).value_or(FileFacts{}).inode;
  note.name = name;
  removeNote(temporary);  // of an exchange that was undone
  const int error = WriteSmallFile(temporaries_.get(), NoteNameFor(temporary), EncodeNote(note), 0600);
  return error != 0 ? error : SyncFolder(temporaries_.get());
}

void ContentsStorage::removeNote(const std::string &temporary) const {
  ::unlinkat(temporaries_.get(), NoteNameFor(temporary).c_str(), 0);
}

// The file before its note: without a note it would be anybody's.
void ContentsStorage::dispose(const std::string &temporary) const {
  if (::unlinkat(temporaries_.get(), temporary.c_str(), 0) != 0) return;
  // File systems with a journal keep the order of these two by themselves.
  if (form() == DatalessForm::promise) SyncFolder(temporaries_.get());
  removeNote(temporary);
}

// The file before its note here too: recoverNote() brings a note that stayed behind.
bool ContentsStorage::rescue(const std::string &temporary) const {
  if (RenameIfFree(temporaries_.get(), temporary, rescued_.get(), temporary) != 0)
    return true;  // recover() will
  ::renameat(temporaries_.get(), NoteNameFor(temporary).c_str(), rescued_.get(),
             NoteNameFor(temporary).c_str());
  SyncFolder(rescued_.get());
  SyncFolder(temporaries_.get());
  return true;
}

std::vector<RescuedFile> ContentsStorage::recover() const {
  NameList names;
  ReadFolderNames(temporaries_.get(), &names);
  for (std::size_t i = 0; i < names.size(); ++i)
    if (IsNoteName(names[i])) recoverNote(std::string(names[i]));
  for (std::size_t i = 0; i < names.size(); ++i)
    if (!IsNoteName(names[i])) recoverTemporary(std::string(names[i]));
  SyncFolder(temporaries_.get());
  removeStaleParts();
  return rescuedFiles();
}

// A note whose file is elsewhere.
void ContentsStorage::recoverNote(const std::string &noteName) const {
  const std::string temporary = noteName.substr(0, noteName.size() - kNoteSuffix.size());
  if (ReadFileFacts(temporaries_.get(), temporary, device_)) return;
  if (ReadFileFacts(rescued_.get(), temporary, device_))
    ::renameat(temporaries_.get(), noteName.c_str(), rescued_.get(), noteName.c_str());
  else
    removeNote(temporary);
}

void ContentsStorage::recoverTemporary(const std::string &temporary) const {
  const auto facts = ReadFileFacts(temporaries_.get(), temporary, device_);
  const auto note = readNote(temporaries_.get(), temporary);
  if (!facts || !note) {
    // Half a note was never followed by an exchange.
    if (temporary.front() == static_cast<char>(TemporaryKind::takenOut))
      rescue(temporary);
    else
      discardTemporary(temporary);
    removeNote(temporary);
    return;
  }
  if (facts->inode != note->incoming.inode) {
    recoverOutgoing(temporary, *note);
  } else if (fileOf(*facts) == note->incoming) {
    discardTemporary(temporary);
    removeNote(temporary);
  } else {
    rescue(temporary);  // it was at the document's name for a moment, and somebody wrote into it
  }
}

// A document that was taken out goes back, unless its promise (or its successor's) stands already: then it
// was let go of, and goes back only if somebody wrote into it.
void ContentsStorage::recoverOutgoing(const std::string &temporary, const ExchangeNote &note) const {
  const bool isTakenOut = temporary.front() == static_cast<char>(TemporaryKind::takenOut);
  const OwnedDescriptor folder = isTakenOut ? openNoted(note) : OwnedDescriptor();
  const auto putBackIfFree = [&] {
    if (!folder || RenameIfFree(temporaries_.get(), temporary, folder.get(), note.name) != 0) return false;
    SyncFolder(folder.get());
    removeNote(temporary);
    return true;
  };
  if (folder && !ReadPromise(folder.get(), PromiseNameFor(note.name)) && putBackIfFree()) return;
  std::optional<OutgoingDocument> document;
  const OutgoingDocument::Watch watch{FileLease::Against::writers, capabilities_.leases, device_};
  const ContentsResult opened = OutgoingDocument::open(temporaries_.get(), temporary, watch, &document);
  const bool isSame = document && document->facts().inode == note.outgoing.inode;
  const bool isClean =
      isSame && (note.wasDataless ? document->isDataless() : fileOf(document->facts()) == note.outgoing);
  if (isClean)
    dispose(temporary);
  else if (!putBackIfFree() && opened.outcome != ContentsOutcome::inUse)  // the next recovery will know
    rescue(temporary);
}

// The folder that the note names, if it is still the same one.
OwnedDescriptor ContentsStorage::openNoted(const ExchangeNote &note) const {
  OwnedDescriptor folder(::openat(replica_.get(), ".", O_PATH | O_DIRECTORY | O_CLOEXEC));
  for (std::size_t at = 0; folder && at < note.folderPath.size();) {
    const std::size_t end = std::min(note.folderPath.find('/', at), note.folderPath.size());
    folder = OpenFolder(folder.get(), note.folderPath.substr(at, end - at));
    at = end + 1;
  }
  if (!folder) return folder;
  const auto facts = ReadFolderFacts(folder.get(), device_);
  return facts && facts->inode == note.folderInode ? std::move(folder) : OwnedDescriptor();
}

std::vector<RescuedFile> ContentsStorage::rescuedFiles() const {
  NameList names;
  std::vector<RescuedFile> files;
  ReadFolderNames(rescued_.get(), &names);
  for (std::size_t i = 0; i < names.size(); ++i) {
    if (IsNoteName(names[i])) continue;
    RescuedFile file;
    file.id = names[i];
    const auto facts = ReadFileFacts(rescued_.get(), file.id, device_);
    if (!facts) continue;
    file.facts = *facts;
    file.marker = ReadMarker(rescued_.get(), file.id);
    if (const auto note = readNote(rescued_.get(), file.id)) {
      file.folderPath = note->folderPath;
      file.folderInode = note->folderInode;
      file.name = note->name;
    }
    files.push_back(std::move(file));
  }
  return files;
}

ContentsResult ContentsStorage::placeRescued(const std::string &id, int folder,
                                             const std::string &name) const {
  if (id.find('/') != std::string::npos || IsNoteName(id)) return ContentsResult::failedWith(EINVAL);
  if (!ReadFileFacts(rescued_.get(), id, device_)) return ContentsResult::failed(ContentsOutcome::gone);
  switch (const int error = RenameIfFree(rescued_.get(), id, folder, name)) {
    case 0:
      break;
    case EEXIST:
      return ContentsResult::failed(ContentsOutcome::nameTaken, error);
    case ENOENT:
    case ESTALE:
      return ContentsResult::failed(ContentsOutcome::folderGone, error);
    default:
      return ContentsResult::failedWith(error);
  }
  const int error = SyncFolder(folder);
  if (error != 0) return ContentsResult::failedWith(error);
  ::unlinkat(rescued_.get(), NoteNameFor(id).c_str(), 0);
  return succeeded(folder, name);
}

}  // namespace droxa::keld
