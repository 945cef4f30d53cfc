#pragma once

#include <memory>

#include "platform/xpc/capnp/RemoteObject.h"
#include "tessaly/QVProtocol.h"
#include "tessaly/xpc/QVDaemonNotificationReceiving.capnp.h"
#include "tessaly/xpc/QVItemNotificationReceiving.capnp.h"
#include "tessaly/xpc/QVItemNotificationSending.capnp.h"
#include "tessaly/xpc/QVTransfer.capnp.h"

// The objects that the daemon protocol's calls and replies pass along. On the loop; null isn't taken.

namespace droxa {

schema::QVItemNotificationSending::Client exportSender(Session &session,
                                                       std::shared_ptr<QVItemNotificationSending> sender);
std::shared_ptr<QVItemNotificationSender> receivedSender(const RemoteObject &via,
                                                         schema::QVItemNotificationSending::Client client);

schema::QVItemNotificationReceiving::Client exportReceiver(
    Session &session, std::shared_ptr<QVItemNotificationReceiving> receiver);
std::shared_ptr<QVItemNotificationReceiving> receivedReceiver(
    Session &session, schema::QVItemNotificationReceiving::Client client);

schema::QVTransfer::Client exportTransfer(Session &session, std::shared_ptr<QVTransferring> transfer);
std::shared_ptr<QVTransfer> receivedTransfer(const RemoteObject &via, schema::QVTransfer::Client client);

schema::QVDaemonNotificationReceiving::Client exportDaemonReceiver(
    Session &session, std::shared_ptr<QVDaemonNotificationReceiving> receiver);
std::shared_ptr<QVDaemonNotificationReceiving> receivedDaemonReceiver(
    Session &session, schema::QVDaemonNotificationReceiving::Client client);

}  // namespace droxa
