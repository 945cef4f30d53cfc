#include "platform/cloudkit/CKError.h"

#include <cerrno>
#include <memory>

namespace droxa {
namespace {

// A record inside an error's user info.
class RecordBox final : public NSObject {
 public:
  explicit RecordBox(CKRecord record) : record_(std::move(record)) {}
  std::string description() const override { return record_.description(); }
  const CKRecord &record() const { return record_; }

 private:
  const CKRecord record_;
};

NSUserInfo userInfo(std::string description, NSError underlying) {
  NSUserInfo info;
  if (!description.empty()) info[NSLocalizedDescriptionKey] = std::move(description);
  if (underlying) info[NSUnderlyingErrorKey] = std::move(underlying);
  return info;
}

NSError make(CKErrorCode code, NSUserInfo info) {
  return {CKErrorDomain, static_cast<std::int64_t>(code), std::move(info)};
}

}  // namespace

NSError CKErrorMake(CKErrorCode code, std::string description, NSError underlying) {
  return make(code, userInfo(std::move(description), std::move(underlying)));
}

NSError CKErrorMakeRetryAfter(CKErrorCode code, std::string description,
                              std::chrono::milliseconds retryAfter) {
  NSUserInfo info = userInfo(std::move(description), {});
  info[CKErrorRetryAfterKey] = std::int64_t{retryAfter.count()};
  return make(code, std::move(info));
}

NSError CKErrorMakeServerRecordChanged(CKRecord serverRecord) {
  NSUserInfo info =
      userInfo("The cloud has another state of the record " + serverRecord.recordID.description(), {});
  const std::shared_ptr<const NSObject> box = std::make_shared<RecordBox>(std::move(serverRecord));
  info[CKRecordChangedErrorServerRecordKey] = box;
  return make(CKErrorCode::serverRecordChanged, std::move(info));
}

NSError CKErrorMakeTimeout(std::string description) {
  return CKErrorMake(CKErrorCode::networkFailure, std::move(description),
                     NSError::errorWithPOSIXCode(ETIMEDOUT));
}

bool CKErrorIs(const NSError &error, CKErrorCode code) {
  return error.is(CKErrorDomain, static_cast<std::int64_t>(code));
}

bool CKErrorIsTransient(const NSError &error) {
  using enum CKErrorCode;
  for (const CKErrorCode code :
       {networkUnavailable, networkFailure, serviceUnavailable, requestRateLimited, zoneBusy}) {
    if (CKErrorIs(error, code)) return true;
  }
  return false;
}

bool CKErrorIsTimeout(const NSError &error) {
  return CKErrorIs(error, CKErrorCode::networkFailure) &&
         error.underlyingError().is(NSPOSIXErrorDomain, ETIMEDOUT);
}

std::optional<std::chrono::milliseconds> CKErrorRetryAfter(const NSError &error) {
  const auto found = error.userInfo().find(CKErrorRetryAfterKey);
  if (found == error.userInfo().end()) return std::nullopt;
  const auto *milliseconds = std::get_if<std::int64_t>(&found->second);
  if (!milliseconds || *milliseconds < 0) return std::nullopt;
  return std::chrono::milliseconds(*milliseconds);
}

std::optional<CKRecord> CKErrorServerRecord(const NSError &error) {
  if (!CKErrorIs(error, CKErrorCode::serverRecordChanged)) return std::nullopt;
  const auto found = error.userInfo().find(CKRecordChangedErrorServerRecordKey);
  if (found == error.userInfo().end()) return std::nullopt;
  const auto *object = std::get_if<std::shared_ptr<const NSObject>>(&found->second);
  const auto *box = object ? dynamic_cast<const RecordBox *>(object->get()) : nullptr;
  if (!box) return std::nullopt;
  return box->record();
}

}  // namespace droxa
