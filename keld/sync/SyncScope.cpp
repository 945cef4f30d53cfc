#include "keld/sync/SyncScope.h"

#include "keld/SharedContainer.h"

namespace droxa::keld {

bool SyncScope::hasContainer(const std::string &containerID) const {
  return isShared() ? containerID == container : !IsSharedContainer(containerID);
}

}  // namespace droxa::keld
