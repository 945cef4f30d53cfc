#pragma once

#include <memory>
#include <string>

#include "platform/fileprovider/NSFileProviderItem.h"
#include "platform/foundation/NSError.h"

namespace droxa {

inline constexpr char NSFileProviderErrorDomain[] = "NSFileProviderErrorDomain";
inline constexpr std::int64_t NSFileProviderErrorNotAuthenticated = -1000;
inline constexpr std::int64_t NSFileProviderErrorFilenameCollision = -1001;
inline constexpr std::int64_t NSFileProviderErrorSyncAnchorExpired = -1002;
inline constexpr std::int64_t NSFileProviderErrorInsufficientQuota = -1003;
inline constexpr std::int64_t NSFileProviderErrorServerUnreachable = -1004;
inline constexpr std::int64_t NSFileProviderErrorNoSuchItem = -1005;

// User-info keys.
inline constexpr char NSFileProviderErrorNonExistentItemIdentifierKey[] =
    "NSFileProviderErrorNonExistentItemIdentifier";
inline constexpr char NSFileProviderErrorCollidingItemKey[] = "NSFileProviderErrorCollidingItem";
inline constexpr char FPCollidingURLKey[] = "FPCollidingURL";

NSError fileProviderErrorForNonExistentItemWithIdentifier(const std::string &identifier);       // -1005
NSError fileProviderErrorForCollisionWithItem(std::shared_ptr<const NSFileProviderItem> item);  // -1001
// The URL that a new item collided with, as an NSFileWriteFileExistsError carries it; nil when there is none.
NSURL fp_collidingURL(const NSError &error);

}  // namespace droxa
