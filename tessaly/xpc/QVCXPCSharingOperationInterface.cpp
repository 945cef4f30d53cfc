#include "tessaly/xpc/QVCXPCSharingOperationInterface.h"

#include "platform/xpc/capnp/Interface.h"
#include "tessaly/xpc/QVShareOperationCalls.h"
#include "tessaly/xpc/QVShareOperationServer.h"

namespace droxa {
namespace {

class ShareOperationProxy final
    : public QVShareOperationCalls<schema::QVShareOperationProtocol, QVShareOperationProtocol,
                                   ShareOperationProxy> {
 public:
  using QVShareOperationCalls::QVShareOperationCalls;
};

// The sharing operations alone, without the rest of the daemon's protocol.
class ShareOperationServer final : public QVShareOperationServer {
 public:
  using QVShareOperationServer::QVShareOperationServer;
};

}  // namespace

const NSXPCInterface &QVCXPCSharingOperationInterface() {
  static const auto interface =
      makeXPCInterface<QVShareOperationProtocol, ShareOperationServer, ShareOperationProxy>(
          "QVShareOperationProtocol");
  return interface;
}

}  // namespace droxa
