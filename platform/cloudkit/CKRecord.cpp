#include "platform/cloudkit/CKRecord.h"

#include "platform/cloudkit/CKShare.h"

namespace droxa {
namespace {

struct IsNone {
  bool operator()(std::monostate) const { return true; }
  bool operator()(const NSData &data) const { return !data; }
  bool operator()(const NSDate &date) const { return !date; }
  bool operator()(const CKAsset &asset) const { return !asset; }
  template <class T>
  bool operator()(const T &) const {
    return false;
  }
};

}  // namespace

bool CKRecordValueIsNone(const CKRecordValue &value) {
  return std::visit(IsNone(), value);
}

std::string CKRecord::description() const {
  std::string text = recordType + " " + recordID.description() + " tag " +
                     (recordChangeTag.empty() ? "(none)" : recordChangeTag) + " {";
  const char *separator = "";
  for (const auto &field : fields) {
    text += separator + field.first;
    separator = ", ";
  }
  return text + "}";
}

bool CKServerRecordIsOwnSave(const CKRecord &client, const CKRecord &server, const std::string &deviceName) {
  if (client.recordID != server.recordID || client.recordType != server.recordType ||
      server.modifiedByDevice != deviceName) {
    return false;
  }
  if (client.recordType == CKRecordTypeShare) {
    const auto clientShare = CKShare::shareWithRecord(client);
    const auto serverShare = CKShare::shareWithRecord(server);
    return clientShare && serverShare && CKServerShareIsOwnSave(*clientShare, *serverShare);
  }
  for (const auto &[key, value] : client.fields) {
    const auto found = server.fields.find(key);
    const bool isAbsent = found == server.fields.end();
    if (CKRecordValueIsNone(value) ? !isAbsent : (isAbsent || found->second != value)) return false;
  }
  return true;
}

}  // namespace droxa
