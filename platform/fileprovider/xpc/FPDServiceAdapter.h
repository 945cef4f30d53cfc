#pragma once

#include <memory>

#include "platform/fileprovider/NSFileProviderRemote.h"
#include "platform/fileprovider/xpc/FPDService.capnp.h"
#include "platform/xpc/capnp/RemoteObject.h"
#include "platform/xpc/capnp/Values.h"

// Services, which are handed over inside replies. On the loop; null isn't taken.

namespace droxa {

schema::FPDService::Client exportService(Session &session, std::shared_ptr<FPDService> service);
// Throws when no descriptor came with it.
std::shared_ptr<FPDService> receivedService(const RemoteObject &via, schema::FPDService::Client client);

// Into and out of the message that has the fields `service` and `error`.
inline constexpr auto xpcWriteService = [](auto results, Session &session,
                                           const std::shared_ptr<FPDService> &service, const NSError &error) {
  if (service) results.setService(exportService(session, service));
  setError(results, error);
};
inline constexpr auto xpcReadService = [](auto results, const RemoteObject &via) {
  return std::tuple(results.hasService() ? receivedService(via, results.getService()) : nullptr,
                    getError(results));
};

}  // namespace droxa
