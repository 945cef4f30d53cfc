#pragma once

#include <cstdint>
#include <memory>
#include <set>
#include <string>
#include <vector>

#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVProtocol.h"
#include "tests/support/CallLog.h"
#include "tests/support/FakeReplies.h"

namespace droxa {

class FakeDaemon;

// An interest in downloads of the fake daemon. It writes what it is asked into the daemon's log ("transfer 1:
// waitWithReply", and "transfer 1: released" when it goes before its end), and ends when each of its
// documents has come or failed. Thread contract: any thread; replies are given where the daemon's answers
// run.
class FakeTransfer final : public QVTransfer, public std::enable_shared_from_this<FakeTransfer> {
 public:
  // `documents`: those still to come, by their numbers in the drive; they are `bytes` large.
  FakeTransfer(std::uint64_t index, std::weak_ptr<FakeDaemon> daemon, std::shared_ptr<CallLog> log,
               std::shared_ptr<FakeReplies> replies, std::set<std::uint64_t> documents, std::uint64_t bytes);
  ~FakeTransfer() override;

  void waitWithReply(QVContentsErrorReply reply) override;
  void getProgress(QVProgressReply reply) override;
  void cancel() override;
  std::shared_ptr<QVTransferring> remoteObjectProxyWithErrorHandler(NSXPCErrorHandler handler) override;

  // For the daemon.
  void documentEnded(std::uint64_t document, const NSError &error);

 private:
  void log(const std::string &call);
  void give(std::vector<QVContentsErrorReply> replies, const NSError &error);
  // Ends it and gives the documents that were still to come.
  std::set<std::uint64_t> abandon(std::vector<QVContentsErrorReply> *waiting);

  const std::uint64_t index_;
  const std::weak_ptr<FakeDaemon> daemon_;
  const std::shared_ptr<CallLog> log_;
  const std::shared_ptr<FakeReplies> replies_;
  const std::uint64_t bytes_;
  mutable Mutex mutex_;
  std::set<std::uint64_t> documents_ GUARDED_BY(mutex_);
  std::vector<QVContentsErrorReply> waiting_ GUARDED_BY(mutex_);
  NSError error_ GUARDED_BY(mutex_);
};

}  // namespace droxa
