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
};

// Answers clients about contents, from the sync's engine. Thread contract: any thread; what takes time is
// done on the pool.
class ContentsService final : public QVContentsProtocol,
                              public std::enable_shared_from_this<ContentsService> {
 public:
  ContentsService(ContentsServiceHost host, std::shared_ptr<SyncEngine> engine)
      : host_(std::move(host)), engine_(std::move(engine)) {}

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
  QVContentsStatus statusOf(const ItemRecord &document);
  QVContentsStatus statusBelow(const ItemRecord &folder);
  NSError evict(const ItemRecord &document, std::uint64_t *bytes);
  bool cloudHasContents(const FileLocation &location, const SyncRow &row, const DocumentLook &look);
  QVMove describeMove(const ItemRecord &item, const NSURL &destination, const std::string &targetFolder);

  const ContentsServiceHost host_;
  const std::shared_ptr<SyncEngine> engine_;
};

}  // namespace droxa::keld
