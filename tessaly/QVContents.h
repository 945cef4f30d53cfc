#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/foundation/NSError.h"
#include "platform/foundation/NSURL.h"
#include "platform/xpc/NSXPCProxyCreating.h"

// What the daemon does with documents' contents: fetching them, letting go of them, and getting what was
// changed here safe in the cloud. Every reply is called exactly once, on any thread, unless the connection
// fails first: then the error handler of the proxy is called instead.

namespace droxa {

// Whether a document's contents are on this machine.
enum class QVContentsState : std::uint8_t { present = 0, dataless = 1, downloading = 2 };

// How far a document's newest state is on its way into the cloud.
enum class QVUploadState : std::uint8_t {
  local = 0,   // kept on this machine alone: excluded from sync, or nobody is signed in
  queued = 1,  // changed here; its turn hasn't come
  uploading = 2,
  inCloud = 3,  // the cloud has it, with the same checksum
  failed = 4,   // tried and refused; tried again later
};

// Download options.
inline constexpr std::uint64_t QVDownloadForReader =
    1;  // somebody waits: before everything that nobody waits for
inline constexpr std::uint64_t QVDownloadInBackground = 2;
inline constexpr std::uint64_t QVDownloadForThumbnail = 4;
// What is here isn't good enough while the cloud has something newer: it is asked first.
inline constexpr std::uint64_t QVDownloadCurrentVersion = 8;

// One document, or what lies below one folder taken together.
struct QVContentsStatus {
  QVContentsState contents = QVContentsState::present;  // of a folder: dataless when anything below it is
  QVUploadState upload = QVUploadState::local;          // of a folder: the least safe one below it
  bool isPinned = false;
  std::uint64_t size = 0;         // bytes; of a folder: of everything below it
  std::uint64_t transferred = 0;  // bytes of the transfer under way
  std::string checksum;  // SHA-256 in hexadecimal, of the contents that the cloud has; "" when unknown
  NSError error;         // why the last try failed; nil when it didn't
  // Of a folder alone.
  std::uint64_t documents = 0, dataless = 0, unsent = 0, failed = 0;
  bool operator==(const QVContentsStatus &) const = default;
};

// All transfers of the daemon in one direction.
struct QVTransferCounts {
  std::uint64_t active = 0, queued = 0, done = 0, failed = 0;  // documents; done and failed since the start
  std::uint64_t bytesDone = 0;                                 // since the start
  std::uint64_t bytesLeft = 0;                                 // of what is active or queued
  std::uint64_t bytesPerSecond = 0;                            // over the last seconds
  bool operator==(const QVTransferCounts &) const = default;
};

struct QVTransferStatus {
  QVTransferCounts downloads, uploads;
  std::string cloud;  // where it is, as a person would call it
  bool isCloudReachable = true;
  std::string cloudProblem;         // why it isn't, "" otherwise
  std::uint64_t heldDeletions = 0;  // deletions that wait for confirmDeletions()
  std::uint64_t conflicts = 0;      // conflict copies made since the start
  bool operator==(const QVTransferStatus &) const = default;
};

// What one document of a request was refused for.
struct QVContentsFailure {
  std::string path;  // absolute
  NSError error;
  bool operator==(const QVContentsFailure &) const = default;
};

struct QVContentsResult {
  std::uint64_t documents = 0;  // done
  std::uint64_t bytes = 0;
  std::uint64_t refused = 0;
  std::vector<QVContentsFailure> failures;  // of the first 1,000 refused
  bool operator==(const QVContentsResult &) const = default;
};

using QVContentsErrorReply = std::function<void(const NSError &error)>;
using QVProgressReply = std::function<void(std::uint64_t completedBytes, std::uint64_t totalBytes)>;
using QVContentsStatusReply = std::function<void(const QVContentsStatus &status, const NSError &error)>;
using QVTransferStatusReply = std::function<void(const QVTransferStatus &status, const NSError &error)>;
using QVContentsResultReply = std::function<void(const QVContentsResult &result, const NSError &error)>;
using QVMoveCapabilityReply = std::function<void(std::uint64_t capability, const NSError &error)>;

// Somebody's interest in a transfer. Several interests in one document share one transfer; it is cancelled
// when the last of them is cancelled or released.
class QVTransferring {
 public:
  virtual ~QVTransferring() = default;
  // Replies when the transfer has ended: nil when the contents are present. QVErrorCancelled after cancel().
  virtual void waitWithReply(QVContentsErrorReply reply) = 0;
  virtual void getProgress(QVProgressReply reply) = 0;
  virtual void cancel() = 0;
};

// A transfer as it is received: it makes proxies with an error handler.
class QVTransfer : public QVTransferring, public NSXPCProxyCreating<QVTransferring> {};

using QVTransferReply =
    std::function<void(const std::shared_ptr<QVTransfer> &transfer, const NSError &error)>;

// The part of the daemon's protocol that is about contents. `url` may be a document or a folder, which stands
// for every document below it. Errors: 14 when there is nothing at the URL, 2 when nobody is signed in; those
// of a transfer are told by its end: 34 QVErrorCancelled; 35 QVErrorChecksumMismatch; NSCocoaErrorDomain 4354
// (quota), 4355 (the cloud can't be reached), POSIX errors of the disk (ENOSPC, EROFS, EIO).
class QVContentsProtocol {
 public:
  virtual ~QVContentsProtocol() = default;
  // Starts fetching what isn't here, or joins the transfer under way. A document whose contents are present
  // gives a transfer that has ended.
  virtual void startDownloadAtURL(const NSURL &url, std::uint64_t options, QVTransferReply reply) = 0;
  // Lets go of local contents that the cloud has. A document is refused, and left as it is, with 36
  // QVErrorUnsentChanges, 37 QVErrorDocumentInUse (open for writing, or being read), 38 QVErrorPinned.
  // The error is that of the one document, when `url` is one; a folder's are in the result.
  virtual void evictItemAtURL(const NSURL &url, QVContentsResultReply reply) = 0;
  // A pinned document is never evicted, and is fetched when it isn't here; a folder pins what comes into it.
  virtual void setPinnedAtURL(const NSURL &url, bool isPinned, QVContentsErrorReply reply) = 0;
  virtual void getContentsStatusAtURL(const NSURL &url, QVContentsStatusReply reply) = 0;
  virtual void getTransferStatus(QVTransferStatusReply reply) = 0;
  // Replies when everything at `url` (nil: in the drive) that had changed when it was asked is safe in the
  // cloud, or with why one document can't be.
  virtual void waitForUploadAtURL(const NSURL &url, QVContentsErrorReply reply) = 0;
  // What a move of `source` to `destination` (with its last name) would be: QVMoveCapability bits, or an
  // error when it isn't possible at all.
  virtual void getMoveCapability(const NSURL &source, const NSURL &destination,
                                 QVMoveCapabilityReply reply) = 0;
  // A person asked for the item at `url` to be deleted, with everything below it: those deletions are sent
  // however many they are, and even while others are held. Kept until the items are gone. Errors: 14 alone.
  virtual void allowDeletionAtURL(const NSURL &url, QVContentsErrorReply reply) = 0;
  // Answers a deletion spree that was stopped: carries it out in the cloud, or brings the documents back.
  virtual void confirmDeletions(bool carryOut, QVContentsErrorReply reply) = 0;
};

}  // namespace droxa
