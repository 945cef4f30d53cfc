#pragma once

#include <chrono>
#include <cstdint>
#include <map>
#include <optional>
#include <string>

#include "platform/cloudkit/CKRecord.h"
#include "platform/foundation/NSError.h"

namespace droxa {

inline constexpr char CKErrorDomain[] = "CKErrorDomain";
inline constexpr char CKErrorRetryAfterKey[] = "CKErrorRetryAfter";  // milliseconds, an integer
inline constexpr char CKRecordChangedErrorServerRecordKey[] = "ServerRecord";

// What a cloud answers. "Transient" errors are worth another try with the same request.
enum class CKErrorCode : std::int64_t {
  internalError = 1,         // the back end failed in a way that trying again doesn't mend
  partialFailure = 2,        // of the whole call: some records failed, each has its own error
  networkUnavailable = 3,    // transient: no way to the cloud
  networkFailure = 4,        // transient: broke on the way, or a deadline passed (CKErrorIsTimeout)
  serviceUnavailable = 6,    // transient: the cloud is there and can't answer now
  requestRateLimited = 7,    // transient: wait for the retry-after value
  notAuthenticated = 9,      // the account isn't signed in, or not any more
  permissionFailure = 10,    // the account may not do that with what others share with it
  unknownItem = 11,          // no such record, asset, share or account
  invalidArguments = 12,     // a name, a type or a value that a cloud never takes
  serverRecordChanged = 14,  // a conflict; CKErrorServerRecord() gives the record as the cloud has it
  assetFileNotFound = 16,  // the file to be uploaded isn't there; or a saved reference names unknown contents
  assetFileModified = 17,  // the file changed while it was uploaded, or isn't of the size told
  operationCancelled = 20,
  changeTokenExpired = 21,  // the token is of another cloud or zone: fetch all changes from the start
  batchRequestFailed = 22,  // of a record in an atomic call: fine by itself, another one failed
  zoneBusy = 23,            // transient: another writer holds it
  quotaExceeded = 25,
  zoneNotFound = 26,
  limitExceeded = 27,        // too many records in a call, or a record that is too large: send less
  tooManyParticipants = 29,  // CKMostShareParticipants
  alreadyShared = 30,        // another share has that root
  participantMayNeedVerification = 33,  // the share is for others; perhaps this person by another account
  assetNotAvailable = 35,               // the cloud should have these contents and can't give them intact
};

// Makes an error of CKErrorDomain; `underlying` may be nil.
NSError CKErrorMake(CKErrorCode code, std::string description, NSError underlying = {});
NSError CKErrorMakeRetryAfter(CKErrorCode code, std::string description,
                              std::chrono::milliseconds retryAfter);
NSError CKErrorMakeServerRecordChanged(CKRecord serverRecord);
NSError CKErrorMakeTimeout(std::string description);  // networkFailure over ETIMEDOUT

bool CKErrorIs(const NSError &error, CKErrorCode code);
// networkUnavailable, networkFailure, serviceUnavailable, requestRateLimited and zoneBusy.
bool CKErrorIsTransient(const NSError &error);
bool CKErrorIsTimeout(const NSError &error);  // the call's own deadline passed
// How long the cloud asked to be left alone; absent when it didn't.
std::optional<std::chrono::milliseconds> CKErrorRetryAfter(const NSError &error);
// The record that the cloud holds, with all its fields. Absent unless the error is serverRecordChanged.
std::optional<CKRecord> CKErrorServerRecord(const NSError &error);

}  // namespace droxa
