#include "thumbnails/QVUbiquitousCloudKitContainer.h"

#include <memory>
#include <optional>

#include "platform/cloudkit/CKContainer.h"
#include "platform/cloudkit/EmbeddedCloud.h"
#include "tessaly/QVHomeCloud.h"
#include "tessaly/QVUbiquitousCloudKitContainer.h"

namespace droxa {
namespace {

// The drive's cloud while the home names the same one. Thread contract: one thread at a time, as openings
// are called.
class DriveCloud {
 public:
  std::shared_ptr<CKCloud> open(NSError *error) {
    const DroxaHome &home = DroxaProcessHome();
    NSError unreadable;
    const auto remembered = QVHomeCloudRead(home, &unreadable);
    if (unreadable) {
      *error = unreadable;
      return nullptr;
    }
    const QVHomeCloud where = QVHomeCloudWithDefaults(home, remembered.value_or(QVHomeCloud()));
    if (cloud_ && where == where_) return cloud_;
    cloud_ = EmbeddedCloud::openExisting(where.folder, where.account, where.device, error);
    where_ = where;
    return cloud_;
  }

 private:
  std::shared_ptr<CKCloud> cloud_;
  QVHomeCloud where_;
};

}  // namespace

void QVRegisterUbiquitousCloudKitContainer() {
  const auto drive = std::make_shared<DriveCloud>();
  CKContainer::registerContainer(QVUbiquitousCloudKitContainerIdentifier,
                                 [drive](NSError *error) { return drive->open(error); });
}

}  // namespace droxa
