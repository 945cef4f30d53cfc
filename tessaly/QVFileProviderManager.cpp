#include "tessaly/QVFileProviderManager.h"

namespace droxa {

NSFileProviderManager &qv_sharedProviderManager() {
  return NSFileProviderManager::defaultManager();
}

}  // namespace droxa
