#pragma once

#include <memory>
#include <string>

#include "platform/cloudkit/CKCloud.h"
#include "platform/cloudkit/CKOperation.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// A cloud with the operations that run on it, concurrently, on the process's thread pool. Releasing it
// neither waits for nor cancels its operations.
// Thread contract: every member may be called on any thread.
class CKDatabase {
 public:
  explicit CKDatabase(std::shared_ptr<CKCloud> cloud,
                      CKDatabaseScope scope = CKDatabaseScope::privateDatabase);

  // Runs the operation once; one that was added before is a mistake, which is logged and ignored.
  void addOperation(const std::shared_ptr<CKOperation> &operation);
  void cancelAllOperations();
  void waitUntilAllOperationsAreFinished();

  // For whom operations run that don't say so themselves (CKOperationConfiguration).
  void setSourceApplicationBundleIdentifier(const std::string &bundleIdentifier) EXCLUDES(mutex_);

  CKDatabaseScope databaseScope() const { return scope_; }

  // For calls that are not retried: zones, the account, subscriptions.
  const std::shared_ptr<CKCloud> &cloud() const { return cloud_; }

 private:
  const std::shared_ptr<CKCloud> cloud_;
  const CKDatabaseScope scope_;
  NSOperationQueue queue_;
  Mutex mutex_;
  std::string sourceApplicationBundleIdentifier_ GUARDED_BY(mutex_);
};

// Adds the operation, waits until it has finished, and answers its error(). Not on a thread that the
// operation's own blocks need.
NSError CKRunOperation(CKDatabase &database, const std::shared_ptr<CKOperation> &operation);

}  // namespace droxa
