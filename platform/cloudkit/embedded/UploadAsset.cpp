#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/cloudkit/CKDigest.h"
#include "platform/cloudkit/embedded/Calls.h"
#include "platform/cloudkit/embedded/Chunker.h"
#include "platform/cloudkit/embedded/Manifest.h"

namespace droxa::embedded {
namespace {

constexpr std::size_t kReadAtOnce = 1024 * 1024;  // between two looks at the context
constexpr int kMostTries = 3;

NSError modified() {
  return CKErrorMake(CKErrorCode::assetFileModified, "The file changed while it was uploaded");
}

// Reads a file from its start and notices when it isn't what it was.
class StableFile {
 public:
  StableFile(int descriptor, std::uint64_t size, const CKCallContext &context)
      : descriptor_(descriptor), size_(size), context_(context) {}

  NSError begin() {
    if (fstat(descriptor_, &before_) != 0) return unreadable(errno);
    if (!S_ISREG(before_.st_mode)) return unreadable(EINVAL);
    if (static_cast<std::uint64_t>(before_.st_size) != size_) return modified();
    posix_fadvise(descriptor_, 0, 0, POSIX_FADV_SEQUENTIAL);
    return {};
  }

  // Appends the next bytes to the buffer; none at the end.
  NSError read(std::uint64_t offset, std::size_t count, std::vector<std::uint8_t> &buffer) const {
    if (NSError stopped = context_.check()) return stopped;
    const std::size_t had = buffer.size();
    buffer.resize(had + count);
    const ssize_t got = pread(descriptor_, buffer.data() + had, count, static_cast<off_t>(offset));
    buffer.resize(had + static_cast<std::size_t>(std::max<ssize_t>(got, 0)));
    if (got < 0 && errno != EINTR) return unreadable(errno);
    return got == 0 ? modified() : NSError();
  }

  // Whether the bytes that were read are those of one state of the file. Attributes may have changed
  // meanwhile; where only the time of such a change differs, contents with times that were set back are told
  // by their bytes.
  NSError verify(const CKDigest &digest) const {
    struct stat after {};
    if (fstat(descriptor_, &after) != 0) return unreadable(errno);
    if (after.st_size != before_.st_size || !isSameTime(after.st_mtim, before_.st_mtim)) return modified();
    if (isSameTime(after.st_ctim, before_.st_ctim)) return {};
    CKDigest again;
    std::vector<std::uint8_t> buffer;
    while (again.size() < size_) {
      buffer.clear();
      if (NSError error = read(again.size(), kReadAtOnce, buffer)) return error;
      again.update(buffer);
    }
    return again.hex() == digest.hex() ? NSError() : modified();
  }

 private:
  static bool isSameTime(const timespec &a, const timespec &b) {
    return a.tv_sec == b.tv_sec && a.tv_nsec == b.tv_nsec;
  }
  static NSError unreadable(int code) {
    return CKErrorMake(CKErrorCode::assetFileNotFound, "The file can't be read",
                       NSError::errorWithPOSIXCode(code));
  }

  const int descriptor_;
  const std::uint64_t size_;
  const CKCallContext &context_;
  struct stat before_ {};
};

// Cuts the file into chunks and stores those that aren't there.
class Upload {
 public:
  Upload(Home &home, int descriptor, std::uint64_t size, const CKProgressHandler &progress,
         const CKCallContext &context)
      : home_(home),
        size_(size),
        progress_(progress),
        context_(context),
        file_(descriptor, size, context),
        writer_(home.chunks()) {}

