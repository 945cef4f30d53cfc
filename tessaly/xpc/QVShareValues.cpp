#include "tessaly/xpc/QVShareValues.h"

#include <kj/debug.h>
#include <utility>

namespace droxa {
namespace {

template <class Enumeration>
Enumeration readEnumeration(std::uint8_t number, Enumeration last) {
  KJ_REQUIRE(number <= static_cast<std::uint8_t>(last), "a share with an unknown role, permission or status");
  return static_cast<Enumeration>(number);
}

CKShareParticipantPermission readPermission(std::uint8_t number) {
  return readEnumeration(number, CKShareParticipantPermission::readWrite);
}

void writeParticipant(schema::Participant::Builder builder, const CKShareParticipant &participant) {
  builder.setAccountName(xpcBytes(participant.userIdentity.accountName));
  builder.setDisplayName(xpcBytes(participant.userIdentity.displayName));
  builder.setHandle(xpcBytes(participant.userIdentity.handle));
  builder.setRole(static_cast<std::uint8_t>(participant.role));
  builder.setPermission(static_cast<std::uint8_t>(participant.permission));
  builder.setAcceptanceStatus(static_cast<std::uint8_t>(participant.acceptanceStatus));
}

CKShareParticipant readParticipant(schema::Participant::Reader reader) {
  CKShareParticipant participant;
  participant.userIdentity = {xpcString(reader.getAccountName()), xpcString(reader.getDisplayName()),
                              xpcString(reader.getHandle())};
  participant.role = readEnumeration(reader.getRole(), CKShareParticipantRole::publicUser);
  participant.permission = readPermission(reader.getPermission());
  participant.acceptanceStatus =
      readEnumeration(reader.getAcceptanceStatus(), CKShareParticipantAcceptanceStatus::removed);
  return participant;
}

struct FieldWriter {
  schema::Field::Builder field;

  void operator()(std::monostate) { field.setNone(); }
  void operator()(std::int64_t value) { field.setInteger(value); }
  void operator()(double value) { field.setReal(value); }
  void operator()(const std::string &value) { field.setText(xpcBytes(value)); }
  void operator()(const NSData &value) { value ? field.setData(xpcBytes(value)) : field.setNilData(); }
  void operator()(const NSDate &value) {
    value ? field.setDate(value.nanosecondsSince1970()) : field.setNilDate();
  }
  void operator()(const std::vector<std::string> &value) {
    writeStrings(field.initTexts(xpcCount(value)), value);
  }
  void operator()(const CKAsset &) { KJ_FAIL_REQUIRE("a share's field is an asset, which can't be passed"); }
};

CKRecordValue readField(schema::Field::Reader field) {
  using Kind = schema::Field;
  switch (field.which()) {
    case Kind::NONE:
      return std::monostate();
    case Kind::INTEGER:
      return field.getInteger();
    case Kind::REAL:
      return field.getReal();
    case Kind::TEXT:
      return xpcString(field.getText());
    case Kind::DATA:
      return xpcData(field.getData());
    case Kind::DATE:
      return NSDate::dateWithNanosecondsSince1970(field.getDate());
    case Kind::TEXTS:
      return readStrings(field.getTexts());
    case Kind::NIL_DATA:
      return NSData();
    case Kind::NIL_DATE:
      return NSDate();
  }
  KJ_FAIL_REQUIRE("a share's field of an unknown kind");
}

}  // namespace

void writeRecordID(schema::RecordID::Builder builder, const CKRecordID &recordID) {
  builder.setRecordName(xpcBytes(recordID.recordName));
  builder.setZoneName(xpcBytes(recordID.zoneID.zoneName));
  builder.setOwnerName(xpcBytes(recordID.zoneID.ownerName));
}

CKRecordID readRecordID(schema::RecordID::Reader reader) {
  return {xpcString(reader.getRecordName()),
          {xpcString(reader.getZoneName()), xpcString(reader.getOwnerName())}};
}

void writeParticipants(capnp::List<schema::Participant>::Builder list,
                       const std::vector<CKShareParticipant> &participants) {
  for (unsigned index = 0; index < list.size(); ++index) writeParticipant(list[index], participants[index]);
}

std::vector<CKShareParticipant> readParticipants(capnp::List<schema::Participant>::Reader list) {
  std::vector<CKShareParticipant> participants;
  participants.reserve(list.size());
  for (const auto reader : list) participants.push_back(readParticipant(reader));
  return participants;
}

void writeShare(schema::CKShare::Builder builder, const CKShare &share) {
  setRecordID(builder, std::optional(share.recordID));
  builder.setRecordChangeTag(xpcBytes(share.recordChangeTag));
  builder.setHasModificationDate(static_cast<bool>(share.modificationDate));
  builder.setModificationDate(share.modificationDate.nanosecondsSince1970());
  builder.setModifiedByDevice(xpcBytes(share.modifiedByDevice));
  if (share.rootRecordID) writeRecordID(builder.initRootRecordID(), *share.rootRecordID);
  writeParticipants(builder.initParticipants(xpcCount(share.participants)), share.participants);
  builder.setPublicPermission(static_cast<std::uint8_t>(share.publicPermission));
  setURL(builder, share.URL);
  auto fields = builder.initFields(xpcCount(share.fields));
  unsigned index = 0;
  for (const auto &[key, value] : share.fields) {
    auto field = fields[index++];
    field.setKey(xpcBytes(key));
    std::visit(FieldWriter{field}, value);
  }
}

CKShare readShare(schema::CKShare::Reader reader) {
  CKShare share;
  share.recordID = readRecordID(reader.getRecordID());
  share.recordChangeTag = xpcString(reader.getRecordChangeTag());
  if (reader.getHasModificationDate())
    share.modificationDate = NSDate::dateWithNanosecondsSince1970(reader.getModificationDate());
  share.modifiedByDevice = xpcString(reader.getModifiedByDevice());
  if (reader.hasRootRecordID()) share.rootRecordID = readRecordID(reader.getRootRecordID());
  share.participants = readParticipants(reader.getParticipants());
  share.publicPermission = readPermission(reader.getPublicPermission());
  share.URL = getURL(reader);
  for (const auto field : reader.getFields()) share.fields[xpcString(field.getKey())] = readField(field);
  return share;
}

void writePersonName(schema::PersonName::Builder builder, const NSPersonNameComponents &name) {
  if (name.namePrefix) builder.setNamePrefix(xpcBytes(*name.namePrefix));
  if (name.givenName) builder.setGivenName(xpcBytes(*name.givenName));
  if (name.middleName) builder.setMiddleName(xpcBytes(*name.middleName));
  if (name.familyName) builder.setFamilyName(xpcBytes(*name.familyName));
  if (name.nameSuffix) builder.setNameSuffix(xpcBytes(*name.nameSuffix));
  if (name.nickname) builder.setNickname(xpcBytes(*name.nickname));
}

NSPersonNameComponents readPersonName(schema::PersonName::Reader reader) {
  NSPersonNameComponents name;
  if (reader.hasNamePrefix()) name.namePrefix = xpcString(reader.getNamePrefix());
  if (reader.hasGivenName()) name.givenName = xpcString(reader.getGivenName());
  if (reader.hasMiddleName()) name.middleName = xpcString(reader.getMiddleName());
  if (reader.hasFamilyName()) name.familyName = xpcString(reader.getFamilyName());
  if (reader.hasNameSuffix()) name.nameSuffix = xpcString(reader.getNameSuffix());
  if (reader.hasNickname()) name.nickname = xpcString(reader.getNickname());
  return name;
}

}  // namespace droxa
