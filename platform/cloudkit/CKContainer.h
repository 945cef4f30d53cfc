#pragma once

#include <functional>
#include <memory>
#include <string>

#include "platform/cloudkit/CKDatabase.h"

namespace droxa {

// Gives the account's private database of a container; null with `error` (never null) set when it can't be
// reached. Called on any thread, one call at a time for each container; the same cloud twice is the same
// container twice.
using CKContainerOpening = std::function<std::shared_ptr<CKCloud>(NSError *error)>;

// An application's databases in the cloud: the account's own, and the one of what others share with it.
// Thread contract: any thread.
class CKContainer {
 public:
  CKContainer(std::string containerIdentifier, const std::shared_ptr<CKCloud> &privateCloud);

  // The process's container of that name, opened when it is first asked for, and again when that failed. Null
  // with `error` (may be null) set: nothing was registered for it
  // (invalidArguments), or why it couldn't be opened.
  static std::shared_ptr<CKContainer> containerWithIdentifier(const std::string &identifier, NSError *error);
  // How that container is reached from this process; replaces what was registered before, and null forgets
  // it.
  static void registerContainer(const std::string &identifier, CKContainerOpening opening);

  const std::string &containerIdentifier() const { return identifier_; }
  const std::shared_ptr<CKDatabase> &privateCloudDatabase() const { return private_; }
  const std::shared_ptr<CKDatabase> &sharedCloudDatabase() const { return shared_; }

  // For whom operations are that don't say so themselves; those that were added already stay as they are.
  void setSourceApplicationBundleIdentifier(const std::string &bundleIdentifier);

 private:
  const std::string identifier_;
  const std::shared_ptr<CKDatabase> private_;
  const std::shared_ptr<CKDatabase> shared_;
};

}  // namespace droxa
