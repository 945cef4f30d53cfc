#include "tessaly/QVUbiquitousItems.h"

#include <array>
#include <cerrno>
#include <memory>
#include <string_view>
#include <sys/stat.h>
#include <sys/xattr.h>

#include "platform/foundation/NSFileManager.h"
#include "platform/foundation/Paths.h"
#include "tessaly/NSURL+Tessaly.h"
#include "tessaly/QVDaemonConnection.h"
#include "tessaly/QVLog.h"
#include "tessaly/QVPhysicalURL.h"
#include "tessaly/QVQueryItem.h"

namespace droxa {

namespace {

constexpr char kDocumentAttribute[] = "user.droxa.document";
constexpr std::size_t kLongestAttribute = 1024;

class DaemonItems final : public NSUbiquitousItemProviding {
 public:
  // A document's refusal is the call's error; what was refused below a folder stays, which is no failure.
  NSError evictItemAtURL(const NSURL &url) override {
    const auto daemon = QVDaemonConnection::defaultConnection()->newSyncProxy();
    (*daemon)->evictItemAtURL(url, [&](const QVContentsResult & /*result*/, const NSError &error) {
      daemon->setObjResult({}, error);
    });
    return daemon->error();
  }
  bool isDataless(const NSURL &url) override { return qv_isDataless(url); }

  bool isShared(const NSURL &url, bool *value, NSError *error) override {
    const auto item = QVQueryItem::askDaemonQueryItemForURL(url, false, error);
    if (item) *value = item->fields().isShared;
    return item != nullptr;
  }

  // Beside the daemon's own temporaries: nothing there is shown to anybody, and the daemon clears it away.
  NSURL itemReplacementDirectoryForURL(const NSURL &url) override {
    if (!qv_isInSyncedLocation(url)) return NSURL();
    const NSURL storage = NSURL::fileURLWithPath(DroxaProcessHome().replica() + "/" + QVPrivateStorageName);
    const NSURL folder = storage.URLByAppendingPathComponent(QVActionsFolderName);
    for (const NSURL &one : {storage, folder})
      if (::mkdir(one.path().c_str(), 0700) != 0 && errno != EEXIST) return NSURL();
    return folder;
  }
  NSURL physicalURLForURL(const NSURL &url) override { return QVPhysicalURL(url); }
  // A promise can't be given the name of a document whose promise would need a shortened name: its text tells
  // the name then. The name that is given is too long for any file, so that the renaming fails.
  NSURL physicalURLForName(const NSURL &folder, const std::string &name) override {
    constexpr std::size_t kTooLong = 256;
    return folder.URLByAppendingPathComponent(
        QVPromiseNameForName(name).value_or(std::string(kTooLong, '.') + "droxafault"));
  }

  // Where it can't be told, the deletion is one like any other.
  void willDeleteItemAtURL(const NSURL &url) override {
    const auto daemon = QVDaemonConnection::defaultConnection()->newSyncProxy();
    (*daemon)->allowDeletionAtURL(url, [&](const NSError &error) { daemon->setObjResult({}, error); });
    if (const NSError error = daemon->error())
      os_log_error(qvc_default_log(), "[ERROR] the deletion of %s can't be announced: %@", url.path(), error);
  }
};

}  // namespace

bool qv_isDataless(const NSURL &url) {
  if (!url.isFileURL()) return false;
  std::array<char, kLongestAttribute> bytes{};
  const ssize_t length = lgetxattr(url.path().c_str(), kDocumentAttribute, bytes.data(), bytes.size());
  if (length <= 0) return false;
  const std::string_view marker(bytes.data(), static_cast<std::size_t>(length));
  const std::string_view state = marker.substr(0, 4);
  return state == "1 d " || state == "1 e ";
}

void QVInstallUbiquitousItemProvider() {
  static const auto &provider = *new std::shared_ptr<NSUbiquitousItemProviding>(new DaemonItems);
  NSFileManager::defaultManager()->setUbiquitousItemProvider(provider);
}

}  // namespace droxa
