#include <cstdlib>

#include "extension/QVFileProviderExtension.h"
#include "extension/QVPersonaRemembering.h"
#include "platform/featureflags/feature_flags.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVLog.h"
#include "tessaly/QVPersona.h"

namespace droxa {

// The check comes last, deliberately: by then the hooks stand.
void QVFileProviderExtension::initialize() {
  if (QVContainerCache::isManagedProvider()) {
    qvc_block_remember_persona = QVRememberPersonaOfBlock;
    qvc_activity_block_remember_persona = QVRememberPersonaOfActivity;
  }
  if (_os_feature_enabled_impl("DroxaDrive", "FPFS_Return")) {
    os_log_debug(qvc_default_log(), "[DEBUG] Not allowing legacy extension to start when fpfs is enabled");
    std::exit(1);
  }
}

}  // namespace droxa
