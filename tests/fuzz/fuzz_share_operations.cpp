// A client's bytes, sent to a connection that exports the sharing operations (ServiceFuzz.h).

#include "ServiceFuzz.h"
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

// Calls of a real client.
void callAll(QVShareOperationProtocol &proxy) {
  CKShare share;
  share.recordID = {"share", {"zone"}};
  share.participants.resize(2);
  share.fields = {{"text", std::string("a")}, {"texts", std::vector<std::string>{"b"}}};
  const auto operation = std::make_shared<ClientOperation>();
  proxy.startOperation_toSaveSharingInfo(operation, share, [](const auto &, const auto &) {});
  proxy.startOperation_toLookupShareParticipants(operation, share.participants,
                                                 [](const auto &, const auto &) {});
  proxy.startOperation_toCopyDocumentURLForRecordID(operation, share.recordID, true,
                                                    [](const auto &, const auto &) {});
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *data, std::size_t size) {
  const NSXPCInterface &interface = QVCXPCSharingOperationInterface();
  static const std::vector<std::uint8_t> recorded =
      fuzz::recordClient<QVShareOperationProtocol>(interface, callAll);
  fuzz::run<QVShareOperationProtocol>(interface, std::make_shared<Sharing>(), recorded, data, size);
  return 0;
}
