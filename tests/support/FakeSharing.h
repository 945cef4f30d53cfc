#pragma once

#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVFileObjectID.h"
#include "tessaly/QVShareOperationProtocol.h"

namespace droxa {

// What the fake daemon answers the sharing operations with, and the operations that came with their calls.
// Thread contract: any thread.
class FakeSharing {
 public:
  struct Answers {
    std::optional<CKShare> share;
    NSURL url;
    NSData data;
    std::optional<std::string> first, second, third;
    std::optional<NSPersonNameComponents> name;
    QVShareParticipants participants;
    std::shared_ptr<const FPSandboxingURLWrapper> urlWrapper;
    bool isShareable = true;
    NSError notShareable;  // told with false
    bool isShared = false, isSharedByOthers = false, isSharedByItself = false;
    std::optional<std::string> sharedFolderName;
    std::map<QVFileObjectID, CKRecordID> recordIDs;  // those that are asked for are told
  };

  void setAnswers(Answers answers) {
    const Lock lock(mutex_);
    answers_ = std::move(answers);
  }
  Answers answers() const {
    const Lock lock(mutex_);
    return answers_;
  }
  void keepOperation(std::shared_ptr<QVOperationClient> operation) {
    const Lock lock(mutex_);
    operations_.push_back(std::move(operation));
  }
  // The operation of the last call; null when it had none, or there was no call.
  std::shared_ptr<QVOperationClient> lastOperation() const {
    const Lock lock(mutex_);
    return operations_.empty() ? nullptr : operations_.back();
  }
  // The share that the last call with one brought.
  void keepShare(std::optional<CKShare> share) {
    const Lock lock(mutex_);
    share_ = std::move(share);
  }
  std::optional<CKShare> lastShare() const {
    const Lock lock(mutex_);
    return share_;
  }
  void forgetOperations() {
    std::vector<std::shared_ptr<QVOperationClient>> released;
    const Lock lock(mutex_);
    released.swap(operations_);
  }

 private:
  mutable Mutex mutex_;
  Answers answers_ GUARDED_BY(mutex_);
  std::vector<std::shared_ptr<QVOperationClient>> operations_ GUARDED_BY(mutex_);
  std::optional<CKShare> share_ GUARDED_BY(mutex_);
};

}  // namespace droxa
