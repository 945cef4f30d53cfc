#include "keld/sync/DeviceName.h"

#include "tessaly/QVHomeCloud.h"

namespace droxa::keld {

std::string DeviceName(const DroxaHome &home) {
  return QVDeviceName(home);
}

}  // namespace droxa::keld
