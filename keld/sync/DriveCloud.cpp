#include "keld/sync/DriveCloud.h"

#include <cerrno>
#include <unistd.h>

#include "keld/sync/SyncStore.h"
#include "platform/cloudkit/CKLateCloud.h"
#include "platform/cloudkit/EmbeddedCloud.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {
namespace {

std::shared_ptr<CKCloud> openWhatIsThere(const std::string &folder, const std::string &account,
                                         const std::string &device, NSError *error) {
  if (::access((folder + "/cloud.sqlite").c_str(), F_OK) != 0) {
    const NSError why(NSPOSIXErrorDomain, errno);
    *error = CKErrorMake(CKErrorCode::serviceUnavailable, "there is no cloud in " + folder, why);
    return nullptr;
  }
  return EmbeddedCloud::open(folder, account, device, error);
}

bool wasInCloud(const DroxaHome &home) {
  const std::string path = home.state() + "/sync.sqlite";
  return ::access(path.c_str(), F_OK) == 0 && !SyncStore(path).text(kSyncCloudIdentifier).empty();
}

}  // namespace

std::shared_ptr<CKCloud> OpenDriveCloud(const DroxaHome &home, const std::string &folder,
                                        const std::string &account, const std::string &device,
                                        NSError *error) {
  if (!wasInCloud(home)) return EmbeddedCloud::open(folder, account, device, error);
  NSError why;
  if (auto cloud = openWhatIsThere(folder, account, device, &why)) return cloud;
  os_log_error(qvc_default_log(), "[ERROR] the cloud can't be opened yet: %@", why);
  return std::make_shared<CKLateCloud>("the cloud in " + folder, device, [=](NSError *problem) {
    return openWhatIsThere(folder, account, device, problem);
  });
}

}  // namespace droxa::keld
