#include "platform/cloudkit/embedded/Zone.h"

namespace droxa::embedded {
namespace {

std::optional<Zone> findOwn(const Connection &connection, const CKRecordZoneID &zone) {
  if (zone.ownerName != CKCurrentUserDefaultName) return std::nullopt;
  SqlUse row = connection.use("SELECT id, shares FROM zones WHERE account = ? AND name = ?");
  if (!row.bind(connection.account).bind(zone.zoneName).step()) return std::nullopt;
  return Zone{row.integer(0), connection.account, row.integer(1) != 0, 0};
}

std::optional<Zone> findShared(const Connection &connection, const CKRecordZoneID &zone) {
  SqlUse row = connection.use(
      "SELECT zones.id, zones.account, views.id FROM accounts"
      " JOIN zones ON zones.account = accounts.id AND zones.name = ?"
      " JOIN views ON views.zone = zones.id AND views.account = ?2"
      " WHERE accounts.name = ?3 AND EXISTS (SELECT 1 FROM share_access JOIN shares ON shares.id = share"
      " WHERE share_access.account = ?2 AND shares.zone = zones.id)");
  if (!row.bind(zone.zoneName).bind(connection.account).bind(zone.ownerName).step()) return std::nullopt;
  return Zone{row.integer(0), row.integer(1), true, row.integer(2)};
}

}  // namespace

Zone FindZone(const Connection &connection, const CKRecordZoneID &zone) {
  const bool isPrivate = connection.scope == CKDatabaseScope::privateDatabase;
  if (const auto found = isPrivate ? findOwn(connection, zone) : findShared(connection, zone)) return *found;
  Fail(CKErrorCode::zoneNotFound, "No zone " + zone.description());
}

bool Sees(const Connection &connection, const Zone &zone, const std::string &record) {
  if (zone.isOwn()) return true;
  SqlUse row = connection.use("SELECT 1 FROM view_records WHERE view = ? AND record = ? AND visible");
  return row.bind(zone.view).bind(record).step();
}

bool AccountSees(const Connection &connection, std::int64_t account, std::int64_t zone,
                 const std::string &record) {
  SqlUse row = connection.use(
      "SELECT EXISTS (SELECT 1 FROM zones WHERE id = ?1 AND account = ?2) OR EXISTS (SELECT 1 FROM views"
      " JOIN view_records ON view = views.id WHERE zone = ?1 AND account = ?2 AND record = ?3 AND visible)");
  return row.bind(zone).bind(account).bind(record).step() && row.integer(0) != 0;
}

NamedZone ZoneByNumber(const Connection &connection, std::int64_t number) {
  SqlUse row = connection.use(
      "SELECT zones.account, zones.shares, zones.name, accounts.name FROM zones"
      " JOIN accounts ON accounts.id = zones.account WHERE zones.id = ?");
  if (!row.bind(number).step()) Fail(CKErrorCode::zoneNotFound, "The zone is gone");
  NamedZone found{{number, row.integer(0), row.integer(1) != 0, 0}, {row.text(2)}};
  if (found.zone.owner != connection.account) found.id.ownerName = row.text(3);
  return found;
}

}  // namespace droxa::embedded
