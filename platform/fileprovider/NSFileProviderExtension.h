#pragma once

#include <memory>
#include <optional>
#include <string>

#include "platform/fileprovider/NSFileProviderEnumerating.h"
#include "platform/foundation/NSError.h"
#include "platform/foundation/NSObject.h"
#include "platform/foundation/NSURL.h"

namespace droxa {

// The extension protocol: what the framework asks a file provider.
// Thread contract: the framework calls every operation on threads of its own, several at a time; each may
// block.
class NSFileProviderExtension : public NSObject,
                                public std::enable_shared_from_this<NSFileProviderExtension> {
 public:
  // The URL at which the item's contents are; nil when there is no such item.
  virtual NSURL URLForItemWithPersistentIdentifier(const std::string &identifier) = 0;
  // The identifier of the item at `url`; nullopt when there is none.
  virtual std::optional<std::string> persistentIdentifierForItemAtURL(const NSURL &url) = 0;
  // The item, or null with `error` (may be null) set.
  virtual std::shared_ptr<const NSFileProviderItem> itemForIdentifier(const std::string &identifier,
                                                                      NSError *error) = 0;
  // The enumerator, or null with `error` (may be null) set.
  virtual std::shared_ptr<NSFileProviderEnumerator> enumeratorForContainerItemIdentifier(
      const std::string &identifier, NSError *error) = 0;
};

}  // namespace droxa
