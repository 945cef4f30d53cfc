#pragma once

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "keld/sync/SyncEngine.h"
#include "tessaly/QVContents.h"
#include "tessaly/QVMoveCapability.h"

namespace droxa::keld {

// What the service asks of the daemon around it.
struct ContentsServiceHost {
  std::string replicaPath;
  std::function<Keeper &()> keeper;
  ReplicaFiles::Read read;
  std::function<std::optional<std::string>(const NSURL &url)> pathBelowReplica;
  std::function<bool()> isSignedIn;
  // Of what others share.
  std::function<std::vector<std::shared_ptr<SyncEngine>>()> sharedEngines;
  std::function<std::shared_ptr<SyncEngine>(const ItemRecord &item)> engineOf;  // of the item's scope
};

// Answers clients about contents, each from the engine of the scope that the item is in. Thread contract: any
// thread; what takes time is done on the pool.
class ContentsService final : public QVContentsProtocol,
                              public std::enable_shared_from_this<ContentsService> {
 public:
  ContentsService(ContentsServiceHost host, std::shared_ptr<SyncEngine> drive)
      : host_(std::move(host)), drive_(std::move(drive)) {}

  void startDownloadAtURL(const NSURL &url, std::uint64_t options, QVTransferReply reply) override;
  void evictItemAtURL(const NSURL &url, QVContentsResultReply reply) override;
  void setPinnedAtURL(const NSURL &url, bool isPinned, QVContentsErrorReply reply) override;
  void getContentsStatusAtURL(const NSURL &url, QVContentsStatusReply reply) override;
  void getTransferStatus(QVTransferStatusReply reply) override;
  void waitForUploadAtURL(const NSURL &url, QVContentsErrorReply reply) override;
  void getMoveCapability(const NSURL &source, const NSURL &destination, QVMoveCapabilityReply reply) override;
  void allowDeletionAtURL(const NSURL &url, QVContentsErrorReply reply) override;
  void confirmDeletions(bool carryOut, QVContentsErrorReply reply) override;

 private:
  // All that is below one folder is of one scope.
  std::shared_ptr<SyncEngine> engineOf(const ItemRecord &item) const { return host_.engineOf(item); }
  std::vector<std::shared_ptr<SyncEngine>> engines();  // the drive's first
  using Found = std::function<void(const ItemRecord *item, const NSError &error)>;
  // Finds the item at the URL, looking on disk where it isn't known. `found` comes once, on any thread.
  void find(const NSURL &url, Found found);
  void startDownload(const NSURL &url, std::uint64_t options, QVTransferReply reply);
  std::optional<ItemRecord> known(const std::string &path, NSError *error);
  // Calls `each` with what is below the folder, and with nothing for another item.
  void forEachBelow(const ItemRecord &item, const std::function<void(ItemRecord &child)> &each);
  // The item, or everything below it, that `wanted` says yes to.
  std::vector<ItemRecord> documentsBelow(const ItemRecord &item,
                                         const std::function<bool(const ItemRecord &)> &wanted);
  QVContentsStatus statusOf(SyncEngine &engine, const ItemRecord &document);
  QVContentsStatus statusBelow(const ItemRecord &folder);
  static NSError evict(SyncEngine &engine, const ItemRecord &document, std::uint64_t *bytes);
  static bool cloudHasContents(const FileLocation &location, const SyncRow &row, const DocumentLook &look);
  bool isReadOnlyFolder(const std::string &path);
  QVMove describeMove(const ItemRecord &item, const NSURL &destination, const std::string &targetFolder);

  const ContentsServiceHost host_;
  const std::shared_ptr<SyncEngine> drive_;
};

}  // namespace droxa::keld