  CKUploadReply run() {
    if (NSError error = checkQuota()) return {error, {}};
    if (NSError error = file_.begin()) return {error, {}};
    if (NSError error = storeChunks()) return {error, {}};
    if (NSError error = file_.verify(digest_)) return {error, {}};
    if (const int code = writer_.finish(); code != 0) return {unstorable(code), {}};
    if (progress_) progress_(size_, size_);  // waiting for the disk is no standstill
    const CKAssetReference asset{size_, digest_.hex()};
    const NSError error = home_.run(Home::Access::write, context_, [&](const Connection &connection) {
      // Inside the transaction, so that none is collected before the manifest says that it is needed.
      for (const Piece &piece : pieces_) {
        if (!home_.chunks().has(piece.chunk, piece.size)) {
          lostChunks_ = true;
          throw CallFailed{};
        }
      }
      WriteManifest(connection, asset, pieces_);
      NoteUpload(connection, asset);
    });
    if (error || lostChunks_) return {error, {}};
    return {{}, CKAsset::assetWithReference(asset)};
  }

  // Chunks that were there already were collected before they were safe. Another try writes them.
  bool lostChunks() const { return lostChunks_; }

 private:
  // A file that is larger than all that the account may have never gets in; into another's zone it may.
  NSError checkQuota() {
    if (home_.scope() == CKDatabaseScope::sharedDatabase) return {};
    return home_.run(Home::Access::read, context_, [&](const Connection &connection) {
      SqlUse row = connection.use("SELECT quota FROM accounts WHERE id = ?");
      if (!row.bind(connection.account).step() || row.isNull(0)) return;
      if (size_ > static_cast<std::uint64_t>(row.integer(0))) {
        Fail(CKErrorCode::quotaExceeded, "The file is larger than the account's quota");
      }
    });
  }

  NSError storeChunks() {
    std::vector<std::uint8_t> buffer;
    buffer.reserve(kLargestChunk + kReadAtOnce);
    std::uint64_t readTo = 0;
    std::uint64_t storedTo = 0;
    if (progress_) progress_(0, size_);
    while (storedTo < size_) {
      while (buffer.size() < kLargestChunk && readTo < size_) {
        const auto count = static_cast<std::size_t>(std::min<std::uint64_t>(kReadAtOnce, size_ - readTo));
        if (NSError error = file_.read(readTo, count, buffer)) return error;
        readTo = storedTo + buffer.size();
      }
      const std::span<const std::uint8_t> window =
          std::span(buffer).first(std::min(buffer.size(), kLargestChunk));
      const std::size_t length = ChunkLength(window);
      if (const int code = store(storedTo, window.first(length)); code != 0) return unstorable(code);
      buffer.erase(buffer.begin(), buffer.begin() + static_cast<std::ptrdiff_t>(length));
      storedTo += length;
      if (progress_) progress_(storedTo, size_);
    }
    return {};
  }

  int store(std::uint64_t start, std::span<const std::uint8_t> chunk) {
    CKDigest name;
    name.update(chunk);
    digest_.update(chunk);
    pieces_.push_back({start, chunk.size(), name.hex()});
    return writer_.add(pieces_.back().chunk, chunk,
                       [this](const std::string &digest) { return isKept(digest); });
  }

  // A manifest is committed after its chunks were made safe. Any error counts as no.
  bool isKept(const std::string &chunk) {
    bool found = false;
    home_.run(Home::Access::read, context_,
              [&](const Connection &connection) { found = NamesChunk(connection, chunk); });
    return found;
  }

  static NSError unstorable(int code) {
    return CKErrorMake(CKErrorCode::serviceUnavailable, "The cloud's folder takes no chunks",
                       NSError::errorWithPOSIXCode(code));
  }

  Home &home_;
  const std::uint64_t size_;
  const CKProgressHandler &progress_;
  const CKCallContext &context_;
  StableFile file_;
  ChunkWriter writer_;
  CKDigest digest_;
  std::vector<Piece> pieces_;
  bool lostChunks_ = false;
};

}  // namespace

CKUploadReply UploadAsset(Home &home, int descriptor, std::uint64_t size, const CKProgressHandler &progress,
                          const CKCallContext &context) {
  for (int i = 0; i < kMostTries; ++i) {
    Upload upload(home, descriptor, size, progress, context);
    CKUploadReply reply = upload.run();
    if (!upload.lostChunks()) return reply;
  }
  return {CKErrorMake(CKErrorCode::serviceUnavailable, "Chunks vanish from the cloud's folder"), {}};
}

}  // namespace droxa::embedded
