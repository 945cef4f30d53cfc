#include <cerrno>
#include <fcntl.h>
#include <unistd.h>

#include "keld/contents/ContentsStorage.h"
#include "keld/contents/FileSteps.h"
#include "keld/contents/OutgoingDocument.h"
#include "keld/contents/PromiseFile.h"
#include "keld/contents/StorageNames.h"

// The part of ContentsStorage that puts contents where others are.
namespace droxa::keld {

namespace {

void call(const std::function<void()> &hook) {
  if (hook) hook();
}

ContentsResult notThere(int error) {
  if (error == ENOENT || error == ESTALE) return ContentsResult::failed(ContentsOutcome::gone, error);
  return ContentsResult::failedWith(error);
}

}  // namespace

ContentsResult ContentsStorage::materialise(int folder, const std::string &name, PartFile &part, PartUse use,
                                            const DocumentMarker &marker, std::uint32_t mode,
                                            const FileFacts &expected) const {
  const DocumentLook look = classify(folder, name);
  if (look.kind == DocumentClass::missing) return ContentsResult::failed(ContentsOutcome::gone);
  if (look.kind == DocumentClass::unreadable) return ContentsResult::failedWith(look.error);
  if (look.kind != DocumentClass::dataless || look.facts.inode != expected.inode)
    return ContentsResult::failed(ContentsOutcome::changedMeanwhile);
  PreparedResult prepared = prepareContents(part, use, marker, mode);
  if (!prepared.result.isDone()) return prepared.result;
  ContentsResult result = replaceContents(folder, name, prepared.file, look.facts);
  if (!result.isDone() && use == PartUse::consume) giveBack(prepared.file, part);
  return result;
}

ContentsResult ContentsStorage::replaceContents(int folder, const std::string &name, PreparedFile &prepared,
                                                const FileFacts &expected) const {
  if (!prepared || prepared.kind_ == PreparedFile::Kind::folder) return ContentsResult::failedWith(EINVAL);
  if (form() == DatalessForm::promise) {
    const DocumentLook look = classify(folder, name);
    if (look.kind == DocumentClass::dataless && look.isPromised)
      return IsAsExpected(look.facts, expected) ? fulfilPromise(folder, name, prepared, expected)
                                                : ContentsResult::failed(ContentsOutcome::changedMeanwhile);
  }
  std::optional<OutgoingDocument> outgoing;
  const OutgoingDocument::Watch watch{FileLease::Against::writers, capabilities_.leases, device_};
  const ContentsResult opened = OutgoingDocument::open(folder, name, watch, &outgoing);
  if (!opened.isDone()) return opened;
  if (!IsAsExpected(outgoing->facts(), expected))
    return ContentsResult::failed(ContentsOutcome::changedMeanwhile);
  return replaceOpened(folder, name, prepared, *outgoing);
}

ContentsResult ContentsStorage::replaceOpened(int folder, const std::string &name, PreparedFile &prepared,
                                              OutgoingDocument &outgoing) const {
  // A promise that was left beside the document tells of the old contents; it must not be held against the
  // new ones.
  if (const ContentsResult removed = removePromise(folder, name); !removed.isDone()) return removed;
  if (!capabilities_.exchange || prepared.kind_ == PreparedFile::Kind::promise)
    return replaceByTakingOut(folder, name, prepared, outgoing);
  if (const int error = takeOverAttributes(outgoing, prepared); error != 0)
    return ContentsResult::failedWith(error);
  const int error = writeNote(prepared.temporary_, folder, name, outgoing, prepared.facts_);
  if (error != 0) return ContentsResult::failedWith(error);
  return exchange(folder, name, prepared, outgoing);
}

// What users and programs keep on the document besides its contents (its tags) stays with it.
int ContentsStorage::takeOverAttributes(const OutgoingDocument &outgoing,
                                        const PreparedFile &prepared) const {
  if (!capabilities_.extendedAttributes) return 0;
  OwnedDescriptor opened;
  if (!prepared.file_) opened = OpenFileIn(temporaries_.get(), prepared.temporary_, O_RDWR);
  const int file = prepared.file_ ? prepared.file_.get() : opened.get();
  if (file < 0) return errno;
  const bool hasChanged = CopyForeignAttributes(outgoing.descriptor(), file);
  return hasChanged && ::fsync(file) != 0 ? errno : 0;
}

// The note is durable. From here to the end the temporary's name may hold the user's file.
ContentsResult ContentsStorage::exchange(int folder, const std::string &name, PreparedFile &prepared,
                                         OutgoingDocument &outgoing) const {
  call(settings_.hooks.beforeExchange);
  if (const int error = ExchangeNames(temporaries_.get(), prepared.temporary_, folder, name); error != 0) {
    removeNote(prepared.temporary_);
    return notThere(error);
  }
  call(settings_.hooks.afterExchange);
  if (!outgoing.isAt(temporaries_.get(), prepared.temporary_) || !outgoing.isUntouched())
    return undoExchange(folder, name, prepared, outgoing);
  // Looked at again after the name is durable: whoever had found the old file before the exchange, and was
  // slow to open it, has come by then, and waits.
  if (SyncFolder(folder) != 0 || !outgoing.isUntouched())
    return undoExchange(folder, name, prepared, outgoing);
  dispose(prepared.temporary_);
  prepared.storage_ = nullptr;
  prepared.file_ = OwnedDescriptor();
  return succeeded(folder, name);
}

// Whether the temporary is what was prepared, and nobody who saw it at the document's name wrote into it.
bool ContentsStorage::isAsPrepared(const PreparedFile &prepared) const {
  const OwnedDescriptor opened = OpenFileIn(temporaries_.get(), prepared.temporary_, O_RDONLY);
  const int file = prepared.file_ ? prepared.file_.get() : opened.get();
  const auto there = ReadFileFacts(temporaries_.get(), prepared.temporary_, device_);
  const auto facts = ReadFolderFacts(file, device_);
  if (!there || !facts || there->inode != facts->inode || facts->inode != prepared.facts_.inode) return false;
  return facts->size == prepared.facts_.size && facts->modified == prepared.facts_.modified &&
         !IsOpenElsewhere(file, true);
}

ContentsResult ContentsStorage::undoExchange(int folder, const std::string &name, PreparedFile &prepared,
                                             const OutgoingDocument &outgoing) const {
  const bool wasOther = !outgoing.isAt(temporaries_.get(), prepared.temporary_);
  ContentsResult result =
      wasOther ? ContentsResult::failed(ContentsOutcome::changedMeanwhile) : outgoing.touchedResult();
  const int error = ExchangeNames(temporaries_.get(), prepared.temporary_, folder, name);
  if (error == 0 && isAsPrepared(prepared)) {
    SyncFolder(folder);
    removeNote(prepared.temporary_);
    return result;
  }
  // Somebody removed or replaced ours meanwhile, or wrote into it: theirs stands, and what came out is kept
  // for rescue.
  if (error == 0) ExchangeNames(temporaries_.get(), prepared.temporary_, folder, name);
  rescue(prepared.temporary_);
  prepared.storage_ = nullptr;
  prepared.file_ = OwnedDescriptor();
  result.hasRescued = true;
  return result;
}

// In the promise form, while nothing is at the document's name.
ContentsResult ContentsStorage::fulfilPromise(int folder, const std::string &name, PreparedFile &prepared,
                                              const FileFacts &expected) const {
  const std::string promiseName = PromiseNameFor(name);
  call(settings_.hooks.beforeExchange);
  const auto promise = ReadFileFacts(folder, promiseName, device_);
  if (!promise) return ContentsResult::failed(ContentsOutcome::gone);
  if (promise->inode != expected.inode) return ContentsResult::failed(ContentsOutcome::changedMeanwhile);
  const auto told = ReadPromise(folder, promiseName);
  DocumentMarker wanted = prepared.marker_;
  wanted.state = MarkerState::dataless;
  // A promise of other contents would make the new ones look like the user's, if this ended here.
  if (!told || told->marker != wanted || prepared.kind_ == PreparedFile::Kind::promise)
    if (const int error = putPromise(folder, name, prepared); error != 0) return notThere(error);
  if (prepared.kind_ == PreparedFile::Kind::promise) {
    prepared.storage_ = nullptr;
    return succeeded(folder, promiseName);
  }
  ContentsResult result = publishAtFreeName(prepared, folder, name);
  if (result.outcome == ContentsOutcome::nameTaken) result.outcome = ContentsOutcome::changedMeanwhile;
  if (result.outcome == ContentsOutcome::folderGone) result.outcome = ContentsOutcome::gone;
  if (!result.isDone()) return result;
  call(settings_.hooks.afterExchange);
  removePromise(folder, name);  // one that stays agrees with the document, or tells that it was changed
  return result;
}

ContentsResult ContentsStorage::removePromise(int folder, const std::string &name) const {
  if (form() != DatalessForm::promise) return {};
  const std::string promiseName = PromiseNameFor(name);
  const auto promise = ReadPromise(folder, promiseName);
  if (!promise || promise->name != name) return {};
  if (::unlinkat(folder, promiseName.c_str(), 0) != 0 && errno != ENOENT)
    return ContentsResult::failedWith(errno);
  const int error = SyncFolder(folder);
  return error == 0 ? ContentsResult{} : ContentsResult::failedWith(error);
}

// Moves the document into the storage, and makes sure that it was the watched one.
ContentsResult ContentsStorage::takeOut(int folder, const std::string &name, const OutgoingDocument &outgoing,
                                        std::string *temporary) const {
  *temporary = newTemporary(TemporaryKind::takenOut);
  if (const int error = writeNote(*temporary, folder, name, outgoing, FileFacts{}); error != 0)
    return ContentsResult::failedWith(error);
  call(settings_.hooks.beforeExchange);
  if (const int error = RenameIfFree(folder, name, temporaries_.get(), *temporary); error != 0) {
    removeNote(*temporary);
    return notThere(error);
  }
  call(settings_.hooks.afterExchange);
  if (outgoing.isAt(temporaries_.get(), *temporary) && outgoing.isUntouched()) return {};
  const bool wasOther = !outgoing.isAt(temporaries_.get(), *temporary);
  ContentsResult result =
      wasOther ? ContentsResult::failed(ContentsOutcome::changedMeanwhile) : outgoing.touchedResult();
  result.hasRescued = putBack(*temporary, folder, name).hasRescued;
  return result;
}

ContentsResult ContentsStorage::putBack(const std::string &temporary, int folder,
                                        const std::string &name) const {
  ContentsResult result;
  if (RenameIfFree(temporaries_.get(), temporary, folder, name) == 0) {
    SyncFolder(folder);
    removeNote(temporary);
  } else {
    result.hasRescued = rescue(temporary);
  }
  return result;
}

ContentsResult ContentsStorage::replaceByTakingOut(int folder, const std::string &name,
                                                   PreparedFile &prepared, OutgoingDocument &outgoing) const {
  std::string temporary;
  if (const ContentsResult taken = takeOut(folder, name, outgoing, &temporary); !taken.isDone()) return taken;
  ContentsResult result = publishAtFreeName(prepared, folder, name);
  if (!result.isDone()) {
    if (result.outcome == ContentsOutcome::nameTaken) result.outcome = ContentsOutcome::changedMeanwhile;
    if (result.outcome == ContentsOutcome::folderGone) result.outcome = ContentsOutcome::gone;
    result.hasRescued = putBack(temporary, folder, name).hasRescued;
    return result;
  }
  if (outgoing.isUntouched())
    dispose(temporary);
  else
    result.hasRescued = rescue(temporary);
  return result;
}

}  // namespace droxa::keld
