#pragma once

#include "platform/oslog/os_log.h"

namespace droxa {

os_log_t qvc_default_log();  // "com.quorva.Tessaly", "default"

}  // namespace droxa
