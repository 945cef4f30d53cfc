#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <variant>
#include <vector>

#include "platform/cloudkit/CKAsset.h"
#include "platform/cloudkit/CKRecordID.h"
#include "platform/foundation/NSData.h"
#include "platform/foundation/NSDate.h"

namespace droxa {

// A field's value. Strings are raw bytes. The first alternative is "no value": saving it removes the key,
// and a cloud never answers it. A nil NSData, NSDate or CKAsset is saved as no value too.
using CKRecordValue = std::variant<std::monostate, std::int64_t, double, std::string, NSData, NSDate,
                                   std::vector<std::string>, CKAsset>;

// Whether the value stands for none: monostate, or a nil NSData, NSDate or CKAsset.
bool CKRecordValueIsNone(const CKRecordValue &value);

// One record as a device made it or as the cloud answered it. A record of at most 1 MiB in all, its assets
// not counted; a larger one is refused with limitExceeded.
// Thread contract: a value.
struct CKRecord {
  std::string recordType;  // the rules for names hold; can't change while the record exists
  CKRecordID recordID;
  // Which state of the record this is; "" for one that was never saved. Opaque: compare for equality only.
  // Differs after every save, and between a record and a later one of the same name.
  std::string recordChangeTag;
  NSDate modificationDate;       // by the clock of the machine that saved it last; nil before
  std::string modifiedByDevice;  // deviceName of the cloud object that saved it last; "" before
  std::map<std::string, CKRecordValue> fields;  // keys follow the rules for names

  std::string description() const;
  bool operator==(const CKRecord &) const = default;

  // The value of a key, or null when the record has none or one of another kind.
  template <class T>
  const T *get(const std::string &key) const {
    const auto found = fields.find(key);
    return found == fields.end() ? nullptr : std::get_if<T>(&found->second);
  }
};

// The keys that an answer is to hold: all of them when absent. An empty set answers records without fields.
using CKDesiredKeys = std::optional<std::set<std::string>>;

// Whether `server` is what the cloud would hold right after `client` was saved by the device: of the same id
// and type, last saved by that device, and with every field that the client names as the client has it. A
// device that lost the reply to a save tells its own save from a conflict with this. A file asset equals no
// reference: upload it first where this matters.
bool CKServerRecordIsOwnSave(const CKRecord &client, const CKRecord &server, const std::string &deviceName);

}  // namespace droxa
