#pragma once

#include <memory>
#include <string>
#include <vector>

#include "platform/fileprovider/NSFileProviderItem.h"
#include "platform/foundation/NSError.h"
#include "platform/foundation/NSURL.h"
#include "tessaly/QVFileObjectID.h"

namespace droxa {

class QVContainer;

// The state of one synced item, as the daemon told it; a dead one stands for an item that is no more.
// Thread contract: immutable.
class QVQueryItem final : public NSFileProviderItem {
 public:
  // `fields.itemIdentifier` must be what `fileObjectID.asString()` gives.
  QVQueryItem(QVFileObjectID fileObjectID, NSFileProviderItemFields fields, bool isDead = false);

  const NSFileProviderItemFields &fields() const override { return fields_; }
  const QVFileObjectID &fileObjectID() const { return fileObjectID_; }
  bool isDead() const { return isDead_; }
  std::string description() const override;  // "<d12 n:\"name\" s:123>"; a dead one "<d12 dead>"

  // The item of a container's documents folder, as the root lists it; null for a null or unknown container.
  // Asks the daemon; `forceScan` makes it look at the folder first. Blocks.
  static std::shared_ptr<const QVQueryItem> containerItemForContainer(
      const std::shared_ptr<const QVContainer> &container, bool forceScan);
  // The item at `url`. `andFakeFSEvent` asks the daemon to act as if a file-system event had been seen there.
  // Null with `error` (may be null) set: QVTessalyErrorDomain 14 when there is none, else the connection's
  // error. Blocks.
  static std::shared_ptr<const QVQueryItem> askDaemonQueryItemForURL(const NSURL &url, bool andFakeFSEvent,
                                                                     NSError *error);

 private:
  const QVFileObjectID fileObjectID_;
  const NSFileProviderItemFields fields_;
  const bool isDead_;
};

using QVQueryItems = std::vector<std::shared_ptr<const QVQueryItem>>;

}  // namespace droxa
