#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "tessaly/QVUserDefaults.h"

namespace droxa {

// The settings for a container, by its mangled identifier; nil: those for all of them. Every container has
// the same ones. Thread contract: any thread.
class QVCUserDefaults final {
 public:
  static QVCUserDefaults defaultsForMangledID(const std::optional<std::string> & /*mangledID*/) {
    return QVCUserDefaults(QVUserDefaults::standardUserDefaults());
  }
  std::int64_t maxRecordCountInFetchRecordsOperation() const {
    return defaults_.maxRecordCountInFetchRecordsOperation();
  }

 private:
  explicit QVCUserDefaults(const QVUserDefaults &defaults) : defaults_(defaults) {}
  const QVUserDefaults &defaults_;  // lives as long as the process
};

// The settings of how much is moved between the cloud and this machine. Thread contract: any thread.
class QVRemoteUserDefaults final {
 public:
  static QVRemoteUserDefaults sharedDefaults() {
    return QVRemoteUserDefaults(QVUserDefaults::standardUserDefaults());
  }
  // Thumbnails of documents of at most that many bytes aren't worth being moved: the document is.
  std::int64_t minFileSizeForThumbnailTransfer() const { return defaults_.minFileSizeForThumbnailTransfer(); }

 private:
  explicit QVRemoteUserDefaults(const QVUserDefaults &defaults) : defaults_(defaults) {}
  const QVUserDefaults &defaults_;
};

}  // namespace droxa
