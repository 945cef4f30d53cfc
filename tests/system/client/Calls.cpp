#include "tests/system/client/Calls.h"

namespace droxa::testing {

namespace {

using Answer = std::function<void(const NSError &error)>;

// A reply of any call: its error is the last value.
struct Reply {
  Answer answer;
  template <class... Values>
  void operator()(const Values &...values) const {
    const NSError *error = nullptr;
    ((error = last(values)), ...);
    answer(*error);
  }
  static const NSError *last(const NSError &error) { return &error; }
  template <class Value>
  static const NSError *last(const Value &) {
    return nullptr;
  }
};

QVShareParticipants somebody() {
  CKShareParticipant participant;
  participant.userIdentity.accountName = "somebody that the cloud may not know";
  return QVShareParticipants({participant});
}

struct Call {
  const char *name;
  void (*make)(QVShareOperationProtocol &remote, const NSURL &url, const Reply &reply);
};
using Remote = QVShareOperationProtocol;

constexpr Call kAll[kCalls] = {
    {"toCopySharingInfoAtURL",
     [](Remote &remote, const NSURL &url, const Reply &reply) {
       remote.startOperation_toCopySharingInfoAtURL(nullptr, url, reply);
     }},
    {"toCopyShareURLForShare",
     [](Remote &remote, const NSURL &, const Reply &reply) {
       remote.startOperation_toCopyShareURLForShare(nullptr, std::nullopt, std::nullopt, reply);
     }},
    {"toSaveSharingInfo",
     [](Remote &remote, const NSURL &, const Reply &reply) {
       remote.startOperation_toSaveSharingInfo(nullptr, std::nullopt, reply);
     }},
    {"createSharingInfoForURL", [](Remote &remote, const NSURL &url,
                                   const Reply &reply) { remote.createSharingInfoForURL(url, reply); }},
    {"toUnshareShare",
     [](Remote &remote, const NSURL &, const Reply &reply) {
       remote.startOperation_toUnshareShare(nullptr, std::nullopt, false, reply);
     }},
    {"toModifyRecordAccessAtURL",
     [](Remote &remote, const NSURL &, const Reply &reply) {
       remote.startOperation_toModifyRecordAccessAtURL(nullptr, NSURL(), true, reply);
     }},
    {"toLookupShareParticipants",
     [](Remote &remote, const NSURL &, const Reply &reply) {
       remote.startOperation_toLookupShareParticipants(nullptr, somebody(), reply);
     }},
    {"toCopyParticipantTokenAtURL",
     [](Remote &remote, const NSURL &url, const Reply &reply) {
       remote.startOperation_toCopyParticipantTokenAtURL(nullptr, url, reply);
     }},
    {"toPrepFolderForSharingAt",
     [](Remote &remote, const NSURL &url, const Reply &reply) {
       remote.startOperation_toPrepFolderForSharingAt(nullptr, url, reply);
     }},
    {"copyCurrentUserNameAndDisplayHandle",
     [](Remote &remote, const NSURL &, const Reply &reply) {
       remote.copyCurrentUserNameAndDisplayHandleWithReply(reply);
     }},
    {"toCopyDocumentURLForRecordID",
     [](Remote &remote, const NSURL &, const Reply &reply) {
       remote.startOperation_toCopyDocumentURLForRecordID(nullptr, std::nullopt, false, reply);
     }},
    {"toProcessSubitemsAtURL",
     [](Remote &remote, const NSURL &url, const Reply &reply) {
       remote.startOperation_toProcessSubitemsAtURL(nullptr, url, 0, QVProcessCheckSubshares, reply);
     }},
};

}  // namespace

const char *nameOfCall(int call) {
  return kAll[call].name;
}

void makeCall(int call, QVShareOperationProtocol &remote, const NSURL &url, const Answer &answer) {
  kAll[call].make(remote, url, Reply{answer});
}

}  // namespace droxa::testing
