#include "platform/cloudkit/embedded/ShareStamp.h"

#include "platform/cloudkit/embedded/RandomBytes.h"
#include "platform/cloudkit/embedded/StoredRecord.h"

namespace droxa::embedded {
namespace {

using Role = CKShareParticipantRole;
using Acceptance = CKShareParticipantAcceptanceStatus;

constexpr std::size_t kRandomBytesOfAURL = 24;

NSURL newURL() {
  return NSURL::URLWithString("droxa-share:" + HexOf(RandomBytes(kRandomBytesOfAURL)));
}

// The participants, one after the other.
class Stamping {
 public:
  Stamping(const Connection &connection, const Zone &zone, const CKShare &wanted,
           const std::optional<CKShare> &current)
      : connection_(connection), wanted_(wanted), current_(current) {
    stamped_.push_back({AccountByNumber(connection, zone.owner).identity, Role::owner, Permission::readWrite,
                        Acceptance::accepted});
  }

  std::vector<CKShareParticipant> run() {
    for (const CKShareParticipant &participant : wanted_.participants) {
      if (participant.role != Role::owner) add(participant);
      if (stamped_.size() > CKMostShareParticipants) {
        Fail(CKErrorCode::tooManyParticipants,
             "A share can have " + std::to_string(CKMostShareParticipants) + " participants at most");
      }
    }
    return std::move(stamped_);
  }

 private:
  void add(const CKShareParticipant &wanted) {
    CKShareParticipant participant{find(wanted.userIdentity).identity, wanted.role, wanted.permission,
                                   Acceptance::pending};
    const std::string &name = participant.userIdentity.accountName;
    if (name == stamped_.front().userIdentity.accountName) return;
    for (const CKShareParticipant &other : stamped_) {
      if (other.userIdentity.accountName == name) {
        Fail(CKErrorCode::invalidArguments, "The share names a participant twice: " + name);
      }
    }
    const CKShareParticipant *before = current_ ? current_->participantWithAccountName(name) : nullptr;
    if (before) participant.acceptanceStatus = before->acceptanceStatus;
    if (wanted.role == Role::publicUser) {
      if (!before || before->role != Role::publicUser || wanted_.publicPermission == Permission::none) return;
      participant.permission = wanted_.publicPermission;
    }
    stamped_.push_back(std::move(participant));
  }

  Account find(const CKUserIdentity &who) const {
    const bool isNamed = !who.accountName.empty();
    const auto account =
        isNamed ? AccountByName(connection_, who.accountName) : AccountByHandle(connection_, who.handle);
    if (account) return *account;
    Fail(CKErrorCode::unknownItem,
         "The cloud has no account for the participant " + (isNamed ? who.accountName : who.handle));
  }

  const Connection &connection_;
  const CKShare &wanted_;
  const std::optional<CKShare> &current_;
  std::vector<CKShareParticipant> stamped_;
};

void checkRoot(const Connection &connection, const Zone &zone, const CKShare &share) {
  if (ShareTable(connection, zone.number).byRoot(share.rootRecordID->recordName)) {
    Fail(CKErrorCode::alreadyShared, "Another share has the root " + share.rootRecordID->description());
  }
  const auto root = FindRecord(connection, zone.number, *share.rootRecordID, std::set<std::string>());
  if (!root) Fail(CKErrorCode::unknownItem, "No record to be shared: " + share.rootRecordID->description());
  if (root->recordType == CKRecordTypeShare) {
    Fail(CKErrorCode::invalidArguments, "A share can't be shared: " + share.rootRecordID->description());
  }
}

}  // namespace

CKShare StampedShare(const Connection &connection, const Zone &zone, const CKRecord &record,
                     const std::optional<CKRecord> &current) {
  std::optional<CKShare> share = CKShare::shareWithRecord(record);
  if (!share || !share->rootRecordID) {
    Fail(CKErrorCode::invalidArguments,
         "The share has no root record in its zone, or fields that can't be: " +
             record.recordID.description());
  }
  const std::optional<CKShare> before = current ? CKShare::shareWithRecord(*current) : std::nullopt;
  if (before && before->rootRecordID != share->rootRecordID) {
    Fail(CKErrorCode::invalidArguments, "A share keeps its root: " + record.recordID.description());
  }
  if (!before) checkRoot(connection, zone, *share);
  share->participants = Stamping(connection, zone, *share, before).run();
  share->URL = before ? before->URL : newURL();
  return std::move(*share);
}

CKShare ShareForInvited(CKShare share, const std::string &accountName) {
  std::erase_if(share.participants, [&](const CKShareParticipant &participant) {
    return participant.role != Role::owner && participant.userIdentity.accountName != accountName;
  });
  return share;
}

}  // namespace droxa::embedded
