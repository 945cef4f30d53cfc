#include "keld/contents/PartFile.h"

#include <cerrno>
#include <fcntl.h>
#include <unistd.h>
#include <vector>

#include "keld/contents/ContentsDigest.h"
#include "keld/contents/FileSteps.h"
#include "keld/contents/StorageNames.h"

namespace droxa::keld {

namespace {
constexpr std::uint64_t kWorthKeeping = 1 << 20;

constexpr std::size_t kReadBytes = 128 * 1024;

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
  if (isFinished_)
    length_ = size_;
  else
    hash_ = std::make_unique<ContentsDigest>();
}

PartFile::~PartFile() = default;

std::string PartFile::fileName() const {
  return isFinished_ ? WholePartName(digest_) : UnfinishedPartName(digest_);
}

// What was there before is read back, not trusted: after a power cut it may be zeros.
int PartFile::readWhatIsThere() {
  std::vector<char> buffer(kReadBytes);
  for (;;) {
    const ssize_t read = ::pread(file_.get(), buffer.data(), buffer.size(), static_cast<off_t>(length_));
    if (read < 0 && errno == EINTR) continue;
    if (read < 0) return errno;
    if (read == 0) return 0;
    hash_->add(std::string_view(buffer.data(), static_cast<std::size_t>(read)));
    length_ += static_cast<std::uint64_t>(read);
  }
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
    hash_->add(bytes.substr(0, static_cast<std::size_t>(written)));
    length_ += static_cast<std::uint64_t>(written);
    bytes.remove_prefix(static_cast<std::size_t>(written));
  }
  return {};
}

ContentsResult PartFile::finish() {
  if (isTaken_) return ContentsResult::failed(ContentsOutcome::error, EINVAL);
  if (isFinished_) return {};
  if (length_ != size_ || hash_->finish() != digest_) {
    discard();
    return ContentsResult::failed(ContentsOutcome::wrongContents);
  }
  // The hash is spent; a second try after a failure begins with reading everything.
  hash_ = std::make_unique<ContentsDigest>();
  int error = ::fsync(file_.get()) == 0 ? 0 : errno;
  if (error == 0)
    error = ::renameat(partsFolder_, fileName().c_str(), partsFolder_, WholePartName(digest_).c_str()) == 0
                ? 0
                : errno;
  if (error != 0) {
    length_ = 0;
    readWhatIsThere();
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
  file_ = OwnedDescriptor();
}

}  // namespace droxa::keld
