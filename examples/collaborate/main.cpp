// What an application asks before it works on a document together with others:
//
//   collaborate PATH     PATH is of the drive ("Documents/a.txt")
//
// It brings the newest revision here, which Ctrl-C cancels, and prints the tokens and how the document is
// shared. The home is $DROXA_HOME, else the usual one.

#include <chrono>
#include <cstdio>
#include <future>
#include <memory>
#include <optional>
#include <platform/fileprovider/NSFileProviderRemote.h>
#include <platform/fileprovider/xpc/FileProviderInterfaces.h>
#include <platform/foundation/Paths.h>
#include <platform/xpc/NSXPCListener.h>
#include <string>
#include <tessaly/QVPlendaCollaboration.h>
#include <tessaly/xpc/QVPlendaCollaborationInterface.h>

using namespace droxa;

namespace {

using Collaboration = QVFileProviderPlendaCollaboration;
using Text = std::optional<std::string>;

int complain(const std::string &what, const NSError &error) {
  std::fprintf(stderr, "collaborate: %s: %s\n", what.c_str(), error.localizedDescription().c_str());
  return 1;
}

std::shared_ptr<NSXPCConnection> opened(std::shared_ptr<NSXPCConnection> connection,
                                        const NSXPCInterface &interface) {
  if (!connection) return nullptr;
  connection->setRemoteObjectInterface(interface);
  connection->resume();
  return connection;
}

// The newest revision, within half a minute: the call returns a progress at once, which cancels it.
NSError fetchLatestRevision(NSXPCConnection &connection) {
  const auto ended = std::make_shared<std::promise<NSError>>();
  auto outcome = ended->get_future();
  const auto service = connection.remoteObjectProxyWithErrorHandler<Collaboration>(
      [ended](const NSError &error) { ended->set_value(error); });
  const auto progress = service->fetchLatestRevisionWithCompletionHandler(
      [ended](const NSError &error) { ended->set_value(error); });
  if (outcome.wait_for(std::chrono::seconds(30)) == std::future_status::timeout) progress->cancel();
  return outcome.get();
}

}  // namespace

int main(int argc, char *argv[]) {
  if (argc != 2) {
    std::fprintf(stderr, "usage: collaborate PATH\n");
    return 2;
  }
  const std::string path = argv[1];
  DroxaSetProcessHome(DroxaHome::resolve(std::nullopt));
  NSError error;
  const auto fail = [&error](const NSError &failure) { error = failure; };
  const auto host = opened(NSXPCConnection::connectionWithSocketPath(DroxaProcessHome().hostSocket(), &error),
                           FPDControlInterface());
  if (!host) return complain("fileproviderd doesn't run", error);
  const auto control = host->synchronousRemoteObjectProxyWithErrorHandler<FPDControlProtocol>(fail);
  std::shared_ptr<const NSFileProviderItem> item;
  control->itemAtPath(path, [&](const auto &found, const NSError &problem) {
    item = found;
    error = problem;
  });
  if (!item) return complain(path, error);
  std::shared_ptr<FPDService> service;
  control->listenerEndpointForServiceName(QVPlendaCollaborationServiceName, item->itemIdentifier(),
                                          [&](const auto &offered, const NSError &problem) {
                                            service = offered;
                                            error = problem;
                                          });
  if (!service) return complain(path, error);
  const auto connection = opened(NSXPCConnection::connectionWithListenerEndpoint(service->endpoint(), &error),
                                 QVPlendaCollaborationInterface());
  if (!connection) return complain(path, error);

  const auto asked = connection->synchronousRemoteObjectProxyWithErrorHandler<Collaboration>(fail);
  asked->fetchVersionAndCapabilitiesWithCompletionHandler(
      [](std::int64_t version, std::int64_t capabilities, const NSError &) {
        std::printf("protocol %lld, capabilities %lld\n", static_cast<long long>(version),
                    static_cast<long long>(capabilities));
      });
  if (const NSError problem = fetchLatestRevision(*connection)) return complain(path, problem);
  asked->fetchCollaborationTokenWithCompletionHandler([&](const Text &provider, const Text &document,
                                                          const Text &share, const NSDate &,
                                                          const NSError &problem) {
    error = problem;
    std::printf("%s knows the document as %s, its share as %s\n", provider.value_or("nobody").c_str(),
                document.value_or("-").c_str(), share.value_or("-").c_str());
  });
  if (error) return complain(path, error);
  asked->fetchSharedFolderInfoWithCompletionHandler([](bool isShared, const Text &folder, const NSError &) {
    std::printf("shared with a folder above it: %s\n", isShared ? folder.value_or("yes").c_str() : "no");
  });
  connection->invalidate();
  host->invalidate();
  return 0;
}
