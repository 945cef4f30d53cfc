#pragma once

#include <cstdint>

#include "platform/cloudkit/CKAsset.h"

namespace droxa {

// The open file behind a file asset. A path is opened for reading without following a symbolic link and
// without waiting (a pipe is refused). Thread contract: one thread at a time; owns what it opened.
class CKAssetFile {
 public:
  // error(): assetFileNotFound, over the POSIX error, when it isn't a regular file that can be opened;
  // invalidArguments when the asset isn't a file asset.
  explicit CKAssetFile(const CKAsset &asset);
  ~CKAssetFile();
  CKAssetFile(const CKAssetFile &) = delete;
  CKAssetFile &operator=(const CKAssetFile &) = delete;

  const NSError &error() const { return error_; }
  int descriptor() const { return descriptor_; }
  std::uint64_t size() const { return size_; }

 private:
  CKAsset asset_;  // keeps its descriptor open
  int descriptor_ = -1;
  bool isOwned_ = false;
  std::uint64_t size_ = 0;
  NSError error_;
};

}  // namespace droxa
