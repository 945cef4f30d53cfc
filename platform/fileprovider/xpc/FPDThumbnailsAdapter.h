#pragma once

#include <memory>

#include "platform/fileprovider/NSFileProviderRemote.h"
#include "platform/fileprovider/xpc/FPDThumbnails.capnp.h"
#include "platform/xpc/capnp/RemoteObject.h"
#include "platform/xpc/capnp/Values.h"

// Thumbnails on their way, which are handed over inside replies. On the loop; null isn't taken.

namespace droxa {

schema::FPDThumbnails::Client exportThumbnails(Session &session, std::shared_ptr<FPDThumbnails> thumbnails);
std::shared_ptr<FPDThumbnails> receivedThumbnails(const RemoteObject &via,
                                                  schema::FPDThumbnails::Client client);

// What encodes and decodes the answer of fetchThumbnails, whose message has the fields `thumbnails` and
// `error`.
inline constexpr auto xpcWriteThumbnails = [](auto results, Session &session, const auto &thumbnails,
                                              const NSError &error) {
  if (thumbnails) results.setThumbnails(exportThumbnails(session, thumbnails));
  setError(results, error);
};
inline constexpr auto xpcReadThumbnails = [](auto results, const RemoteObject &via) {
  std::shared_ptr<FPDThumbnails> thumbnails;
  if (results.hasThumbnails()) thumbnails = receivedThumbnails(via, results.getThumbnails());
  return std::tuple(thumbnails, getError(results));
};

}  // namespace droxa
