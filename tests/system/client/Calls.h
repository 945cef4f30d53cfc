#pragma once

#include <functional>
#include <string>

#include "platform/foundation/NSURL.h"
#include "tessaly/QVShareOperationProtocol.h"

namespace droxa::testing {

// The twelve sharing operations, by number. Each asks about `url`, or for what nobody has, and changes
// nothing.
inline constexpr int kCalls = 12;
const char *nameOfCall(int call);
void makeCall(int call, QVShareOperationProtocol &remote, const NSURL &url,
              const std::function<void(const NSError &error)> &answer);

}  // namespace droxa::testing
