#include "keld/contents/PartFile.h"

#include <cerrno>
#include <fcntl.h>
#include <string>
#include <sys/stat.h>
#include <unistd.h>

#include "keld/contents/FileSteps.h"
#include "keld/contents/FollowingDigest.h"
#include "keld/contents/StorageNames.h"

namespace droxa::keld {

namespace {

constexpr std::uint64_t kWorthKeeping = 1 << 20;
// The disk is told to begin whenever so much has come, so that little is left to wait for at the end.
constexpr std::uint64_t kDiskStep = 8 << 20;

}  // namespace

ContentsResult ContentsResult::failedWith(int error) {
  return failed(error == ENOSPC || error == EDQUOT ? ContentsOutcome::noSpace : ContentsOutcome::error,
                error);
}

PartFile::PartFile(int partsFolder, OwnedDescriptor file, std::string digest, std::uint64_t size,
                   bool isFinished)
    : partsFolder_(partsFolder),
      digest_(std::move(digest)),
      size_(size),
      file_(std::move(file)),
      isFinished_(isFinished) {
  if (isFinished_) length_ = size_;
}

PartFile::~PartFile() = default;

std::string PartFile::fileName() const {
  return isFinished_ ? WholePartName(digest_) : UnfinishedPartName(digest_);
}

// What was there before is read back, not trusted: after a power cut it may be zeros.
int PartFile::goOn() {
  struct stat status {};
  if (::fstat(file_.get(), &status) != 0) return errno;
  length_ = static_cast<std::uint64_t>(status.st_size);
  hash_ = std::make_unique<FollowingDigest>(file_.get());
  hash_->grewTo(length_);
  return 0;
}

ContentsResult PartFile::append(std::string_view bytes) {
  if (isTaken_ || isFinished_) return ContentsResult::failed(ContentsOutcome::error, EINVAL);
  if (bytes.size() > size_ - length_) {
    discard();
    return ContentsResult::failed(ContentsOutcome::wrongContents);
  }
  while (!bytes.empty()) {
    const ssize_t written = ::pwrite(file_.get(), bytes.data(), bytes.size(), static_cast<off_t>(length_));
    if (written < 0 && errno == EINTR) continue;
    if (written < 0) return ContentsResult::failedWith(errno);
    length_ += static_cast<std::uint64_t>(written);
    bytes.remove_prefix(static_cast<std::size_t>(written));
    hash_->grewTo(length_);
  }
  if (length_ - handedToDisk_ >= kDiskStep) {
    // A file system that can't begins later.
    ::sync_file_range(file_.get(), static_cast<off_t>(handedToDisk_),
                      static_cast<off_t>(length_ - handedToDisk_), SYNC_FILE_RANGE_WRITE);
    handedToDisk_ = length_;
  }
  return {};
}

ContentsResult PartFile::finish() {
  if (isTaken_) return ContentsResult::failed(ContentsOutcome::error, EINVAL);
  if (isFinished_) return {};
  std::string digest;
  int error = length_ == size_ ? hash_->finish(&digest) : 0;
  if (error == 0 && digest != digest_) {
    discard();
    return ContentsResult::failed(ContentsOutcome::wrongContents);
  }
  if (error == 0 && ::fsync(file_.get()) != 0) error = errno;
  if (error == 0)
    error = ::renameat(partsFolder_, fileName().c_str(), partsFolder_, WholePartName(digest_).c_str()) == 0
                ? 0
                : errno;
  if (error != 0) {
    goOn();  // the digest is spent; a second try begins with reading everything
    return ContentsResult::failedWith(error);
  }
  isFinished_ = true;
  hash_.reset();
  // A part whose name is lost is downloaded again, which for a small one costs no more than this.
  if (size_ >= kWorthKeeping) SyncFolder(partsFolder_);
  return {};
}

void PartFile::discard() {
  if (isTaken_) return;
  ::unlinkat(partsFolder_, fileName().c_str(), 0);
  isTaken_ = true;
  hash_.reset();  // before what it reads is closed
  file_ = OwnedDescriptor();
}

}  // namespace droxa::keld
