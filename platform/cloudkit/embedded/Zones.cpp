#include <algorithm>

#include "platform/cloudkit/embedded/Calls.h"
#include "platform/cloudkit/embedded/StoredRecord.h"

namespace droxa::embedded {
namespace {

void listOwn(const Connection &connection, std::vector<CKRecordZoneID> &zones) {
  SqlUse row = connection.use("SELECT name FROM zones WHERE account = ?");
  row.bind(connection.account);
  while (row.step()) zones.push_back({row.text(0)});
}

void listShared(const Connection &connection, std::vector<CKRecordZoneID> &zones) {
  SqlUse row = connection.use(
      "SELECT DISTINCT zones.name, accounts.name FROM share_access JOIN shares ON shares.id = share"
      " JOIN zones ON zones.id = shares.zone JOIN accounts ON accounts.id = zones.account"
      " WHERE share_access.account = ?");
  row.bind(connection.account);
  while (row.step()) zones.push_back({row.text(0), row.text(1)});
}

void forgetShares(const Connection &connection, const Zone &zone) {
  for (const char *sql : {"DELETE FROM share_access WHERE share IN (SELECT id FROM shares WHERE zone = ?)",
                          "DELETE FROM shares WHERE zone = ?", "DELETE FROM hierarchy WHERE zone = ?",
                          "DELETE FROM view_records WHERE view IN (SELECT id FROM views WHERE zone = ?)",
                          "DELETE FROM views WHERE zone = ?"}) {
    connection.use(sql).bind(zone.number).run();
  }
}

}  // namespace

NSError SaveZone(Home &home, const CKRecordZoneID &zone, const CKCallContext &context) {
  const bool isShared = home.scope() == CKDatabaseScope::sharedDatabase;
  if (!CKNameIsValid(zone.zoneName) || (!isShared && zone.ownerName != CKCurrentUserDefaultName)) {
    return CKErrorMake(CKErrorCode::invalidArguments, "A zone can't be named " + zone.description());
  }
  if (isShared) {
    return CKErrorMake(CKErrorCode::permissionFailure, "Only its owner makes a zone: " + zone.description());
  }
  return home.run(Home::Access::write, context, [&](const Connection &connection) {
    connection.use("INSERT OR IGNORE INTO zones (account, name, session) VALUES (?, ?, ?)")
        .bind(connection.account)
        .bind(zone.zoneName)
        .bind(home.session())
        .run();
  });
}

NSError DeleteZone(Home &home, const CKRecordZoneID &zone, const CKCallContext &context) {
  return home.run(Home::Access::write, context, [&](const Connection &connection) {
    const Zone found = FindZone(connection, zone);
    if (!found.isOwn()) {
      Fail(CKErrorCode::permissionFailure, "Only its owner deletes a zone: " + zone.description());
    }
    forgetShares(connection, found);
    ReleaseZoneAssets(connection, found);
    connection.use("DELETE FROM records WHERE zone = ?").bind(found.number).run();
    connection.use("DELETE FROM zones WHERE id = ?").bind(found.number).run();
  });
}

CKZoneList ListZones(Home &home, const CKCallContext &context) {
  CKZoneList list;
  list.error = home.run(Home::Access::read, context, [&](const Connection &connection) {
    const bool isPrivate = connection.scope == CKDatabaseScope::privateDatabase;
    isPrivate ? listOwn(connection, list.zones) : listShared(connection, list.zones);
  });
  if (list.error) list.zones.clear();
  std::sort(list.zones.begin(), list.zones.end());
  return list;
}

}  // namespace droxa::embedded
