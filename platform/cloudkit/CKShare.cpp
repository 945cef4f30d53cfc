#include "platform/cloudkit/CKShare.h"

#include <algorithm>

#include "platform/foundation/UUID.h"

namespace droxa {
namespace {

// The keys that hold what isn't a field of the share's own.
constexpr char kRootKey[] = "rootRecord";
constexpr char kParticipantsKey[] = "participants";
constexpr char kPublicPermissionKey[] = "publicPermission";
constexpr char kURLKey[] = "url";

bool isReserved(const std::string &key) {
  return key == kRootKey || key == kParticipantsKey || key == kPublicPermissionKey || key == kURLKey;
}

// The parts of an identity and three digits, with NUL, which no name holds, between them.
std::string encode(const CKShareParticipant &participant) {
  const CKUserIdentity &who = participant.userIdentity;
  std::string text;
  for (const std::string &part : {who.accountName, who.displayName, who.handle}) text += part + '\0';
  text += static_cast<char>('0' + static_cast<int>(participant.role));
  text += static_cast<char>('0' + static_cast<int>(participant.permission));
  text += static_cast<char>('0' + static_cast<int>(participant.acceptanceStatus));
  return text;
}

std::optional<CKShareParticipant> decode(std::string_view text) {
  CKShareParticipant participant;
  CKUserIdentity &who = participant.userIdentity;
  for (std::string *part : {&who.accountName, &who.displayName, &who.handle}) {
    const std::size_t end = text.find('\0');
    if (end == std::string_view::npos) return std::nullopt;
    *part = text.substr(0, end);
    text.remove_prefix(end + 1);
  }
  const bool isWhole =
      text.size() == 3 && std::all_of(text.begin(), text.end(), [](char c) { return c >= '0' && c <= '2'; });
  if (!isWhole) return std::nullopt;
  participant.role = static_cast<CKShareParticipantRole>(text[0] - '0');
  participant.permission = static_cast<CKShareParticipantPermission>(text[1] - '0');
  participant.acceptanceStatus = static_cast<CKShareParticipantAcceptanceStatus>(text[2] - '0');
  return participant;
}

bool readParticipants(const CKRecord &record, CKShare &share) {
  const auto *encoded = record.get<std::vector<std::string>>(kParticipantsKey);
  if (!encoded) return !record.fields.contains(kParticipantsKey);
  for (const std::string &text : *encoded) {
    std::optional<CKShareParticipant> participant = decode(text);
    if (!participant) return false;
    share.participants.push_back(std::move(*participant));
  }
  return true;
}

const char *text(CKShareParticipantPermission permission) {
  constexpr const char *kTexts[] = {"none", "readOnly", "readWrite"};
  return kTexts[static_cast<std::size_t>(permission)];
}

// Whether every participant that one names, its owner aside, has the same permission in the other.
bool areNamedIn(const CKShare &one, const CKShare &other) {
  return std::all_of(one.participants.begin(), one.participants.end(), [&](const CKShareParticipant &named) {
    if (named.role != CKShareParticipantRole::privateUser) return true;
    const CKUserIdentity &who = named.userIdentity;
    return std::any_of(other.participants.begin(), other.participants.end(), [&](const auto &candidate) {
      const bool isSame = who.accountName.empty() || candidate.userIdentity.accountName.empty()
                              ? candidate.userIdentity.handle == who.handle
                              : candidate.userIdentity.accountName == who.accountName;
      return isSame &&
             (candidate.role == CKShareParticipantRole::owner || candidate.permission == named.permission);
    });
  });
}

}  // namespace

std::string CKUserIdentity::description() const {
  return accountName + " (" + displayName + ", " + handle + ")";
}

std::string CKShareParticipant::description() const {
  constexpr const char *kRoles[] = {"owner", "privateUser", "publicUser"};
  constexpr const char *kStatuses[] = {"pending", "accepted", "removed"};
  return userIdentity.description() + " " + kRoles[static_cast<std::size_t>(role)] + " " + text(permission) +
         " " + kStatuses[static_cast<std::size_t>(acceptanceStatus)];
}

CKShare CKShare::shareWithRootRecordID(const CKRecordID &root) {
  CKShare share;
  share.recordID = {"share-" + UUID::generate().description(), root.zoneID};
  share.rootRecordID = root;
  return share;
}

std::optional<CKShare> CKShare::shareWithRecord(const CKRecord &record) {
  if (record.recordType != CKRecordTypeShare) return std::nullopt;
  CKShare share;
  share.recordID = record.recordID;
  share.recordChangeTag = record.recordChangeTag;
  share.modificationDate = record.modificationDate;
  share.modifiedByDevice = record.modifiedByDevice;
  if (const auto *root = record.get<std::string>(kRootKey)) {
    share.rootRecordID = CKRecordID{*root, record.recordID.zoneID};
  }
  if (const auto *permission = record.get<std::int64_t>(kPublicPermissionKey)) {
    if (*permission < 0 || *permission > 2) return std::nullopt;
    share.publicPermission = static_cast<CKShareParticipantPermission>(*permission);
  }
  if (const auto *url = record.get<std::string>(kURLKey)) share.URL = NSURL::URLWithString(*url);
  if (!readParticipants(record, share)) return std::nullopt;
  for (const auto &[key, value] : record.fields) {
    if (!isReserved(key)) share.fields.emplace(key, value);
  }
  return share;
}

CKRecord CKShare::record() const {
  CKRecord record;
  record.recordType = CKRecordTypeShare;
  record.recordID = recordID;
  record.recordChangeTag = recordChangeTag;
  record.modificationDate = modificationDate;
  record.modifiedByDevice = modifiedByDevice;
  record.fields = fields;
  record.fields.erase(kURLKey);
  record.fields.erase(kRootKey);
  // A root of another zone can't be shared: it is as if there was none.
  if (rootRecordID && rootRecordID->zoneID == recordID.zoneID) {
    record.fields[kRootKey] = rootRecordID->recordName;
  }
  record.fields[kPublicPermissionKey] = static_cast<std::int64_t>(publicPermission);
  if (URL) record.fields[kURLKey] = URL.absoluteString();
  std::vector<std::string> encoded;
  for (const CKShareParticipant &participant : participants) encoded.push_back(encode(participant));
  record.fields[kParticipantsKey] = std::move(encoded);
  return record;
}

const CKShareParticipant *CKShare::owner() const {
  const auto found = std::find_if(
      participants.begin(), participants.end(),
      [](const CKShareParticipant &candidate) { return candidate.role == CKShareParticipantRole::owner; });
  return found == participants.end() ? nullptr : &*found;
}

const CKShareParticipant *CKShare::participantWithAccountName(const std::string &accountName) const {
  const auto found = std::find_if(
      participants.begin(), participants.end(),
      [&](const CKShareParticipant &candidate) { return candidate.userIdentity.accountName == accountName; });
  return found == participants.end() ? nullptr : &*found;
}

std::string CKShare::description() const {
  std::string said = "share " + recordID.description() + " of " +
                     (rootRecordID ? rootRecordID->description() : "nothing") + " public " +
                     text(publicPermission) + " {";
  const char *separator = "";
  for (const CKShareParticipant &participant : participants) {
    said += separator + participant.description();
    separator = ", ";
  }
  return said + "}";
}

std::string CKShareMetadata::description() const {
  return share.description() + " for " + participant.description();
}

bool CKServerShareIsOwnSave(const CKShare &client, const CKShare &server) {
  if (client.recordID != server.recordID || client.rootRecordID != server.rootRecordID ||
      client.publicPermission != server.publicPermission) {
    return false;
  }
  for (const auto &[key, value] : client.fields) {
    const auto found = server.fields.find(key);
    const bool isAbsent = found == server.fields.end();
    if (CKRecordValueIsNone(value) ? !isAbsent : (isAbsent || found->second != value)) return false;
  }
  return areNamedIn(client, server) && areNamedIn(server, client);
}

}  // namespace droxa
