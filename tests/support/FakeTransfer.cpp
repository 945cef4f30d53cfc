#include "tests/support/FakeTransfer.h"

#include <utility>

#include "tests/support/FakeDaemon.h"

namespace droxa {

FakeTransfer::FakeTransfer(std::uint64_t index, std::weak_ptr<FakeDaemon> daemon,
                           std::shared_ptr<CallLog> log, std::shared_ptr<FakeReplies> replies,
                           std::set<std::uint64_t> documents, std::uint64_t bytes)
    : index_(index),
      daemon_(std::move(daemon)),
      log_(std::move(log)),
      replies_(std::move(replies)),
      bytes_(bytes),
      documents_(std::move(documents)) {}

// Whoever still waits is told, as when it is cancelled.
FakeTransfer::~FakeTransfer() {
  std::vector<QVContentsErrorReply> waiting;
  const std::set<std::uint64_t> given = abandon(&waiting);
  if (given.empty()) return;
  log("released");
  if (const auto daemon = daemon_.lock()) daemon->releaseInterest(index_, given);
  give(std::move(waiting), qvc_error(QVErrorCancelled, "nobody wants the transfer any more"));
}

void FakeTransfer::log(const std::string &call) {
  log_->add("transfer " + std::to_string(index_) + ": " + call);
}

void FakeTransfer::give(std::vector<QVContentsErrorReply> replies, const NSError &error) {
  for (QVContentsErrorReply &reply : replies)
    replies_->give("waitWithReply", [reply = std::move(reply), error] { reply(error); });
}

void FakeTransfer::waitWithReply(QVContentsErrorReply reply) {
  log("waitWithReply");
  NSError error = replies_->takeFailure("waitWithReply");
  if (!error) {
    const Lock lock(mutex_);
    if (!documents_.empty()) {
      waiting_.push_back(std::move(reply));
      return;
    }
    error = error_;
  }
  give({std::move(reply)}, error);
}

void FakeTransfer::getProgress(QVProgressReply reply) {
  log("getProgress");
  std::set<std::uint64_t> documents;
  {
    const Lock lock(mutex_);
    documents = documents_;
  }
  const auto daemon = daemon_.lock();
  const std::uint64_t left = daemon ? daemon->bytesLeft(documents) : 0;
  replies_->give("getProgress",
                 [reply = std::move(reply), done = bytes_ - left, bytes = bytes_] { reply(done, bytes); });
}

std::set<std::uint64_t> FakeTransfer::abandon(std::vector<QVContentsErrorReply> *waiting) {
  const Lock lock(mutex_);
  waiting->swap(waiting_);
  if (!documents_.empty()) error_ = qvc_error(QVErrorCancelled, "the transfer was cancelled");
  return std::exchange(documents_, {});
}

void FakeTransfer::cancel() {
  log("cancel");
  std::vector<QVContentsErrorReply> waiting;
  const std::set<std::uint64_t> given = abandon(&waiting);
  if (given.empty()) return;
  if (const auto daemon = daemon_.lock()) daemon->releaseInterest(index_, given);
  give(std::move(waiting), qvc_error(QVErrorCancelled, "the transfer was cancelled"));
}

std::shared_ptr<QVTransferring> FakeTransfer::remoteObjectProxyWithErrorHandler(
    NSXPCErrorHandler /*handler*/) {
  return shared_from_this();
}

void FakeTransfer::documentEnded(std::uint64_t document, const NSError &error) {
  std::vector<QVContentsErrorReply> waiting;
  NSError outcome;
  {
    const Lock lock(mutex_);
    if (documents_.erase(document) == 0) return;
    if (!error_) error_ = error;
    if (!documents_.empty()) return;
    waiting.swap(waiting_);
    outcome = error_;
  }
  give(std::move(waiting), outcome);
}

}  // namespace droxa
