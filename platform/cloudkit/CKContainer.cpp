#include "platform/cloudkit/CKContainer.h"

namespace droxa {

CKContainer::CKContainer(std::string containerIdentifier, const std::shared_ptr<CKCloud> &privateCloud)
    : identifier_(std::move(containerIdentifier)),
      private_(std::make_shared<CKDatabase>(privateCloud)),
      shared_(std::make_shared<CKDatabase>(privateCloud->sharedDatabase(), CKDatabaseScope::sharedDatabase)) {
}

}  // namespace droxa
