#pragma once

#include <memory>

#include "platform/fileprovider/NSFileProviderRemote.h"
#include "platform/fileprovider/xpc/FPDAction.capnp.h"
#include "platform/xpc/capnp/RemoteObject.h"
#include "platform/xpc/capnp/Values.h"

// Actions, which are handed over inside replies, and the requests for them. On the loop; null isn't taken.

namespace droxa {

schema::FPDAction::Client exportAction(Session &session, std::shared_ptr<FPDAction> action);
std::shared_ptr<FPDAction> receivedAction(const RemoteObject &via, schema::FPDAction::Client client);

void writeActionRequest(schema::FPDActionRequest::Builder builder, const FPDActionRequest &request);
// Of any kind, also of one that there isn't.
FPDActionRequest readActionRequest(schema::FPDActionRequest::Reader reader);

// What encodes and decodes the answer of performAction, whose message has the fields `action` and `error`.
inline constexpr auto xpcWriteAction = [](auto results, Session &session, const auto &action,
                                          const NSError &error) {
  if (action) results.setAction(exportAction(session, action));
  setError(results, error);
};
inline constexpr auto xpcReadAction = [](auto results, const RemoteObject &via) {
  std::shared_ptr<FPDAction> action;
  if (results.hasAction()) action = receivedAction(via, results.getAction());
  return std::tuple(action, getError(results));
};

}  // namespace droxa
