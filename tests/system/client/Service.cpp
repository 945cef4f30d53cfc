#include "tests/system/client/Service.h"

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <thread>

#include "platform/fileprovider/xpc/FileProviderInterfaces.h"
#include "platform/foundation/Paths.h"
#include "platform/xpc/NSXPCListener.h"
#include "tessaly/xpc/QVCXPCSharingOperationInterface.h"

namespace droxa::testing {

namespace {

constexpr char kService[] = "com.quorva.Tessaly.private.SharingOperation";

}  // namespace

std::function<void()> Tally::begin() {
  ++made_;
  const auto answers = std::make_shared<std::atomic<int>>(0);
  return [this, answers] { ++(answers->fetch_add(1) == 0 ? answered_ : twice_); };
}

int Tally::finish() {
  const auto end = std::chrono::steady_clock::now() + std::chrono::seconds(120);
  while (unanswered() > 0 && std::chrono::steady_clock::now() < end)
    std::this_thread::sleep_for(std::chrono::milliseconds(5));
  std::printf("made %d unanswered %d twice %d\n", made_.load(), unanswered(), twice_.load());
  std::fflush(stdout);
  return made_ > 0 && unanswered() == 0 && twice_ == 0 ? 0 : 1;
}

std::shared_ptr<NSXPCConnection> connectToHost(const std::string &home) {
  NSError error;
  auto host = NSXPCConnection::connectionWithSocketPath(DroxaHome(home).hostSocket(), &error);
  if (!host) {
    std::fprintf(stderr, "fileproviderd isn't there: %s\n", error.description().c_str());
    std::exit(3);
  }
  host->setRemoteObjectInterface(FPDControlInterface());
  host->resume();
  return host;
}

std::shared_ptr<FPDControlProtocol> waitingControl(NSXPCConnection &host, NSError *error) {
  return host.synchronousRemoteObjectProxyWithErrorHandler<FPDControlProtocol>(
      [error](const NSError &failure) { *error = failure; });
}

Service::Service(NSXPCConnection &host, const std::string &path) {
  open(host, path);
}

Service::~Service() {
  if (connection_) connection_->invalidate();
}

void Service::open(NSXPCConnection &host, const std::string &path) {
  const auto control = waitingControl(host, &error_);
  std::string identifier;
  control->itemAtPath(path,
                      [&](const std::shared_ptr<const NSFileProviderItem> &item, const NSError &problem) {
                        error_ = problem;
                        if (item) identifier = item->itemIdentifier();
                      });
  if (error_) return;
  control->URLForItemIdentifier(identifier, [&](const NSURL &url) { url_ = url; });
  if (error_) return;
  control->listenerEndpointForServiceName(
      kService, identifier, [&](const std::shared_ptr<FPDService> &service, const NSError &problem) {
        error_ = problem;
        service_ = service;
      });
  if (error_) return;
  connection_ = NSXPCConnection::connectionWithListenerEndpoint(service_->endpoint(), &error_);
  if (!connection_) return;
  connection_->setRemoteObjectInterface(QVCXPCSharingOperationInterface());
  connection_->setCallDeadline(std::chrono::seconds(90));
  connection_->resume();
}

std::shared_ptr<QVShareOperationProtocol> Service::remote(const NSXPCErrorHandler &failed) const {
  return connection_->remoteObjectProxyWithErrorHandler<QVShareOperationProtocol>(failed);
}

std::shared_ptr<QVShareOperationProtocol> Service::waitingRemote(const NSXPCErrorHandler &failed) const {
  return connection_->synchronousRemoteObjectProxyWithErrorHandler<QVShareOperationProtocol>(failed);
}

}  // namespace droxa::testing
