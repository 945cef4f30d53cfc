#include <utility>

#include "platform/fileprovider/NSFileProviderRemote.h"
#include "platform/fileprovider/xpc/FileProviderInterfaces.h"
#include "platform/fileprovider/xpc/NSFileProviderHostProtocol.capnp.h"
#include "platform/xpc/capnp/Exported.h"
#include "platform/xpc/capnp/Interface.h"
#include "platform/xpc/capnp/Proxy.h"
#include "platform/xpc/capnp/Values.h"

namespace droxa {
namespace {

using Schema = schema::NSFileProviderHostProtocol;

class HostServer final : public Schema::Server {
 public:
  HostServer(Session &session, std::shared_ptr<NSFileProviderHostProtocol> object)
      : exported_(session, std::move(object)) {}

  kj::Promise<void> signalEnumerator(SignalEnumeratorContext context) override {
    return exported_.serve(context, [container = xpcString(context.getParams().getContainerIdentifier())](
                                        auto &object, auto reply) {
      object.signalEnumerator(
          container, reply([](auto results, Session &, const NSError &error) { setError(results, error); }));
    });
  }

 private:
  Exported<NSFileProviderHostProtocol> exported_;
};

class HostProxy final : public XPCProxy<Schema, NSFileProviderHostProtocol, HostProxy> {
 public:
  using XPCProxy::XPCProxy;

  void signalEnumerator(const std::string &containerIdentifier,
                        NSFileProviderErrorCompletion completion) override {
    call(
        &Client::signalEnumeratorRequest,
        [containerIdentifier](auto params, Session &) {
          params.setContainerIdentifier(xpcBytes(containerIdentifier));
        },
        std::move(completion),
        [](auto results, const RemoteObject &) { return std::tuple(getError(results)); });
  }
};

}  // namespace

const NSXPCInterface &NSFileProviderHostInterface() {
  static const auto interface =
      makeXPCInterface<NSFileProviderHostProtocol, HostServer, HostProxy>("NSFileProviderHostProtocol");
  return interface;
}

}  // namespace droxa
