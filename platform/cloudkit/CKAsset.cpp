#include "platform/cloudkit/CKAsset.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <unistd.h>

namespace droxa {

bool CKAssetReference::isWellFormed() const {
  return sha256.size() == 64 && std::all_of(sha256.begin(), sha256.end(), [](char c) {
           return (c >= '0' && c <= '9') || (c >= 'a' && c <= 'f');
         });
}

std::string CKAssetReference::description() const {
  return sha256 + " (" + std::to_string(size) + " bytes)";
}

CKAsset CKAsset::assetWithReference(CKAssetReference reference) {
  CKAsset asset;
  asset.kind_ = Kind::reference;
  asset.reference_ = std::move(reference);
  return asset;
}

CKAsset CKAsset::assetWithFileAtPath(std::string path) {
  CKAsset asset;
  asset.kind_ = Kind::path;
  asset.path_ = std::move(path);
  return asset;
}

CKAsset CKAsset::assetWithDescriptor(int descriptor, NSError *error) {
  const int duplicate = fcntl(descriptor, F_DUPFD_CLOEXEC, 0);
  if (duplicate < 0) {
    if (error) *error = NSError::errorWithPOSIXCode(errno);
    return {};
  }
  CKAsset asset;
  asset.kind_ = Kind::descriptor;
  asset.descriptor_ = std::shared_ptr<const int>(new int(duplicate), [](const int *owned) {
    close(*owned);
    delete owned;
  });
  return asset;
}

int CKAsset::descriptor() const {
  return descriptor_ ? *descriptor_ : -1;
}

NSURL CKAsset::fileURL() const {
  if (kind_ == Kind::path) return NSURL::fileURLWithPath(path_);
  if (kind_ == Kind::descriptor)
    return NSURL::fileURLWithPath("/proc/self/fd/" + std::to_string(descriptor()));
  return {};
}

std::string CKAsset::description() const {
  switch (kind_) {
    case Kind::nil:
      return "(null)";
    case Kind::reference:
      return reference_.description();
    case Kind::path:
      return "file " + path_;
    case Kind::descriptor:
      return "file descriptor " + std::to_string(descriptor());
  }
  return {};
}

}  // namespace droxa
