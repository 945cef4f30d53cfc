#pragma once

#include <memory>

#include "platform/fileprovider/NSFileProviderRemote.h"
#include "platform/fileprovider/xpc/NSFileProviderRemoteEnumerator.capnp.h"
#include "platform/xpc/capnp/RemoteObject.h"

// Enumerators, which are handed over inside replies. On the loop.

namespace droxa {

schema::NSFileProviderRemoteEnumerator::Client exportEnumerator(
    Session &session, std::shared_ptr<NSFileProviderRemoteEnumerator> enumerator);
std::shared_ptr<NSFileProviderRemoteEnumerator> receivedEnumerator(
    const RemoteObject &via, schema::NSFileProviderRemoteEnumerator::Client client);

// A reply's field `enumerator`, which may be null.
template <class Builder>
void setEnumerator(Builder message, Session &session,
                   const std::shared_ptr<NSFileProviderRemoteEnumerator> &enumerator) {
  if (enumerator) message.setEnumerator(exportEnumerator(session, enumerator));
}
template <class Reader>
std::shared_ptr<NSFileProviderRemoteEnumerator> getEnumerator(Reader message, const RemoteObject &via) {
  return message.hasEnumerator() ? receivedEnumerator(via, message.getEnumerator()) : nullptr;
}

}  // namespace droxa
