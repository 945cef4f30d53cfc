#include "platform/cloudkit/CKAssetFile.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/cloudkit/CKError.h"

namespace droxa {

CKAssetFile::CKAssetFile(const CKAsset &asset) : asset_(asset), descriptor_(asset.descriptor()) {
  if (!asset.isFile()) {
    error_ = CKErrorMake(CKErrorCode::invalidArguments, "Not a file: " + asset.description());
    return;
  }
  if (descriptor_ < 0) {
    descriptor_ = open(asset.path().c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY);
    isOwned_ = true;
  }
  struct stat status {};
  int code = 0;
  if (descriptor_ < 0 || fstat(descriptor_, &status) != 0) {
    code = errno;
  } else if (!S_ISREG(status.st_mode)) {
    code = S_ISDIR(status.st_mode) ? EISDIR : EINVAL;
  }
  if (code != 0) {
    error_ = CKErrorMake(CKErrorCode::assetFileNotFound, "Can't upload " + asset.description(),
                         NSError::errorWithPOSIXCode(code));
    return;
  }
  size_ = static_cast<std::uint64_t>(status.st_size);
}

CKAssetFile::~CKAssetFile() {
  if (isOwned_ && descriptor_ >= 0) close(descriptor_);
}

}  // namespace droxa
