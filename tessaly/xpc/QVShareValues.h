#pragma once

#include <memory>
#include <optional>
#include <string>

#include "platform/xpc/capnp/Session.h"
#include "platform/xpc/capnp/Values.h"
#include "tessaly/QVShareOperationProtocol.h"
#include "tessaly/xpc/QVShareOperation.capnp.h"

// The values of the sharing operations into and out of messages; see platform/xpc/capnp/Values.h.

namespace droxa {

// A share with an asset in its fields is refused.
void writeShare(schema::CKShare::Builder builder, const CKShare &share);
CKShare readShare(schema::CKShare::Reader reader);
void writeRecordID(schema::RecordID::Builder builder, const CKRecordID &recordID);
CKRecordID readRecordID(schema::RecordID::Reader reader);
void writeParticipants(capnp::List<schema::Participant>::Builder list,
                       const std::vector<CKShareParticipant> &participants);
std::vector<CKShareParticipant> readParticipants(capnp::List<schema::Participant>::Reader list);
void writePersonName(schema::PersonName::Builder builder, const NSPersonNameComponents &name);
NSPersonNameComponents readPersonName(schema::PersonName::Reader reader);

// The set… and get… forms take the message that has the field.
template <class Builder>
void setShare(Builder message, const std::optional<CKShare> &share) {
  if (share) writeShare(message.initShare(), *share);
}
template <class Reader>
std::optional<CKShare> getShare(Reader message) {
  return message.hasShare() ? std::optional(readShare(message.getShare())) : std::nullopt;
}
template <class Builder>
void setRecordID(Builder message, const std::optional<CKRecordID> &recordID) {
  if (recordID) writeRecordID(message.initRecordID(), *recordID);
}
template <class Reader>
std::optional<CKRecordID> getRecordID(Reader message) {
  return message.hasRecordID() ? std::optional(readRecordID(message.getRecordID())) : std::nullopt;
}
template <class Builder>
void setParticipants(Builder message, const QVShareParticipants &participants) {
  if (participants) writeParticipants(message.initParticipants(xpcCount(*participants)), *participants);
}
template <class Reader>
QVShareParticipants getParticipants(Reader message) {
  return message.hasParticipants() ? std::optional(readParticipants(message.getParticipants()))
                                   : std::nullopt;
}

}  // namespace droxa
