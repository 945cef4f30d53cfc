#include "tessaly/QVQueryItem.h"

#include <utility>

#include "tessaly/QVContainer.h"
#include "tessaly/QVDaemonConnection.h"
#include "tessaly/QVErrors.h"

namespace droxa {

using QVQueryItemResult = std::shared_ptr<const QVQueryItem>;

QVQueryItem::QVQueryItem(QVFileObjectID fileObjectID, NSFileProviderItemFields fields, bool isDead)
    : fileObjectID_(fileObjectID), fields_(std::move(fields)), isDead_(isDead) {}

std::string QVQueryItem::description() const {
  if (isDead_) return "<" + fileObjectID_.asString() + " dead>";
  return "<" + fileObjectID_.asString() + " n:\"" + fields_.filename +
         "\" s:" + std::to_string(fields_.documentSize) + ">";
}

std::shared_ptr<const QVQueryItem> QVQueryItem::containerItemForContainer(
    const std::shared_ptr<const QVContainer> &container, bool forceScan) {
  if (!container) return nullptr;
  const std::unique_ptr<QVSyncProxy> proxy = QVDaemonConnection::defaultConnection()->newSyncProxy();
  (*proxy)->getContainerItem(
      container->containerID(), forceScan,
      [&proxy](const QVQueryItemResult &item, const NSError &error) { proxy->setObjResult(item, error); });
  return proxy->result<QVQueryItemResult>();
}

std::shared_ptr<const QVQueryItem> QVQueryItem::askDaemonQueryItemForURL(const NSURL &url,
                                                                         bool andFakeFSEvent,
                                                                         NSError *error) {
  if (!url) {
    if (error) *error = qvc_errorNoSuchItem(url.description());
    return nullptr;
  }
  const std::unique_ptr<QVSyncProxy> proxy = QVDaemonConnection::defaultConnection()->newSyncProxy();
  (*proxy)->getQueryItemForURL(url, andFakeFSEvent,
                               [&proxy](const QVQueryItemResult &item, const NSError &problem) {
                                 proxy->setObjResult(item, problem);
                               });
  QVQueryItemResult item = proxy->result<QVQueryItemResult>();
  if (!item && error) *error = proxy->error() ? proxy->error() : qvc_errorNoSuchItem(url.path());
  return item;
}

}  // namespace droxa
