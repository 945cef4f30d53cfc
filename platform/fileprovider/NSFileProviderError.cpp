#include "platform/fileprovider/NSFileProviderError.h"

namespace droxa {

NSError fileProviderErrorForNonExistentItemWithIdentifier(const std::string &identifier) {
  NSUserInfo userInfo;
  userInfo[NSFileProviderErrorNonExistentItemIdentifierKey] = identifier;
  return {NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem, std::move(userInfo)};
}

NSError fileProviderErrorForCollisionWithItem(std::shared_ptr<const NSFileProviderItem> item) {
  NSUserInfo userInfo;
  if (item) userInfo[NSFileProviderErrorCollidingItemKey] = std::shared_ptr<const NSObject>(std::move(item));
  return {NSFileProviderErrorDomain, NSFileProviderErrorFilenameCollision, std::move(userInfo)};
}

NSURL fp_collidingURL(const NSError &error) {
  const auto found = error.userInfo().find(FPCollidingURLKey);
  if (found == error.userInfo().end()) return {};
  const auto *url = std::get_if<NSURL>(&found->second);
  return url ? *url : NSURL();
}

}  // namespace droxa
