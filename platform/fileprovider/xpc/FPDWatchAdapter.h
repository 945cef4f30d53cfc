#pragma once

#include <memory>

#include "platform/fileprovider/NSFileProviderRemote.h"
#include "platform/fileprovider/xpc/FPDControlProtocol.capnp.h"
#include "platform/xpc/capnp/RemoteObject.h"

// Watches and their observers, which are handed over inside calls. On the loop; null stays null.

namespace droxa {

schema::FPDWatch::Client exportWatch(Session &session, std::shared_ptr<FPDWatch> watch);
std::shared_ptr<FPDWatch> receivedWatch(const RemoteObject &via, schema::FPDWatch::Client client);

schema::FPDWatchObserver::Client exportWatchObserver(Session &session,
                                                     std::shared_ptr<FPDWatchObserver> observer);
std::shared_ptr<FPDWatchObserver> receivedWatchObserver(Session &session,
                                                        schema::FPDWatchObserver::Client client);

}  // namespace droxa
