// The sharing operations: each keeps the operation that came along, is recorded with its arguments, and is
// answered with what the test put into sharing(), next to the failure that the test asked for.

#include <gtest/gtest.h>
#include <utility>

#include "tests/support/FakeDaemon.h"

namespace droxa {
namespace {

template <class Value>
std::string told(const Value &value) {
  if constexpr (std::is_same_v<Value, bool>) {
    return value ? "yes" : "no";
  } else if constexpr (std::is_integral_v<Value>) {
    return std::to_string(value);
  } else {
    return LogDescription(value);
  }
}

template <class... Values>
std::string list(const Values &...values) {
  std::string text;
  ((text += (text.empty() ? "" : ", ") + told(values)), ...);
  return text;
}

}  // namespace

void FakeDaemon::setShared(const std::string &path, bool shared) {
  const Lock lock(mutex_);
  const std::uint64_t number = drive_.numberAtPath(path);
  ASSERT_NE(number, 0U) << "nothing at " << path;
  drive_.contents(number).isShared = shared;
}

void FakeDaemon::startOperation_toCopySharingInfoAtURL(std::shared_ptr<QVOperationClient> op,
                                                       const NSURL &url, QVShareAndURLReply reply) {
  sharing_->keepOperation(std::move(op));
  const NSError error = begin("startOperation_toCopySharingInfoAtURL", list(url));
  const FakeSharing::Answers answers = sharing_->answers();
  replies_->give("startOperation_toCopySharingInfoAtURL",
                 [=, reply = std::move(reply)] { reply(answers.share, answers.url, error); });
}

void FakeDaemon::startOperation_toCopyShareURLForShare(std::shared_ptr<QVOperationClient> op,
                                                       const std::optional<CKShare> &share,
                                                       const std::optional<std::string> &appName,
                                                       QVShareAndURLReply reply) {
  sharing_->keepOperation(std::move(op));
  sharing_->keepShare(share);
  const NSError error = begin("startOperation_toCopyShareURLForShare", list(share, appName));
  const FakeSharing::Answers answers = sharing_->answers();
  replies_->give("startOperation_toCopyShareURLForShare",
                 [=, reply = std::move(reply)] { reply(answers.share, answers.url, error); });
}

void FakeDaemon::startOperation_toSaveSharingInfo(std::shared_ptr<QVOperationClient> op,
                                                  const std::optional<CKShare> &share, QVShareReply reply) {
  sharing_->keepOperation(std::move(op));
  sharing_->keepShare(share);
  const NSError error = begin("startOperation_toSaveSharingInfo", list(share));
  const FakeSharing::Answers answers = sharing_->answers();
  replies_->give("startOperation_toSaveSharingInfo",
                 [=, reply = std::move(reply)] { reply(answers.share, error); });
}

void FakeDaemon::createSharingInfoForURL(const NSURL &url, QVShareReply reply) {
  const NSError error = begin("createSharingInfoForURL", list(url));
  const FakeSharing::Answers answers = sharing_->answers();
  replies_->give("createSharingInfoForURL", [=, reply = std::move(reply)] { reply(answers.share, error); });
}

void FakeDaemon::startOperation_toUnshareShare(std::shared_ptr<QVOperationClient> op,
                                               const std::optional<CKShare> &share, bool forceDelete,
                                               QVShareOutcomeReply reply) {
  sharing_->keepOperation(std::move(op));
  sharing_->keepShare(share);
  const NSError error = begin("startOperation_toUnshareShare", list(share, forceDelete));
  replies_->give("startOperation_toUnshareShare", [=, reply = std::move(reply)] { reply(error); });
}

void FakeDaemon::startOperation_toModifyRecordAccessAtURL(std::shared_ptr<QVOperationClient> op,
                                                          const NSURL &url, bool allowAccess,
                                                          QVRecordAccessReply reply) {
  sharing_->keepOperation(std::move(op));
  const NSError error = begin("startOperation_toModifyRecordAccessAtURL", list(url, allowAccess));
  const FakeSharing::Answers answers = sharing_->answers();
  replies_->give("startOperation_toModifyRecordAccessAtURL",
                 [=, reply = std::move(reply)] { reply(answers.data, answers.first, error); });
}

void FakeDaemon::startOperation_toCopyParticipantTokenAtURL(std::shared_ptr<QVOperationClient> op,
                                                            const NSURL &url, QVParticipantTokenReply reply) {
  sharing_->keepOperation(std::move(op));
  const NSError error = begin("startOperation_toCopyParticipantTokenAtURL", list(url));
  const FakeSharing::Answers answers = sharing_->answers();
  replies_->give("startOperation_toCopyParticipantTokenAtURL",
                 [=, reply = std::move(reply)] { reply(answers.first, answers.second, error); });
}

void FakeDaemon::startOperation_toPrepFolderForSharingAt(std::shared_ptr<QVOperationClient> op,
                                                         const NSURL &url, QVShareOutcomeReply reply) {
  sharing_->keepOperation(std::move(op));
  const NSError error = begin("startOperation_toPrepFolderForSharingAt", list(url));
  replies_->give("startOperation_toPrepFolderForSharingAt", [=, reply = std::move(reply)] { reply(error); });
}

void FakeDaemon::copyCurrentUserNameAndDisplayHandleWithReply(QVCurrentUserReply reply) {
  const NSError error = begin("copyCurrentUserNameAndDisplayHandleWithReply", list());
  const FakeSharing::Answers answers = sharing_->answers();
  replies_->give("copyCurrentUserNameAndDisplayHandleWithReply", [=, reply = std::move(reply)] {
    reply(answers.name, answers.first, answers.second, answers.third, error);
  });
}

void FakeDaemon::startOperation_toProcessSubitemsAtURL(std::shared_ptr<QVOperationClient> op,
                                                       const NSURL &url, std::uint64_t maxSubsharesFailures,
                                                       std::uint64_t processType, QVShareOutcomeReply reply) {
  const NSError error =
      begin("startOperation_toProcessSubitemsAtURL", list(url, maxSubsharesFailures, processType));
  sharing_->keepOperation(std::move(op));
  replies_->give("startOperation_toProcessSubitemsAtURL", [=, reply = std::move(reply)] { reply(error); });
}

void FakeDaemon::startOperation_toLookupShareParticipants(std::shared_ptr<QVOperationClient> op,
                                                          const QVShareParticipants &participants,
                                                          QVParticipantsReply reply) {
  sharing_->keepOperation(std::move(op));
  const NSError error = begin("startOperation_toLookupShareParticipants", list(participants));
  const FakeSharing::Answers answers = sharing_->answers();
  replies_->give("startOperation_toLookupShareParticipants",
                 [=, reply = std::move(reply)] { reply(answers.participants, error); });
}

void FakeDaemon::startOperation_toCopyDocumentURLForRecordID(std::shared_ptr<QVOperationClient> op,
                                                             const std::optional<CKRecordID> &recordID,
                                                             bool syncIfNeeded, QVSandboxingURLReply reply) {
  sharing_->keepOperation(std::move(op));
  const NSError error = begin("startOperation_toCopyDocumentURLForRecordID", list(recordID, syncIfNeeded));
  const FakeSharing::Answers answers = sharing_->answers();
  replies_->give("startOperation_toCopyDocumentURLForRecordID",
                 [=, reply = std::move(reply)] { reply(answers.urlWrapper, error); });
}

void FakeDaemon::checkIfItemIsShareableWithInode(std::uint64_t inode, QVBoolReply reply) {
  NSError error = begin("checkIfItemIsShareableWithInode", list(inode));
  const FakeSharing::Answers answers = sharing_->answers();
  const bool isShareable = !error && answers.isShareable;
  if (!error && !isShareable) error = answers.notShareable;
  replies_->give("checkIfItemIsShareableWithInode",
                 [=, reply = std::move(reply)] { reply(isShareable, error); });
}

void FakeDaemon::getShareOptionsOfItemIdentifier(const std::string &identifier, QVShareOptionsReply reply) {
  const NSError error = begin("getShareOptionsOfItemIdentifier", identifier);
  const FakeSharing::Answers answers = error ? FakeSharing::Answers() : sharing_->answers();
  replies_->give("getShareOptionsOfItemIdentifier", [=, reply = std::move(reply)] {
    reply(answers.isShared, answers.isSharedByOthers, answers.isSharedByItself, answers.sharedFolderName,
          error);
  });
}

void FakeDaemon::refreshSharingStateForItemIdentifier(const std::string &identifier, QVErrorReply reply) {
  const NSError error = begin("refreshSharingStateForItemIdentifier", identifier);
  replies_->give("refreshSharingStateForItemIdentifier", [=, reply = std::move(reply)] { reply(error); });
}

void FakeDaemon::acceptShareWithURL(const NSURL &shareURL, QVURLReply reply) {
  const NSError error = begin("acceptShareWithURL", list(shareURL));
  const NSURL url = error ? NSURL() : sharing_->answers().url;
  replies_->give("acceptShareWithURL", [=, reply = std::move(reply)] { reply(url, error); });
}

void FakeDaemon::resolveFileObjectIDsToContentRecordIDs(const std::vector<QVFileObjectID> &identifiers,
                                                        QVRecordIDsReply reply) {
  std::string asked;
  for (const QVFileObjectID &identifier : identifiers)
    asked += (asked.empty() ? "" : ", ") + identifier.asString();
  const NSError error = begin("resolveFileObjectIDsToContentRecordIDs", asked);
  std::map<QVFileObjectID, CKRecordID> found;
  const FakeSharing::Answers answers = sharing_->answers();
  for (const QVFileObjectID &identifier : identifiers) {
    const auto known = answers.recordIDs.find(identifier);
    if (!error && known != answers.recordIDs.end()) found.insert(*known);
  }
  replies_->give("resolveFileObjectIDsToContentRecordIDs",
                 [=, reply = std::move(reply)] { reply(found, error); });
}

void FakeDaemon::getContainerURLForID(const std::string &containerID, bool recreateDocumentsIfNeeded,
                                      QVURLReply reply) {
  NSError error =
      begin("getContainerURLForID", containerID + ", recreate " + (recreateDocumentsIfNeeded ? "1" : "0"));
  NSURL url;
  {
    const Lock lock(mutex_);
    for (const QVContainerDescription &container : drive_.containers())
      if (container.containerID == containerID) url = container.documentsURL;
    if (!error && !url) error = qvc_errorNoSuchItem(containerID);
    if (error) url = NSURL();
  }
  replies_->give("getContainerURLForID", [=, reply = std::move(reply)] { reply(url, error); });
}

}  // namespace droxa
