#include <cerrno>
#include <ctime>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

#include "keld/contents/ContentsStorage.h"
#include "keld/contents/FileSteps.h"
#include "keld/contents/PromiseFile.h"
#include "keld/contents/StorageNames.h"

// The part of ContentsStorage that makes files and gives them their first name.
namespace droxa::keld {

namespace {

PreparedResult failedPreparation(int error) {
  return {ContentsResult::failedWith(error), PreparedFile()};
}

}  // namespace

PreparedFile &PreparedFile::operator=(PreparedFile &&other) noexcept {
  if (this == &other) return *this;
  drop();
  storage_ = std::exchange(other.storage_, nullptr);
  kind_ = other.kind_;
  temporary_ = std::move(other.temporary_);
  digest_ = std::move(other.digest_);
  marker_ = std::move(other.marker_);
  mode_ = other.mode_;
  facts_ = other.facts_;
  file_ = std::move(other.file_);
  return *this;
}

void PreparedFile::drop() {
  if (storage_) storage_->discardTemporary(temporary_);
  storage_ = nullptr;
  file_ = OwnedDescriptor();
}

// Unlike that of any run before: one made by a run that crashed may still be there.
std::string ContentsStorage::newTemporary(TemporaryKind kind, const std::string &digest) const {
  struct timespec now;
  ::clock_gettime(CLOCK_REALTIME, &now);
  const std::string id = std::to_string(now.tv_sec) + "." + std::to_string(now.tv_nsec) + "." +
                         std::to_string(nextID_.fetch_add(1));
  std::string name = std::string(1, static_cast<char>(kind)) + "-" + id;
  if (!digest.empty()) name += "-" + digest;
  return name;
}

// Contents that were whole go back among the parts; everything else is removed.
void ContentsStorage::discardTemporary(const std::string &temporary) const {
  const bool isContents = temporary.front() == static_cast<char>(TemporaryKind::contents);
  const std::size_t dash = temporary.rfind('-');
  const std::string digest = temporary.substr(dash == std::string::npos ? 0 : dash + 1);
  if (isContents && IsContentsDigest(digest)) {
    ::fchmodat(temporaries_.get(), temporary.c_str(), 0600, 0);
    if (const OwnedDescriptor file = OpenFileIn(temporaries_.get(), temporary, O_RDWR))
      RemoveAttributes(file.get());
    if (RenameIfFree(temporaries_.get(), temporary, parts_.get(), WholePartName(digest)) == 0) return;
  }
  const bool isFolder = temporary.front() == static_cast<char>(TemporaryKind::folder);
  ::unlinkat(temporaries_.get(), temporary.c_str(), isFolder ? AT_REMOVEDIR : 0);
}

// Marker, date and mode of a finished file, and all of it durable. The mode comes last: attributes can't be
// set on a file that may not be written.
int ContentsStorage::completeFile(int file, const DocumentMarker &marker, std::uint32_t mode) const {
  if (capabilities_.extendedAttributes)
    if (const int error = WriteMarker(file, marker); error != 0) return error;
  // Some file systems know no such modes; they have no better ones.
  if (::fchmod(file, mode & 07777) != 0 && (errno != EPERM || capabilities_.extendedAttributes)) return errno;
  if (const int dateError = SetModified(file, marker.modified); dateError != 0) return dateError;
  return ::fsync(file) == 0 ? 0 : errno;
}

PreparedResult ContentsStorage::preparePlaceholder(DocumentMarker marker, std::uint32_t mode,
                                                   const DocumentDates &dates) const {
  marker.birth = dates.birth;
  marker.state = marker.size == 0 ? MarkerState::present : MarkerState::dataless;
  if (!marker.isValid()) return failedPreparation(EINVAL);
  if (form() == DatalessForm::promise && marker.size > 0) return preparePromise(marker, mode, dates);
  return prepareEmptyFile(marker, mode, dates.modified);
}

PreparedResult ContentsStorage::prepareEmptyFile(const DocumentMarker &marker, std::uint32_t mode,
                                                 std::int64_t modified) const {
  PreparedFile prepared;
  prepared.temporary_ = newTemporary(TemporaryKind::placeholder);
  const OwnedDescriptor file = OpenFileIn(temporaries_.get(), prepared.temporary_, O_RDWR | O_CREAT | O_EXCL);
  if (!file) return failedPreparation(errno);
  prepared.storage_ = this;
  prepared.kind_ = PreparedFile::Kind::placeholder;
  prepared.marker_ = marker;
  prepared.mode_ = mode & 07777;
  if (::ftruncate(file.get(), static_cast<off_t>(marker.size)) != 0) return failedPreparation(errno);
  int error = completeFile(file.get(), marker, mode);
  if (error == 0 && modified != marker.modified) {
    error = SetModified(file.get(), modified);
    if (error == 0 && ::fsync(file.get()) != 0) error = errno;
  }
  if (error != 0) return failedPreparation(error);
  prepared.facts_ = ReadFolderFacts(file.get(), device_).value_or(FileFacts{});
  return {{}, std::move(prepared)};
}

// Written when its name is known: see writePromise.
PreparedResult ContentsStorage::preparePromise(const DocumentMarker &marker, std::uint32_t mode,
                                               const DocumentDates &dates) const {
  PreparedFile prepared;
  prepared.temporary_ = newTemporary(TemporaryKind::promise);
  prepared.kind_ = PreparedFile::Kind::promise;
  prepared.storage_ = this;
  prepared.marker_ = marker;
  prepared.mode_ = mode & 07777;
  prepared.facts_.modified = dates.modified;
  return {{}, std::move(prepared)};
}

int ContentsStorage::writePromise(const std::string &temporary, const PreparedFile &prepared,
                                  const std::string &name) const {
  PromiseFile promise{name, prepared.marker_, prepared.mode_, prepared.facts_.modified};
  promise.marker.state = MarkerState::dataless;
  ::unlinkat(temporaries_.get(), temporary.c_str(), 0);  // of a name that was taken
  return WriteSmallFile(temporaries_.get(), temporary, EncodePromise(promise), 0600);
}

// In the place of the document's promise, if there is one.
int ContentsStorage::putPromise(int folder, const std::string &name, const PreparedFile &prepared) const {
  const std::string temporary = newTemporary(TemporaryKind::promise);
  if (const int error = writePromise(temporary, prepared, name); error != 0) return error;
  const std::string promiseName = PromiseNameFor(name);
  if (::renameat(temporaries_.get(), temporary.c_str(), folder, promiseName.c_str()) == 0)
    return SyncFolder(folder);
  const int error = errno;
  ::unlinkat(temporaries_.get(), temporary.c_str(), 0);
  return error;
}

// The part's file moves, and its lock with it.
int ContentsStorage::takePart(PartFile &part, PreparedFile *prepared) const {
  prepared->temporary_ = newTemporary(TemporaryKind::contents, part.digest_);
  if (::renameat(parts_.get(), part.fileName().c_str(), temporaries_.get(), prepared->temporary_.c_str()) !=
      0)
    return errno;
  prepared->storage_ = this;
  prepared->digest_ = part.digest_;
  prepared->file_ = std::move(part.file_);
  prepared->facts_ = ReadFolderFacts(prepared->file_.get(), device_).value_or(FileFacts{});
  part.isTaken_ = true;
  return 0;
}

// Named unlike a part that moved: a copy that was cut short isn't whole.
int ContentsStorage::copyPart(PartFile &part, PreparedFile *prepared) const {
  if (const int error = hasNoRoomFor(part.size_); error != 0) return error;
  prepared->temporary_ = newTemporary(TemporaryKind::placeholder);
  prepared->file_ = OpenFileIn(temporaries_.get(), prepared->temporary_, O_RDWR | O_CREAT | O_EXCL);
  if (!prepared->file_) return errno;
  prepared->storage_ = this;
  return CopyContents(part.descriptor(), prepared->file_.get(), part.size_);
}

PreparedResult ContentsStorage::prepareContents(PartFile &part, PartUse use, DocumentMarker marker,
                                                std::uint32_t mode) const {
  marker.state = MarkerState::present;
  if (!part.isFinished() || part.isTaken_ || marker.digest != part.digest() || marker.size != part.size() ||
      !marker.isValid())
    return failedPreparation(EINVAL);
  PreparedFile prepared;
  prepared.kind_ = PreparedFile::Kind::contents;
  prepared.marker_ = marker;
  prepared.mode_ = mode & 07777;
  int error = use == PartUse::consume ? takePart(part, &prepared) : copyPart(part, &prepared);
  // Its name here needn't be durable yet: a note makes it so before the document may come under it.
  if (error == 0) error = completeFile(prepared.file_.get(), marker, mode);
  if (error != 0) {
    if (prepared && use == PartUse::consume) giveBack(prepared, part);
    return failedPreparation(error);
  }
  prepared.facts_ = ReadFolderFacts(prepared.file_.get(), device_).value_or(FileFacts{});
  return {{}, std::move(prepared)};
}

void ContentsStorage::giveBack(PreparedFile &prepared, PartFile &part) const {
  if (!prepared || prepared.digest_ != part.digest_ || !part.isTaken_) return;
  prepared.storage_ = nullptr;
  discardTemporary(prepared.temporary_);
  const auto whole = ReadFileFacts(parts_.get(), WholePartName(part.digest_), device_);
  if (!whole || whole->inode != prepared.facts_.inode) return;  // the same was downloaded again meanwhile
  part.file_ = std::move(prepared.file_);
  part.isTaken_ = false;
}

PreparedResult ContentsStorage::prepareFolder(const DocumentMarker &marker, std::uint32_t mode) const {
  if (marker.state != MarkerState::folder || !marker.isValid()) return failedPreparation(EINVAL);
  PreparedFile prepared;
  prepared.temporary_ = newTemporary(TemporaryKind::folder);
  if (::mkdirat(temporaries_.get(), prepared.temporary_.c_str(), 0700) != 0) return failedPreparation(errno);
  prepared.storage_ = this;
  prepared.kind_ = PreparedFile::Kind::folder;
  const OwnedDescriptor folder = OpenFileIn(temporaries_.get(), prepared.temporary_, O_RDONLY | O_DIRECTORY);
  if (!folder) return failedPreparation(errno);
  if (capabilities_.extendedAttributes)
    if (const int error = WriteMarker(folder.get(), marker); error != 0) return failedPreparation(error);
  if (::fchmod(folder.get(), mode & 07777) != 0 && errno != EPERM) return failedPreparation(errno);
  if (::fsync(folder.get()) != 0 && errno != EINVAL) return failedPreparation(errno);
  prepared.facts_ = ReadFolderFacts(folder.get(), device_).value_or(FileFacts{});
  return {{}, std::move(prepared)};
}

ContentsResult ContentsStorage::publishNew(PreparedFile &prepared, int folder,
                                           const std::string &name) const {
  if (!prepared) return ContentsResult::failedWith(EINVAL);
  if (form() == DatalessForm::promise && classify(folder, name).kind != DocumentClass::missing)
    return ContentsResult::failed(ContentsOutcome::nameTaken);
  return publishAtFreeName(prepared, folder, name);
}

ContentsResult ContentsStorage::publishAtFreeName(PreparedFile &prepared, int folder,
                                                  const std::string &name) const {
  std::string target = name;
  if (prepared.kind_ == PreparedFile::Kind::promise) {
    if (const int error = writePromise(prepared.temporary_, prepared, name); error != 0)
      return ContentsResult::failedWith(error);
    target = PromiseNameFor(name);
  }
  switch (const int error = RenameIfFree(temporaries_.get(), prepared.temporary_, folder, target)) {
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
  prepared.storage_ = nullptr;
  prepared.file_ = OwnedDescriptor();
  if (const int error = SyncFolder(folder); error != 0) return ContentsResult::failedWith(error);
  return succeeded(folder, target);
}

ContentsResult ContentsStorage::succeeded(int folder, const std::string &name) const {
  ContentsResult result;
  result.facts = ReadFileFacts(folder, name, device_).value_or(FileFacts{});
  return result;
}

}  // namespace droxa::keld
