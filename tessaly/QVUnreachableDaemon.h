#pragma once

#include <functional>
#include <memory>

#include "tessaly/QVProtocol.h"

namespace droxa {

// Stands in for a daemon that can't be reached: `failed` is called once for each call, instead of its reply,
// before the call returns. Thread contract: any thread.
std::shared_ptr<QVProtocol> QVUnreachableDaemon(std::function<void()> failed);

}  // namespace droxa
