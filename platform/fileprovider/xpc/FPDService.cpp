#include <kj/debug.h>
#include <utility>

#include "platform/fileprovider/xpc/FPDServiceAdapter.h"
#include "platform/xpc/capnp/Descriptors.h"
#include "platform/xpc/capnp/Exported.h"

namespace droxa {
namespace {

class ServiceServer final : public schema::FPDService::Server {
 public:
  ServiceServer(Session &session, const std::shared_ptr<FPDService> &service)
      : endpoint_(service->endpoint()), exported_(session, service) {}
  kj::Maybe<int> getFd() override { return endpoint_.descriptor(); }

 private:
  const NSXPCListenerEndpoint endpoint_;
  const Exported<FPDService> exported_;  // releases the service where users' objects are released
};

class ReceivedService final : public FPDService {
 public:
  ReceivedService(RemoteObject remote, int descriptor) : remote_(std::move(remote)), endpoint_(descriptor) {}
  NSXPCListenerEndpoint endpoint() const override { return endpoint_; }

 private:
  const RemoteObject remote_;  // tells the other process that the service is held here
  const NSXPCListenerEndpoint endpoint_;
};

}  // namespace

schema::FPDService::Client exportService(Session &session, std::shared_ptr<FPDService> service) {
  return kj::heap<ServiceServer>(session, service);
}

std::shared_ptr<FPDService> receivedService(const RemoteObject &via, schema::FPDService::Client client) {
  const int descriptor = receivedDescriptor(client);
  KJ_REQUIRE(descriptor >= 0, "a service without its endpoint");
  return std::make_shared<ReceivedService>(RemoteObject::received(*via.session, kj::mv(client), nullptr),
                                           descriptor);
}

}  // namespace droxa
