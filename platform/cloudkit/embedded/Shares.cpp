#include "platform/cloudkit/embedded/Calls.h"
#include "platform/cloudkit/embedded/RecordSaver.h"
#include "platform/cloudkit/embedded/ShareStamp.h"
#include "platform/cloudkit/embedded/StoredRecord.h"

namespace droxa::embedded {
namespace {

using Role = CKShareParticipantRole;
using Acceptance = CKShareParticipantAcceptanceStatus;

// A share that somebody came to by its URL.
struct Visit {
  Zone zone;
  CKShare share;
  CKShareParticipant visitor;  // as the share has it, or would have it once it is accepted
};

Visit visit(const Connection &connection, const NSURL &url) {
  const std::optional<SharePlace> place = ShareByURL(connection, url);
  if (!place) Fail(CKErrorCode::unknownItem, "No share has the URL " + url.description());
  NamedZone named = ZoneByNumber(connection, place->zone);
  const CKRecordID id{place->record, named.id};
  const auto record = FindRecord(connection, place->zone, id, {});
  std::optional<CKShare> share = record ? CKShare::shareWithRecord(*record) : std::nullopt;
  if (!share) Fail(CKErrorCode::internalError, "The cloud's share is damaged: " + id.description());
  const CKUserIdentity identity = AccountByNumber(connection, connection.account).identity;
  Visit visit{named.zone, std::move(*share), {}};
  if (const CKShareParticipant *known = visit.share.participantWithAccountName(identity.accountName)) {
    visit.visitor = *known;
    return visit;
  }
  if (visit.share.publicPermission == Permission::none) {
    Fail(CKErrorCode::participantMayNeedVerification,
         "The share is for others than the account " + identity.accountName + ": " + url.description());
  }
  visit.visitor = {identity, Role::publicUser, visit.share.publicPermission, Acceptance::pending};
  return visit;
}

CKShareMetadata metadataOf(Visit visit) {
  CKShareMetadata metadata;
  if (const CKShareParticipant *owner = visit.share.owner()) metadata.owner = *owner;
  const bool isIn = visit.visitor.acceptanceStatus == Acceptance::accepted;
  metadata.share = isIn ? std::move(visit.share)
                        : ShareForInvited(std::move(visit.share), visit.visitor.userIdentity.accountName);
  metadata.participant = std::move(visit.visitor);
  return metadata;
}

// The share with the visitor as one of those who have accepted it.
void accept(Visit &visit) {
  visit.visitor.acceptanceStatus = Acceptance::accepted;
  for (CKShareParticipant &participant : visit.share.participants) {
    if (participant.userIdentity.accountName != visit.visitor.userIdentity.accountName) continue;
    participant.acceptanceStatus = Acceptance::accepted;
    return;
  }
  if (visit.share.participants.size() >= CKMostShareParticipants) {
    Fail(CKErrorCode::tooManyParticipants, "The share takes no more participants");
  }
  visit.share.participants.push_back(visit.visitor);
}

}  // namespace

CKShareMetadataReply FetchShareMetadata(Home &home, const NSURL &url, const CKCallContext &context) {
  CKShareMetadataReply reply;
  reply.error = home.run(Home::Access::read, context, [&](const Connection &connection) {
    reply.metadata = metadataOf(visit(connection, url));
  });
  return reply;
}

CKShareMetadataReply AcceptShare(Home &home, const NSURL &url, const CKCallContext &context) {
  CKShareMetadataReply reply;
  const NSError error = home.run(Home::Access::write, context, [&](const Connection &connection) {
    Visit visit = embedded::visit(connection, url);
    if (visit.visitor.permission == Permission::none) {
      Fail(CKErrorCode::permissionFailure, "The account may not see what is shared: " + url.description());
    }
    if (visit.visitor.acceptanceStatus != Acceptance::accepted) {
      accept(visit);
      RecordSaver saver(home, connection);
      const CKRecord record = saver.rewriteShare(visit.zone, visit.share);
      saver.finish();
      if (auto share = CKShare::shareWithRecord(record)) visit.share = std::move(*share);
    }
    reply.metadata = metadataOf(std::move(visit));
  });
  return error ? CKShareMetadataReply{error, {}} : reply;
}

}  // namespace droxa::embedded
