#pragma once

#include <cstdint>
#include <memory>

#include "platform/cloudkit/CKCloud.h"
#include "platform/cloudkit/CKOperation.h"

namespace droxa {

// Whose zones a database holds: the account's own, or those of others in which something is shared with it.
enum class CKDatabaseScope : std::uint8_t { privateDatabase, sharedDatabase };

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

  CKDatabaseScope databaseScope() const { return scope_; }

  // For calls that are not retried: zones, the account, subscriptions.
  const std::shared_ptr<CKCloud> &cloud() const { return cloud_; }

 private:
  const std::shared_ptr<CKCloud> cloud_;
  const CKDatabaseScope scope_;
  NSOperationQueue queue_;
};

// Adds the operation, waits until it has finished, and answers its error(). Not on a thread that the
// operation's own blocks need.
NSError CKRunOperation(CKDatabase &database, const std::shared_ptr<CKOperation> &operation);

}  // namespace droxa
