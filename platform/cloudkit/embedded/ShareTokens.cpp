#include "platform/cloudkit/embedded/Calls.h"
#include "platform/cloudkit/embedded/ShareTable.h"
#include "platform/cloudkit/embedded/ShareToken.h"
#include "platform/cloudkit/embedded/StoredRecord.h"

namespace droxa::embedded {
namespace {

std::string keyOf(const Connection &connection) {
  SqlUse row = connection.use("SELECT key FROM cloud");
  if (!row.step() || row.bytes(0).empty()) {
    Fail(CKErrorCode::internalError, "The cloud's database has no key");
  }
  return row.text(0);
}

// Whether the account sees what the share shares.
bool isIn(const Connection &connection, std::int64_t account, const Zone &zone, ShareNumber share) {
  return account == zone.owner ||
         ShareTable(connection, zone.number).permissionOf(account, {share}) != Permission::none;
}

// The record of the innermost share that the record is in and that the account sees; "" when there is none.
std::string shareOf(const Connection &connection, const Zone &zone, const std::string &record) {
  if (!zone.hasShares) return {};
  const ShareTable table(connection, zone.number);
  for (const std::string &step : Hierarchy(connection, zone.number).wayUp(record)) {
    const auto place = table.byRoot(step);
    if (place && isIn(connection, connection.account, zone, place->share)) return place->record;
  }
  return {};
}

// Whether the token's account still has what the token says.
bool isStillTrue(const Connection &connection, const Zone &zone, const ShareToken &token) {
  if (!AccountSees(connection, token.account, zone.number, token.record)) return false;
  if (token.kind == CKShareTokenKind::base || token.share.empty()) return true;
  const ShareTable table(connection, zone.number);
  const auto place = table.byRecord(token.share);
  if (!place || !isIn(connection, token.account, zone, place->share)) return false;
  for (const std::string &step : Hierarchy(connection, zone.number).wayUp(token.record)) {
    if (step == place->root) return true;
  }
  return false;
}

// The zone, as far as the account that asks sees the record in it.
NamedZone zoneForAsker(const Connection &connection, const ShareToken &token) {
  if (AccountSees(connection, connection.account, token.zone, token.record)) {
    NamedZone named = ZoneByNumber(connection, token.zone);
    const CKRecordID id{token.record, named.id};
    if (FindRecord(connection, token.zone, id, std::set<std::string>())) return named;
  }
  Fail(CKErrorCode::unknownItem, "The token is of a record that isn't there for this account");
}

}  // namespace

CKShareTokens ShareTokens(Home &home, const CKRecordID &record, const CKCallContext &context) {
  if (!CKNameIsValid(record.recordName) || !CKNameIsValid(record.zoneID.zoneName)) {
    return {
        CKErrorMake(CKErrorCode::invalidArguments, "No record can be named " + record.description()), {}, {}};
  }
  CKShareTokens tokens;
  tokens.error = home.run(Home::Access::read, context, [&](const Connection &connection) {
    const Zone zone = FindZone(connection, record.zoneID);
    if (!Sees(connection, zone, record.recordName) ||
        !FindRecord(connection, zone.number, record, std::set<std::string>())) {
      Fail(CKErrorCode::unknownItem, "No record " + record.description());
    }
    ShareToken token{CKShareTokenKind::base, connection.cloud,  zone.number,
                     connection.account,     record.recordName, {}};
    const std::string key = keyOf(connection);
    tokens.baseToken = token.sealed(key);
    token.kind = CKShareTokenKind::share;
    token.share = shareOf(connection, zone, record.recordName);
    tokens.shareToken = token.sealed(key);
  });
  return tokens;
}

CKShareTokenReply VerifyShareToken(Home &home, const std::string &token, const CKCallContext &context) {
  CKShareTokenReply reply;
  const NSError error = home.run(Home::Access::read, context, [&](const Connection &connection) {
    const std::optional<ShareToken> opened = ShareToken::open(token, keyOf(connection));
    if (!opened || opened->cloud != connection.cloud) {
      Fail(CKErrorCode::invalidArguments, "This cloud gave no such token");
    }
    const NamedZone named = zoneForAsker(connection, *opened);
    if (!isStillTrue(connection, named.zone, *opened)) {
      Fail(CKErrorCode::permissionFailure, "The account of the token doesn't see the record any more");
    }
    reply.kind = opened->kind;
    reply.recordID = {opened->record, named.id};
    reply.accountName = AccountByNumber(connection, opened->account).identity.accountName;
  });
  return error ? CKShareTokenReply{error, {}, {}, {}} : reply;
}

}  // namespace droxa::embedded
