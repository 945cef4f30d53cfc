// A client's bytes, sent to a connection that exports the collaboration service (ServiceFuzz.h).

#include "ServiceFuzz.h"
#include "tessaly/QVPlendaCollaboration.h"
#include "tessaly/xpc/QVPlendaCollaborationInterface.h"

namespace {

using namespace droxa;
using Service = QVFileProviderPlendaCollaboration;

// Answers at once.
class Collaboration final : public Service {
 public:
  void fetchVersionAndCapabilitiesWithCompletionHandler(QVCollaborationVersionHandler handler) override {
    handler(1, 210, {});
  }
  Progress fetchCollaborationTokenWithCompletionHandler(QVCollaborationTokenHandler handler) override {
    handler("a", "b", std::nullopt, NSDate::distantFuture(), {});
    return std::make_shared<NSProgress>();
  }
  Progress fetchLatestRevisionWithCompletionHandler(QVCollaborationErrorHandler handler) override {
    handler({});
    return std::make_shared<NSProgress>();
  }
  Progress refreshSharingStateWithCompletionHandler(QVCollaborationErrorHandler handler) override {
    handler(NSError("Domain", 1));
    return nullptr;
  }
  void fetchFileProviderIdentifierWithCompletionHandler(QVCollaborationStringHandler handler) override {
    handler("a", {});
  }
  void fetchURLForSharingFileWithCompletionHandler(QVCollaborationURLHandler handler) override {
    handler({}, {});
  }
  Progress fetchFolderSharingStateWithCompletionHandler(QVCollaborationStateHandler handler) override {
    handler(true, {});
    return nullptr;
  }
  Progress fetchSharedFolderInfoWithCompletionHandler(QVCollaborationFolderHandler handler) override {
    handler(true, "a", {});
    return nullptr;
  }
  void fetchAccountIdentifierWithCompletionHandler(QVCollaborationStringHandler handler) override {
    handler(std::nullopt, NSError("Domain", 1));
  }
};

// Calls of a real client.
void callAll(Service &proxy) {
  proxy.fetchLatestRevisionWithCompletionHandler([](const auto &) {});
  proxy.fetchCollaborationTokenWithCompletionHandler(nullptr);
  proxy.fetchSharedFolderInfoWithCompletionHandler([](bool, const auto &, const auto &) {});
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *data, std::size_t size) {
  const NSXPCInterface &interface = QVPlendaCollaborationInterface();
  static const std::vector<std::uint8_t> recorded = fuzz::recordClient<Service>(interface, callAll);
  fuzz::run<Service>(interface, std::make_shared<Collaboration>(), recorded, data, size);
  return 0;
}
