#pragma once

#include <memory>
#include <string>

#include "platform/cloudkit/CKDatabase.h"

namespace droxa {

// An application's databases in the cloud: the account's own, and the one of what others share with it.
// Thread contract: immutable; every member may be called on any thread.
class CKContainer {
 public:
  CKContainer(std::string containerIdentifier, const std::shared_ptr<CKCloud> &privateCloud);

  const std::string &containerIdentifier() const { return identifier_; }
  const std::shared_ptr<CKDatabase> &privateCloudDatabase() const { return private_; }
  const std::shared_ptr<CKDatabase> &sharedCloudDatabase() const { return shared_; }

 private:
  const std::string identifier_;
  const std::shared_ptr<CKDatabase> private_;
  const std::shared_ptr<CKDatabase> shared_;
};

}  // namespace droxa
