// Shares a document of the drive with somebody, and prints the link:
//
//   share_document PATH ACCOUNT     PATH is of the drive ("Documents/a.txt")
//
// The home is $DROXA_HOME, else the usual one.

#include <chrono>
#include <cstdio>
#include <memory>
#include <platform/fileprovider/NSFileProviderRemote.h>
#include <platform/fileprovider/xpc/FileProviderInterfaces.h>
#include <platform/foundation/Paths.h>
#include <platform/xpc/NSXPCListener.h>
#include <string>
#include <tessaly/QVSharingService.h>
#include <tessaly/xpc/QVSharingServiceInterface.h>

using namespace droxa;

namespace {

int complain(const std::string &what, const NSError &error) {
  std::fprintf(stderr, "share_document: %s: %s\n", what.c_str(), error.localizedDescription().c_str());
  return 1;
}

std::shared_ptr<NSXPCConnection> opened(std::shared_ptr<NSXPCConnection> connection,
                                        const NSXPCInterface &interface) {
  if (!connection) return nullptr;
  connection->setRemoteObjectInterface(interface);
  connection->setCallDeadline(std::chrono::seconds(30));
  connection->resume();
  return connection;
}

// Whom the document is to be shared with, besides those who are there.
CKShare with(CKShare share, const std::string &account) {
  CKShareParticipant participant;
  participant.userIdentity.accountName = account;
  participant.permission = CKShareParticipantPermission::readWrite;
  if (!share.participantWithAccountName(account)) share.participants.push_back(participant);
  return share;
}

}  // namespace

int main(int argc, char *argv[]) {
  if (argc != 3) {
    std::fprintf(stderr, "usage: share_document PATH ACCOUNT\n");
    return 2;
  }
  const std::string path = argv[1];
  DroxaSetProcessHome(DroxaHome::resolve(std::nullopt));

  // 1. The host, which knows the items and who offers services on them.
  NSError error;
  const auto host = opened(NSXPCConnection::connectionWithSocketPath(DroxaProcessHome().hostSocket(), &error),
                           FPDControlInterface());
  if (!host) return complain("fileproviderd doesn't run", error);
  const auto control = host->synchronousRemoteObjectProxyWithErrorHandler<FPDControlProtocol>(
      [&error](const NSError &failure) { error = failure; });
  std::shared_ptr<const NSFileProviderItem> item;
  control->itemAtPath(path, [&](const auto &found, const NSError &problem) {
    item = found;
    error = problem;
  });
  if (!item) return complain(path, error);

  // 2. The service on the item: an endpoint of the extension's, to be held until the first reply has come.
  std::shared_ptr<FPDService> service;
  control->listenerEndpointForServiceName(QVSharingServiceName, item->itemIdentifier(),
                                          [&](const auto &offered, const NSError &problem) {
                                            service = offered;
                                            error = problem;
                                          });
  if (!service) return complain(path, error);
  const auto connection = opened(NSXPCConnection::connectionWithListenerEndpoint(service->endpoint(), &error),
                                 getSharingServiceInterface());
  if (!connection) return complain(path, error);

  // 3. The share, new or not, is fetched, changed and saved. These calls wait for their replies; those of
  // remoteObjectProxyWithErrorHandler don't.
  const auto sharing = connection->synchronousRemoteObjectProxyWithErrorHandler<QVSharingService>(
      [&error](const NSError &failure) { error = failure; });
  std::optional<CKShare> share;
  const auto take = [&](const std::optional<CKShare> &given, const NSError &problem) {
    share = given;
    error = problem;
  };
  sharing->fetchShareWithCompletion(take);
  if (error || !share) return complain(path, error);
  sharing->saveShare(with(*share, argv[2]), take);
  if (error || !share) return complain(path, error);

  std::printf("%s\n", share->URL.absoluteString().c_str());
  connection->invalidate();
  host->invalidate();
  return 0;
}
