// A client's bytes, sent to a connection that exports the sharing service (ServiceFuzz.h).

#include "ServiceFuzz.h"
#include "tessaly/QVSharingService.h"
#include "tessaly/xpc/QVSharingServiceInterface.h"

namespace {

using namespace droxa;

// Answers with what it was asked, and returns a progress that moves.
class Sharing final : public QVSharingService {
 public:
  void fetchSharingInfo(QVSharingInfoReply reply) override { reply(true, nullptr, {}); }
  Progress preflightCheckIfCurrentlyShareableWithCompletion(QVSharingPreflightReply completion) override {
    completion(true, nullptr, QVSharingStrings({"a"}), std::nullopt, {});
    return nullptr;
  }
  Progress fetchParticipantListAndPublicPermission(QVSharingParticipantsReply completion) override {
    completion(std::nullopt, 0, {});
    return moved();
  }
  void startPreparingForShareWhenForcing(bool) override {}
  Progress fetchShareWithCompletion(QVShareReply completion) override {
    completion(std::nullopt, {});
    return nullptr;
  }
  Progress fetchShareURLWithCompletion(QVSharingURLReply completion) override {
    completion({}, {});
    return moved();
  }
  Progress saveShare(const std::optional<CKShare> &share, QVShareReply completion) override {
    completion(share, {});
    return moved();
  }
  Progress unshareWithCompletion(QVShareOutcomeReply completion) override {
    completion({});
    return moved();
  }

 private:
  static Progress moved() {
    auto progress = NSProgress::progressWithTotalUnitCount(2);
    progress->setCompletedUnitCount(1);
    return progress;
  }
};

// Calls of a real client.
void callAll(QVSharingService &proxy) {
  CKShare share;
  share.recordID = {"share", {"zone"}};
  share.participants.resize(2);
  share.fields = {{"text", std::string("a")}, {"texts", std::vector<std::string>{"b"}}};
  proxy.saveShare(share, [](const auto &, const auto &) {});
  proxy.fetchShareWithCompletion([](const auto &, const auto &) {});
  proxy.unshareWithCompletion([](const auto &) {});
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *data, std::size_t size) {
  const NSXPCInterface &interface = getSharingServiceInterface();
  static const std::vector<std::uint8_t> recorded = fuzz::recordClient<QVSharingService>(interface, callAll);
  fuzz::run<QVSharingService>(interface, std::make_shared<Sharing>(), recorded, data, size);
  return 0;
}
