#include "tests/support/FakeReplies.h"

#include <gtest/gtest.h>
#include <utility>

namespace droxa {

namespace {

NSError takeFirst(std::map<std::string, std::deque<NSError>> &errors, const std::string &operation) {
  const auto found = errors.find(operation);
  if (found == errors.end() || found->second.empty()) return NSError();
  NSError error = found->second.front();
  found->second.pop_front();
  return error;
}

}  // namespace

FakeReplies::FakeReplies() : queue_(dispatch_queue_create("fake-daemon", DISPATCH_QUEUE_SERIAL)) {}

// A misspelt operation would make a test pass for the wrong reason.
void FakeReplies::checkName(const std::string &operation) {
  // Never destroyed: replies are given by threads that outlive the process's end.
  static const std::set<std::string> &known = *new std::set<std::string>{
      "enumerateItemsInFolder",
      "enumerateAllFoldersWithSortOrder",
      "currentNotifRankWithReply",
      "enumerateWorkingSetChangesFromChangeToken",
      "getItemUpdateSenderWithReceiver",
      "getURLForItemIdentifier",
      "getURLForFileObjectID",
      "getQueryItemForURL",
      "getContainerItem",
      "getContainers",
      "setMetadataAtURL",
      "subscribeToNotifications",
      "getAccount",
      "signIn",
      "signOut",
      "getStatus",
      "startOperation_toCopySharingInfoAtURL",
      "startOperation_toCopyShareURLForShare",
      "startOperation_toSaveSharingInfo",
      "createSharingInfoForURL",
      "startOperation_toUnshareShare",
      "startOperation_toModifyRecordAccessAtURL",
      "startOperation_toCopyParticipantTokenAtURL",
      "startOperation_toPrepFolderForSharingAt",
      "copyCurrentUserNameAndDisplayHandleWithReply",
      "startOperation_toProcessSubitemsAtURL",
      "startOperation_toLookupShareParticipants",
      "startOperation_toCopyDocumentURLForRecordID",
      "checkIfItemIsShareableWithInode",
      "getShareOptionsOfItemIdentifier",
      "refreshSharingStateForItemIdentifier",
      "acceptShareWithURL",
      "resolveFileObjectIDsToContentRecordIDs",
      "getContainerURLForID",
      "boostPriority",
      "watchItemAtURL",
      "invalidate",
      "startDownloadAtURL",
      "evictItemAtURL",
      "setPinnedAtURL",
      "getContentsStatusAtURL",
      "getTransferStatus",
      "waitForUploadAtURL",
      "getMoveCapability",
      "allowDeletionAtURL",
      "confirmDeletions",
      "waitWithReply",
      "getProgress",
      "cancel",
      "download",  // the end of a document's download
  };
  if (known.count(operation) == 0) ADD_FAILURE() << "the daemon has no operation " << operation;
}

void FakeReplies::answerOnAnotherThread(bool on) {
  const Lock lock(mutex_);
  elsewhere_ = on;
}

void FakeReplies::failNext(const std::string &operation, NSError error) {
  checkName(operation);
  const Lock lock(mutex_);
  failures_[operation].push_back(std::move(error));
}

NSError FakeReplies::takeFailure(const std::string &operation) {
  const Lock lock(mutex_);
  return takeFirst(failures_, operation);
}

void FakeReplies::failNextInTransport(const std::string &operation, NSError error) {
  checkName(operation);
  const Lock lock(mutex_);
  transportFailures_[operation].push_back(std::move(error));
}

NSError FakeReplies::takeTransportFailure(const std::string &operation) {
  const Lock lock(mutex_);
  return takeFirst(transportFailures_, operation);
}

void FakeReplies::hold(const std::string &operation) {
  checkName(operation);
  const Lock lock(mutex_);
  held_[operation];
}

void FakeReplies::release(const std::string &operation) {
  checkName(operation);
  std::vector<std::function<void()>> answers;
  {
    const Lock lock(mutex_);
    answers.swap(held_[operation]);
    held_.erase(operation);
  }
  for (std::function<void()> &answer : answers) run(std::move(answer));
}

std::size_t FakeReplies::heldCount(const std::string &operation) const {
  const Lock lock(mutex_);
  const auto found = held_.find(operation);
  return found == held_.end() ? 0 : found->second.size();
}

void FakeReplies::dropHeld() {
  std::map<std::string, std::vector<std::function<void()>>> dropped;
  const Lock lock(mutex_);
  dropped.swap(held_);
}

void FakeReplies::give(const std::string &operation, std::function<void()> answer) {
  checkName(operation);
  {
    const Lock lock(mutex_);
    const auto found = held_.find(operation);
    if (found != held_.end()) {
      found->second.push_back(std::move(answer));
      return;
    }
  }
  run(std::move(answer));
}

void FakeReplies::run(std::function<void()> block) {
  bool elsewhere = false;
  {
    const Lock lock(mutex_);
    elsewhere = elsewhere_;
  }
  if (elsewhere)
    dispatch_async(queue_, std::move(block));
  else
    block();
}

}  // namespace droxa
