#include "platform/fileprovider/FPURLOperations.h"

#include <utility>

#include "platform/foundation/ThreadSafety.h"

namespace droxa {
namespace {

struct Shared {
  Mutex mutex;
  std::shared_ptr<FPURLOperations> operations GUARDED_BY(mutex);
};

Shared &SharedOperations() {
  static Shared shared;
  return shared;
}

}  // namespace

std::shared_ptr<FPURLOperations> FPURLOperations::shared() {
  Shared &shared = SharedOperations();
  const Lock lock(shared.mutex);
  if (!shared.operations) shared.operations = FPMakeURLOperations();
  return shared.operations;
}

void FPURLOperations::setSharedForTesting(std::shared_ptr<FPURLOperations> operations) {
  Shared &shared = SharedOperations();
  const Lock lock(shared.mutex);
  shared.operations.swap(operations);
}

void fp_importUnderFolder(const NSURL &source, const NSURL &folder, FPURLCompletion completion) {
  FPURLOperations::shared()->importUnderFolder(source, folder, std::move(completion));
}

void fp_createSubFolder(const NSURL &parent, const std::string &name, FPURLCompletion completion) {
  FPURLOperations::shared()->createSubFolder(parent, name, std::move(completion));
}

void fp_renameWithNewName(const NSURL &url, const std::string &name, FPURLCompletion completion) {
  FPURLOperations::shared()->renameWithNewName(url, name, std::move(completion));
}

void fp_reparentUnderFolder_withNewName(const NSURL &url, const NSURL &folder,
                                        const std::optional<std::string> &newName,
                                        FPURLCompletion completion) {
  FPURLOperations::shared()->reparentUnderFolder_withNewName(url, folder, newName, std::move(completion));
}

void fp_reparentUnderFolder_allowBouncing(const NSURL &url, const NSURL &folder, bool allowBouncing,
                                          FPURLCompletion completion) {
  FPURLOperations::shared()->reparentUnderFolder_allowBouncing(url, folder, allowBouncing,
                                                               std::move(completion));
}

void fp_deleteWithCompletionHandler(const NSURL &url, FPErrorCompletion completion) {
  FPURLOperations::shared()->deleteWithCompletionHandler(url, std::move(completion));
}

void fp_coordinatedDeleteWithHandler(const NSURL &url, const FPURLCompletion &handler) {
  FPURLOperations::shared()->coordinatedDeleteWithHandler(url, handler);
}

}  // namespace droxa
