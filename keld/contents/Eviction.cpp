#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "keld/contents/ContentsStorage.h"
#include "keld/contents/FileSteps.h"
#include "keld/contents/OutgoingDocument.h"
#include "keld/contents/PromiseFile.h"
#include "keld/contents/StorageNames.h"

// The part of ContentsStorage that lets go of contents.
namespace droxa::keld {

namespace {

void call(const std::function<void()> &hook) {
  if (hook) hook();
}

ContentsResult openProblem(int error) {
  switch (error) {
    case ENOENT:
    case ENOTDIR:
      return ContentsResult::failed(ContentsOutcome::gone, error);
    case ELOOP:
    case ENXIO:
    case EISDIR:
      return ContentsResult::failed(ContentsOutcome::changedMeanwhile, error);
    case EWOULDBLOCK:
    case ETXTBSY:
      return ContentsResult::failed(ContentsOutcome::inUse, error);
    default:
      return ContentsResult::failedWith(error);
  }
}

// A document open for writing; one that may not be written is made writable for as long as this lives.
class WritableDocument {
 public:
  ContentsResult open(int folder, const std::string &name) {
    file_ = OpenFileIn(folder, name, O_RDWR);
    if (!file_ && errno == EACCES) return openReadOnly(folder, name);
    return file_ ? ContentsResult{} : openProblem(errno);
  }
  ~WritableDocument() {
    if (isModeChanged_) ::chmod(path().c_str(), mode_);
  }
  OwnedDescriptor take() { return std::move(file_); }

 private:
  // Through a path alone, which doesn't count as having the file open.
  ContentsResult openReadOnly(int folder, const std::string &name) {
    pathAlone_ = OpenFileIn(folder, name, O_PATH);
    struct stat status;
    if (!pathAlone_ || ::fstat(pathAlone_.get(), &status) != 0) return openProblem(errno);
    if (!S_ISREG(status.st_mode)) return ContentsResult::failed(ContentsOutcome::changedMeanwhile);
    mode_ = status.st_mode & 07777;
    if (::chmod(path().c_str(), mode_ | S_IRUSR | S_IWUSR) != 0) return ContentsResult::failedWith(errno);
    isModeChanged_ = true;
    file_ = OwnedDescriptor(::open(path().c_str(), O_RDWR | O_NONBLOCK | O_CLOEXEC));
    return file_ ? ContentsResult{} : openProblem(errno);
  }
  std::string path() const { return "/proc/self/fd/" + std::to_string(pathAlone_.get()); }

