#pragma once

#include <map>
#include <optional>
#include <string>
#include <string_view>

#include "platform/cloudkit/CKRecord.h"

namespace droxa::embedded {

using Fields = std::map<std::string, CKRecordValue>;

// The stored form of a record's fields: each a kind, a key and a value, numbers in little-endian order.
// Values that are none are left out; file assets have no stored form and must not occur. Thread contract:
// pure functions.
std::string EncodeFields(const Fields &fields);
// Absent when the bytes aren't such a form.
std::optional<Fields> DecodeFields(std::string_view bytes, const CKDesiredKeys &desiredKeys);

}  // namespace droxa::embedded
