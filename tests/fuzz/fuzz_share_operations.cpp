// A client's bytes, sent to a connection that exports the sharing operations: whatever they are, the
// connection ends when the client has closed, and the process goes on. The input's first byte says how much
// of a real client's bytes comes before the rest of the input.

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <cstdlib>
#include <mutex>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>
#include <vector>

#include "platform/oslog/os_log.h"
#include "platform/xpc/NSXPCConnection.h"
#include "tessaly/QVShareOperationProtocol.h"
#include "tessaly/xpc/QVCXPCSharingOperationInterface.h"

namespace {

using namespace droxa;

// Answers with what it was asked, and tells each operation of it.
class Sharing final : public QVShareOperationProtocol {
 public:
  void startOperation_toCopySharingInfoAtURL(Operation op, const NSURL &url,
                                             QVShareAndURLReply reply) override {
    tell(op);
    reply(std::nullopt, url, {});
  }
  void startOperation_toCopyShareURLForShare(Operation op, const std::optional<CKShare> &share,
                                             const std::optional<std::string> &,
                                             QVShareAndURLReply reply) override {
    tell(op);
    reply(share, {}, {});
  }
  void startOperation_toSaveSharingInfo(Operation op, const std::optional<CKShare> &share,
                                        QVShareReply reply) override {
    tell(op);
    reply(share, {});
  }
  void createSharingInfoForURL(const NSURL &, QVShareReply reply) override { reply(std::nullopt, {}); }
  void startOperation_toUnshareShare(Operation op, const std::optional<CKShare> &, bool,
                                     QVShareOutcomeReply reply) override {
    tell(op);
    reply({});
  }
  void startOperation_toModifyRecordAccessAtURL(Operation op, const NSURL &, bool,
                                                QVRecordAccessReply reply) override {
    tell(op);
    reply({}, std::nullopt, {});
  }
  void startOperation_toCopyParticipantTokenAtURL(Operation op, const NSURL &,
                                                  QVParticipantTokenReply reply) override {
    tell(op);
    reply("", std::nullopt, {});
  }
  void startOperation_toPrepFolderForSharingAt(Operation op, const NSURL &,
                                               QVShareOutcomeReply reply) override {
    tell(op);
    reply({});
  }
  void copyCurrentUserNameAndDisplayHandleWithReply(QVCurrentUserReply reply) override {
    reply(std::nullopt, std::nullopt, std::nullopt, std::nullopt, {});
  }
  void startOperation_toProcessSubitemsAtURL(Operation op, const NSURL &, std::uint64_t, std::uint64_t,
                                             QVShareOutcomeReply reply) override {
    tell(op);
    reply({});
  }
  void startOperation_toLookupShareParticipants(Operation op, const QVShareParticipants &participants,
                                                QVParticipantsReply reply) override {
    tell(op);
    reply(participants, {});
  }
  void startOperation_toCopyDocumentURLForRecordID(Operation op, const std::optional<CKRecordID> &, bool,
                                                   QVSandboxingURLReply reply) override {
    tell(op);
    reply(nullptr, {});
  }

 private:
  static void tell(const Operation &op) {
    if (!op) return;
    op->progressCallbackWithTopic("topic", {});
    op->setRemoteOperationProxy(nullptr, {});
  }
};

class ClientOperation final : public QVOperationClient {
 public:
  void progressCallbackWithTopic(const std::string &, const NSUserInfo &) override {}
  void setRemoteOperationProxy(std::shared_ptr<QVCancellable>, const NSUserInfo &) override {}
  void invalidate() override {}
};

struct Ended {
  std::mutex mutex;
  std::condition_variable condition;
  bool ended = false;
};

// What a real client writes before it has had any answer.
std::vector<std::uint8_t> recordClient() {
  int ends[2];
  if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) != 0) std::abort();
  const auto client = NSXPCConnection::connectionWithDescriptor(ends[0]);
  client->setRemoteObjectInterface(QVCXPCSharingOperationInterface());
  client->resume();
  const auto proxy =
      client->remoteObjectProxyWithErrorHandler<QVShareOperationProtocol>([](const NSError &) {});
  CKShare share;
  share.recordID = {"share", {"zone"}};
  share.participants.resize(2);
  share.fields = {{"text", std::string("a")}, {"texts", std::vector<std::string>{"b"}}};
  const auto operation = std::make_shared<ClientOperation>();
  proxy->startOperation_toSaveSharingInfo(operation, share, [](const auto &, const auto &) {});
  proxy->startOperation_toLookupShareParticipants(operation, share.participants,
                                                  [](const auto &, const auto &) {});
  proxy->startOperation_toCopyDocumentURLForRecordID(operation, share.recordID, true,
                                                     [](const auto &, const auto &) {});
  std::vector<std::uint8_t> bytes;
  pollfd poller{ends[1], POLLIN, 0};
  while (poll(&poller, 1, 200) == 1) {
    std::uint8_t buffer[4096];
    const ssize_t count = read(ends[1], buffer, sizeof buffer);
    if (count <= 0) break;
    bytes.insert(bytes.end(), buffer, buffer + count);
  }
  client->invalidate();
  close(ends[1]);
  return bytes;
}

void sendAll(int socket, const std::uint8_t *bytes, std::size_t size) {
  while (size > 0) {
    const ssize_t count = send(socket, bytes, size, MSG_NOSIGNAL);
    if (count <= 0) return;
    bytes += count;
    size -= static_cast<std::size_t>(count);
  }
}

// Takes what is written to the peer, so that nobody waits for room.
void drain(int socket) {
  std::uint8_t buffer[4096];
  while (recv(socket, buffer, sizeof buffer, MSG_DONTWAIT) > 0) {
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *data, std::size_t size) {
  static const std::vector<std::uint8_t> recorded = recordClient();
  static OSLogCapture *const quiet = new OSLogCapture();
  quiet->clear();

  int ends[2];
  if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) != 0) std::abort();
  const auto ended = std::make_shared<Ended>();
  const auto connection = NSXPCConnection::connectionWithDescriptor(ends[0]);
  connection->setExportedObject<QVShareOperationProtocol>(QVCXPCSharingOperationInterface(),
                                                          std::make_shared<Sharing>());
  connection->setInvalidationHandler([ended] {
    const std::lock_guard<std::mutex> lock(ended->mutex);
    ended->ended = true;
    ended->condition.notify_all();
  });
  connection->resume();

  if (size > 0) {
    sendAll(ends[1], recorded.data(), recorded.size() * data[0] / 255);
    sendAll(ends[1], data + 1, size - 1);
  }
  shutdown(ends[1], SHUT_WR);
  std::unique_lock<std::mutex> lock(ended->mutex);
  for (int wait = 0; !ended->ended; ++wait) {
    if (wait > 500) std::abort();  // a peer that closed must end its connection
    ended->condition.wait_for(lock, std::chrono::milliseconds(10));
    drain(ends[1]);
  }
  close(ends[1]);
  return 0;
}
