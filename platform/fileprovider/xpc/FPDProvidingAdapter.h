#pragma once

#include <memory>

#include "platform/fileprovider/NSFileProviderRemote.h"
#include "platform/fileprovider/xpc/FPDProviding.capnp.h"
#include "platform/xpc/capnp/RemoteObject.h"
#include "platform/xpc/capnp/Values.h"

// Providings, which are handed over inside replies. On the loop; null isn't taken.

namespace droxa {

schema::FPDProviding::Client exportProviding(Session &session, std::shared_ptr<FPDProviding> providing);
std::shared_ptr<FPDProviding> receivedProviding(const RemoteObject &via, schema::FPDProviding::Client client);

// Into and out of the message that has the fields `providing` and `error`.
template <class Builder>
void setProviding(Builder message, Session &session, const std::shared_ptr<FPDProviding> &providing) {
  if (providing) message.setProviding(exportProviding(session, providing));
}
template <class Reader>
std::shared_ptr<FPDProviding> getProviding(Reader message, const RemoteObject &via) {
  return message.hasProviding() ? receivedProviding(via, message.getProviding()) : nullptr;
}

}  // namespace droxa
