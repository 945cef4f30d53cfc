#include "platform/cloudkit/CKContainer.h"

#include "platform/cloudkit/CKEmptyCloud.h"

namespace droxa {

CKContainer::CKContainer(std::string containerIdentifier, std::shared_ptr<CKCloud> privateCloud)
    : identifier_(std::move(containerIdentifier)),
      private_(std::make_shared<CKDatabase>(privateCloud)),
      shared_(std::make_shared<CKDatabase>(CKEmptyCloudBeside(std::move(privateCloud)),
                                           CKDatabaseScope::sharedDatabase)) {}

}  // namespace droxa