  OwnedDescriptor file_;
  OwnedDescriptor pathAlone_;
  bool isModeChanged_ = false;
  mode_t mode_ = 0;
};

bool isTheContents(const FileFacts &facts, const FileFacts &expected, const DocumentMarker &marker) {
  FileFacts withoutChange = expected;
  withoutChange.changed = 0;  // reading attributes or setting a mode doesn't make other contents
  return IsAsExpected(facts, withoutChange) && facts.links == 1 && facts.size == marker.size &&
         facts.modified == marker.modified;
}

}  // namespace

ContentsResult ContentsStorage::evict(int folder, const std::string &name, const FileFacts &expected,
                                      DocumentMarker marker) const {
  marker.state = MarkerState::dataless;
  if (!marker.isValid()) return ContentsResult::failedWith(EINVAL);
  if (form() == DatalessForm::promise) return evictToPromise(folder, name, expected, marker);
  WritableDocument writable;
  if (const ContentsResult opened = writable.open(folder, name); !opened.isDone()) return opened;
  std::optional<OutgoingDocument> document;
  const OutgoingDocument::Watch watch{FileLease::Against::openers, capabilities_.leases, device_};
  const ContentsResult watched = OutgoingDocument::watch(writable.take(), watch, &document);
  if (!watched.isDone()) return watched;
  const bool isWhole = document->kind() == DocumentClass::present || document->kind() == DocumentClass::plain;
  const bool mayBeLetGo = isWhole || document->kind() == DocumentClass::edited;  // edited since the marker
  if (!mayBeLetGo || !isTheContents(document->facts(), expected, marker))
    return ContentsResult::failed(ContentsOutcome::changedMeanwhile);
  ContentsResult result = marker.size == 0 ? ContentsResult{} : letGo(*document, marker);
  document.reset();
  if (result.isDone()) result = succeeded(folder, name);
  return result;
}

ContentsResult ContentsStorage::finishEviction(int folder, const std::string &name) const {
  WritableDocument writable;
  if (const ContentsResult opened = writable.open(folder, name); !opened.isDone()) return opened;
  std::optional<OutgoingDocument> document;
  const OutgoingDocument::Watch watch{FileLease::Against::openers, capabilities_.leases, device_};
  const ContentsResult watched = OutgoingDocument::watch(writable.take(), watch, &document);
  if (!watched.isDone()) return watched;
  if (document->kind() != DocumentClass::evicting)
    return ContentsResult::failed(ContentsOutcome::changedMeanwhile);
  ContentsResult result = letGo(*document, *document->marker());
  document.reset();
  if (result.isDone()) result = succeeded(folder, name);
  return result;
}

// Marked durably before the first byte goes: whatever is left after a crash is never taken for contents.
ContentsResult ContentsStorage::letGo(OutgoingDocument &document, DocumentMarker marker) const {
  const int file = document.descriptor();
  const auto &before = document.marker();  // what it bore when it was opened
  marker.state = MarkerState::evicting;
  if (const int error = WriteMarker(file, marker); error != 0) return ContentsResult::failedWith(error);
  if (::fsync(file) != 0) return ContentsResult::failedWith(errno);
  const auto keep = [&](const ContentsResult &why) {
    const int error = before ? WriteMarker(file, *before) : RemoveMarker(file);
    if (error != 0 || ::fsync(file) != 0) return ContentsResult::failedWith(error != 0 ? error : errno);
    return why;
  };
  call(settings_.hooks.beforePunch);
  if (!document.isUntouched()) return keep(document.touchedResult());
  if (const int error = PunchOut(file, marker.size); error != 0) {
    // Anything but a plain refusal may have cost contents already: it stays marked, for finishEviction.
    const auto failed = ContentsResult::failedWith(error);
    return error == EOPNOTSUPP || error == EPERM || error == ENOSYS ? keep(failed) : failed;
  }
  call(settings_.hooks.afterPunch);
  // Without leases somebody may have written by now: their time of writing must stay, because it tells so.
  DataCoverage coverage;
  const auto facts = ReadFolderFacts(file, device_);
  if (!facts) return ContentsResult::failedWith(errno);
  int error = ReadDataCoverage(file, facts->size, &coverage);
  const bool isEmpty = coverage == DataCoverage::none && facts->size == marker.size;
  if (error == 0 && isEmpty) error = SetModified(file, marker.modified);
  marker.state = MarkerState::dataless;
  if (error == 0) error = WriteMarker(file, marker);
  if (error == 0 && ::fsync(file) != 0) error = errno;
  if (error != 0) return ContentsResult::failedWith(error);
  return isEmpty ? ContentsResult{} : ContentsResult::failed(ContentsOutcome::changedMeanwhile);
}

// The promise is durable before the document goes; while both are there, the document is present.
ContentsResult ContentsStorage::evictToPromise(int folder, const std::string &name, const FileFacts &expected,
                                               const DocumentMarker &marker) const {
  std::optional<OutgoingDocument> document;
  const OutgoingDocument::Watch watch{FileLease::Against::openers, capabilities_.leases, device_};
  const ContentsResult opened = OutgoingDocument::open(folder, name, watch, &document);
  if (!opened.isDone()) return opened;
  if (!isTheContents(document->facts(), expected, marker))
    return ContentsResult::failed(ContentsOutcome::changedMeanwhile);
  if (marker.size == 0) return succeeded(folder, name);
  const DocumentDates dates{marker.birth, document->facts().modified};
  PreparedResult promise = preparePromise(marker, document->facts().mode, dates);
  const std::string promiseName = PromiseNameFor(name);
  const int error = putPromise(folder, name, promise.file);
  promise.file.storage_ = nullptr;  // what there was of it is at its place
  if (error != 0) return error == ENOENT ? openProblem(error) : ContentsResult::failedWith(error);
  call(settings_.hooks.beforePunch);
  std::string temporary;
  ContentsResult result =
      document->isUntouched() ? takeOut(folder, name, *document, &temporary) : document->touchedResult();
  if (!result.isDone()) {
    removePromise(folder, name);
    return result;
  }
  call(settings_.hooks.afterPunch);
  if (const int syncError = SyncFolder(folder); syncError != 0) return ContentsResult::failedWith(syncError);
  if (!document->isUntouched()) {
    result = document->touchedResult();
    result.hasRescued = putBack(temporary, folder, name).hasRescued;
    removePromise(folder, name);
    return result;
  }
  dispose(temporary);
  return succeeded(folder, promiseName);
}

}  // namespace droxa::keld
