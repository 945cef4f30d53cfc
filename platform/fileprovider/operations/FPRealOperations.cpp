#include <cerrno>
#include <exception>
#include <utility>

#include "platform/dispatch/dispatch.h"
#include "platform/fileprovider/FPURLOperations.h"
#include "platform/fileprovider/operations/FPErrors.h"
#include "platform/fileprovider/operations/FPOperations.h"

namespace droxa {
namespace {

// An operation must answer whatever happens in it, also when memory runs out.
template <class Work>
FPOutcome Guarded(const Work &work) {
  try {
    return work();
  } catch (const std::exception &exception) {
    return {{},
            NSError(NSCocoaErrorDomain, NSFileWriteUnknownError,
                    {{NSLocalizedDescriptionKey, exception.what()}})};
  }
}

// Runs an operation on the pool, under the progress that is current here, and answers there.
template <class Work>
void Run(FPURLCompletion completion, Work work) {
  auto run = [completion = std::move(completion), work = std::move(work),
              progress = NSProgress::currentProgress()] {
    const FPOutcome outcome = progress && progress->isCancelled()
                                  ? FPOutcome{{}, FPErrorFromPOSIX(ECANCELED, "the work was not begun")}
                                  : Guarded([&] { return work(progress); });
    if (completion) completion(outcome.error ? NSURL() : outcome.url, outcome.error);
  };
  dispatch_async_global(std::move(run));
}

// Thread contract: has no state; any thread.
class RealOperations final : public FPURLOperations {
 public:
  void importUnderFolder(const NSURL &source, const NSURL &folder, FPURLCompletion completion) override {
    Run(std::move(completion),
        [source, folder](const FPProgress &progress) { return FPImport(source, folder, progress); });
  }
  void createSubFolder(const NSURL &parent, const std::string &name, FPURLCompletion completion) override {
    Run(std::move(completion),
        [parent, name](const FPProgress &progress) { return FPCreateSubFolder(parent, name, progress); });
  }
  void renameWithNewName(const NSURL &url, const std::string &name, FPURLCompletion completion) override {
    Run(std::move(completion),
        [url, name](const FPProgress &progress) { return FPRename(url, name, progress); });
  }
  void reparentUnderFolder_withNewName(const NSURL &url, const NSURL &folder,
                                       const std::optional<std::string> &newName,
                                       FPURLCompletion completion) override {
    Run(std::move(completion), [url, folder, newName](const FPProgress &progress) {
      return FPReparent(url, folder, newName, false, progress);
    });
  }
  void reparentUnderFolder_allowBouncing(const NSURL &url, const NSURL &folder, bool allowBouncing,
                                         FPURLCompletion completion) override {
    Run(std::move(completion), [url, folder, allowBouncing](const FPProgress &progress) {
      return FPReparent(url, folder, std::nullopt, allowBouncing, progress);
    });
  }
  void deleteWithCompletionHandler(const NSURL &url, FPErrorCompletion completion) override {
    Run(
        [completion = std::move(completion)](const NSURL & /*url*/, const NSError &error) {
          if (completion) completion(error);
        },
        [url](const FPProgress &progress) { return FPDelete(url, progress); });
  }
  void coordinatedDeleteWithHandler(const NSURL &url, const FPURLCompletion &handler) override {
    NSError error;
    const FPAccess access = FPAccessForDeletion(url, NSProgress::currentProgress(), &error);
    if (handler) handler(access ? url : NSURL(), access ? NSError() : error);
  }
};

}  // namespace

std::shared_ptr<FPURLOperations> FPMakeURLOperations() {
  return std::make_shared<RealOperations>();
}

}  // namespace droxa
