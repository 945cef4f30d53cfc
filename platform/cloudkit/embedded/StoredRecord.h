#pragma once

#include <optional>

#include "platform/cloudkit/embedded/Zone.h"

namespace droxa::embedded {

// The columns of a record's row that ReadRecord reads, in its order.
#define DROXA_RECORD_COLUMNS "name, type, tag, time, device, fields"

// The record of the row, which must begin with DROXA_RECORD_COLUMNS. A share comes with all its fields,
// whatever keys are desired. Throws CallFailed: internalError when
// its fields can't be read.
CKRecord ReadRecord(const SqlUse &row, const CKRecordZoneID &zone, const CKDesiredKeys &desiredKeys);

// The record as the cloud has it; absent when it has none.
std::optional<CKRecord> FindRecord(const Connection &connection, std::int64_t zone, const CKRecordID &id,
                                   const CKDesiredKeys &desiredKeys);

// Takes back what a record, or all records of a zone, refer to: the time of grace of those assets begins.
void ReleaseAssets(const Connection &connection, const Zone &zone, const std::string &record);
void ReleaseZoneAssets(const Connection &connection, const Zone &zone);

std::int64_t SecondsNow();  // since 1970

}  // namespace droxa::embedded
