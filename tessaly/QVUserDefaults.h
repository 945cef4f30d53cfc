#pragma once

#include <cstdint>
#include <string_view>

namespace droxa {

// The library's settings: <configuration folder>/defaults.json over built-in values. Read once.
// Thread contract: any thread.
class QVUserDefaults final {
 public:
  static const QVUserDefaults &standardUserDefaults();
  static void forget();  // for tests: the next access reads the file again

  std::int64_t maxRecordCountInFetchRecordsOperation() const {
    return maxRecordCountInFetchRecordsOperation_;
  }
  std::int64_t minFileSizeForThumbnailTransfer() const { return minFileSizeForThumbnailTransfer_; }
  // How long a call to the daemon may take before its error handler is called.
  std::int64_t daemonCallDeadlineMilliseconds() const { return daemonCallDeadlineMilliseconds_; }

 private:
  QVUserDefaults();
  std::int64_t maxRecordCountInFetchRecordsOperation_ = 200;
  std::int64_t minFileSizeForThumbnailTransfer_ = 64 * 1024;
  std::int64_t daemonCallDeadlineMilliseconds_ = 30000;
};

}  // namespace droxa
