#include "tessaly/QVLog.h"

namespace droxa {

os_log_t qvc_default_log() {
  static const os_log_t log = os_log_create("com.quorva.Tessaly", "default");
  return log;
}

}  // namespace droxa
