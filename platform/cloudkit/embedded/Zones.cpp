#include <algorithm>

#include "platform/cloudkit/embedded/Calls.h"
#include "platform/cloudkit/embedded/StoredRecord.h"

namespace droxa::embedded {

NSError SaveZone(Home &home, const CKRecordZoneID &zone, const CKCallContext &context) {
  if (!CKNameIsValid(zone.zoneName) || zone.ownerName != CKCurrentUserDefaultName) {
    return CKErrorMake(CKErrorCode::invalidArguments, "A zone can't be named " + zone.description());
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
    const std::int64_t number = ZoneNumber(connection, zone);
    ReleaseZoneAssets(connection, number);
    connection.use("DELETE FROM records WHERE zone = ?").bind(number).run();
    connection.use("DELETE FROM zones WHERE id = ?").bind(number).run();
  });
}

CKZoneList ListZones(Home &home, const CKCallContext &context) {
  CKZoneList list;
  list.error = home.run(Home::Access::read, context, [&](const Connection &connection) {
    SqlUse row = connection.use("SELECT name FROM zones WHERE account = ?");
    row.bind(connection.account);
    while (row.step()) list.zones.push_back({row.text(0)});
  });
  if (list.error) list.zones.clear();
  std::sort(list.zones.begin(), list.zones.end());
  return list;
}

}  // namespace droxa::embedded
