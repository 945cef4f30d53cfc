#pragma once

#include "platform/foundation/NSError.h"

namespace droxa::keld {

inline constexpr std::int64_t NSUbiquitousFileNotUploadedDueToQuotaError = 4354;
inline constexpr std::int64_t NSUbiquitousFileUbiquityServerNotAvailable = 4355;

// An error of the cloud as clients of the daemon are told it: by the codes that they know, with the
// document's name in front of what the cloud said. An error of another domain is given back with the name.
NSError ErrorForClients(const NSError &error, const std::string &path);

}  // namespace droxa::keld
