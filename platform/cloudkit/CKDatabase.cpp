#include "platform/cloudkit/CKDatabase.h"

#include "platform/oslog/os_log.h"

namespace droxa {

CKDatabase::CKDatabase(std::shared_ptr<CKCloud> cloud, CKDatabaseScope scope)
    : cloud_(std::move(cloud)), scope_(scope) {}

void CKDatabase::addOperation(const std::shared_ptr<CKOperation> &operation) {
  if (!operation || !operation->attach(cloud_)) {
    os_log_fault(os_log_create("droxa", "cloudkit"), "[CRIT] a database was given %s",
                 operation ? "an operation that was added before" : "no operation");
    return;
  }
  std::string &source = operation->configuration.sourceApplicationBundleIdentifier;
  if (source.empty()) {
    const Lock lock(mutex_);
    source = sourceApplicationBundleIdentifier_;
  }
  queue_.addOperation(operation);
}

void CKDatabase::setSourceApplicationBundleIdentifier(const std::string &bundleIdentifier) {
  const Lock lock(mutex_);
  sourceApplicationBundleIdentifier_ = bundleIdentifier;
}

void CKDatabase::cancelAllOperations() {
  queue_.cancelAllOperations();
}

void CKDatabase::waitUntilAllOperationsAreFinished() {
  queue_.waitUntilAllOperationsAreFinished();
}

NSError CKRunOperation(CKDatabase &database, const std::shared_ptr<CKOperation> &operation) {
  database.addOperation(operation);
  operation->waitUntilFinished();
  return operation->error();
}

}  // namespace droxa
