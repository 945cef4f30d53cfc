// The real actions: on the files of the replica, and through the daemon where a file can't bear them.

#include <cerrno>

#include "tessaly/QVDaemonConnection.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVFileErrors.h"
#include "tessaly/QVItemActions.h"
#include "tessaly/QVItemMetadata.h"
#include "tessaly/QVLog.h"
#include "tessaly/QVPhysicalURL.h"
#include "tessaly/QVTrash.h"

namespace droxa {

namespace {

NSError askDaemon(const NSURL &url, const QVItemMetadataChange &change) {
  const auto daemon = QVDaemonConnection::defaultConnection()->newSyncProxy();
  (*daemon)->setMetadataAtURL(url, change,
                              [&daemon](const NSError &error) { daemon->setObjResult({}, error); });
  return daemon->error();
}

// A link, or a file system without attributes: the daemon keeps it. A document that isn't on the disk may
// have a promise there.
NSError noteOnItem(const NSURL &url, const QVItemMetadataChange &change) {
  if (!url.isFileURL()) return qvc_error(QVErrorInvalidArgument, "there is no file to note anything on");
  const int error = QVWriteItemAttributes(url.path(), change);
  if (error == 0) return NSError();
  if (error == ENOTSUP || error == ENOENT) return askDaemon(url, change);
  return QVFileError(error, url.path(), "can't write its extended attributes");
}

// Thread contract: stateless.
class FileActions final : public QVItemActions {
 public:
  bool trashItemAtURL(const NSURL &url, NSURL *resultingURL, NSError *error) override {
    NSURL trashed;
    const NSError problem = QVMoveToTrash(url, &trashed);
    if (resultingURL) *resultingURL = trashed;
    if (problem && error) *error = problem;
    return !problem;
  }
  NSURL putBackURLForTrashedItemAtURL(const NSURL &url, NSError *error) override {
    return QVPutBackURL(url, error);
  }
  NSURL physicalURL(const NSURL &url) override { return QVPhysicalURL(url); }

  void setLastOpenDate(const NSDate &date, const NSURL &url) override {
    const NSError error = noteOnItem(url, {{}, date.nanosecondsSince1970(), {}});
    if (error) os_log_error(qvc_default_log(), "[ERROR] can't note when %@ was last used: %@", url, error);
  }
  void setFavoriteRank(const std::optional<std::uint64_t> &rank, const NSURL &url) override {
    const NSError error = noteOnItem(url, {{}, {}, rank.value_or(0)});
    if (error) os_log_error(qvc_default_log(), "[ERROR] can't note the favorite rank of %@: %@", url, error);
  }
  bool setTagNames(const NSURL &url, const std::vector<std::string> &names, NSError *error) override {
    std::vector<std::string> kept = names;
    NSError problem = QVNormalizeTagNames(&kept);
    if (!problem) problem = noteOnItem(url, {std::move(kept), {}, {}});
    if (problem && error) *error = problem;
    return !problem;
  }
};

}  // namespace

std::shared_ptr<QVItemActions> QVMakeItemActions() {
  return std::make_shared<FileActions>();
}

}  // namespace droxa
