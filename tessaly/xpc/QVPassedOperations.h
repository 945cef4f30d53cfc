#pragma once

#include <memory>

#include "platform/xpc/capnp/RemoteObject.h"
#include "tessaly/QVOperationClient.h"
#include "tessaly/xpc/QVShareOperation.capnp.h"

// The operations that calls pass along both ways. On the loop; null isn't taken. Calls of a received one
// that fail are told to the log.

namespace droxa {

schema::QVOperationClient::Client exportOperation(Session &session,
                                                  std::shared_ptr<QVOperationClient> operation);
std::shared_ptr<QVOperationClient> receivedOperation(Session &session,
                                                     schema::QVOperationClient::Client client);

// Into and out of the message that has the field `op`.
template <class Builder>
void setOperation(Builder message, Session &session, const std::shared_ptr<QVOperationClient> &operation) {
  if (operation) message.setOp(exportOperation(session, operation));
}
template <class Reader>
std::shared_ptr<QVOperationClient> getOperation(Reader message, Session &session) {
  return message.hasOp() ? receivedOperation(session, message.getOp()) : nullptr;
}

}  // namespace droxa
