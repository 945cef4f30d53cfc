#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "platform/foundation/NSData.h"
#include "platform/foundation/NSDate.h"
#include "platform/foundation/NSError.h"
#include "platform/foundation/NSURL.h"

namespace droxa {

// What somebody wants done with an item: one of the extension's actions, with its arguments.
struct FPDActionRequest {
  enum class Kind : std::uint8_t {
    importDocument,   // `url`, to `parentIdentifier`
    createDirectory,  // `name`, in `parentIdentifier`
    rename,           // `identifier`, to `name`
    reparent,         // `identifier`, to `parentIdentifier`, as `name` if there is one
    trash,            // `identifier`
    untrash,          // `identifier`, to `parentIdentifier` if there is one
    deleteItem,       // `identifier`
    setLastUsedDate,  // `identifier`; nil: never
    setTagData,       // `identifier`; nil: no tags
    setFavoriteRank,  // `identifier`; none: no favourite
  };

  Kind kind = Kind::importDocument;
  std::string identifier;
  std::optional<std::string> parentIdentifier;
  std::optional<std::string> name;
  NSURL url;
  NSDate date;
  NSData tagData;
  std::optional<std::uint64_t> favoriteRank;
  bool operator==(const FPDActionRequest &) const = default;
};

// "rename", "delete", …; "unknown action 200" for a kind that there isn't.
std::string FPDActionName(FPDActionRequest::Kind kind);

// nil when the request has what its kind needs. Else NSPOSIXErrorDomain EINVAL, or for a name that no item
// can have, whatever the file system, NSCocoaErrorDomain NSFileWriteInvalidFileNameError; both say what is
// wrong. Any thread.
NSError FPDActionRequestError(const FPDActionRequest &request);

}  // namespace droxa
