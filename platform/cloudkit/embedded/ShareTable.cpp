#include "platform/cloudkit/embedded/ShareTable.h"

#include <algorithm>

namespace droxa::embedded {
namespace {

SharePlace readPlace(const SqlUse &row) {
  return {row.integer(0), row.integer(1), row.text(2), row.text(3)};
}

std::optional<Account> readAccount(SqlUse &row) {
  if (!row.step()) return std::nullopt;
  return Account{row.integer(0), {row.text(1), row.text(2), row.text(3)}};
}

}  // namespace

std::optional<SharePlace> ShareTable::byRecord(const std::string &record) const {
  SqlUse row = connection_.use("SELECT id, zone, record, root FROM shares WHERE zone = ? AND record = ?");
  if (!row.bind(zone_).bind(record).step()) return std::nullopt;
  return readPlace(row);
}

std::optional<SharePlace> ShareTable::byRoot(const std::string &root) const {
  SqlUse row = connection_.use("SELECT id, zone, record, root FROM shares WHERE zone = ? AND root = ?");
  if (!row.bind(zone_).bind(root).step()) return std::nullopt;
  return readPlace(row);
}

std::vector<ShareNumber> ShareTable::withRootsAmong(const std::vector<std::string> &records) const {
  std::vector<ShareNumber> shares;
  for (const std::string &record : records) {
    if (const auto place = byRoot(record)) shares.push_back(place->share);
  }
  return shares;
}

std::vector<std::int64_t> ShareTable::put(const CKShare &share) const {
  std::optional<SharePlace> place = byRecord(share.recordID.recordName);
  if (!place) {
    connection_.use("INSERT INTO shares (zone, record, root, url) VALUES (?, ?, ?, ?)")
        .bind(zone_)
        .bind(share.recordID.recordName)
        .bind(share.rootRecordID->recordName)
        .bind(share.URL.absoluteString())
        .run();
    countShares(1);
    place = byRecord(share.recordID.recordName);
  }
  std::vector<std::int64_t> touched = accountsOf(place->share);
  connection_.use("DELETE FROM share_access WHERE share = ?").bind(place->share).run();
  for (const CKShareParticipant &participant : share.participants) {
    if (participant.role == CKShareParticipantRole::owner || participant.permission == Permission::none ||
        participant.acceptanceStatus != CKShareParticipantAcceptanceStatus::accepted) {
      continue;
    }
    const auto account = AccountByName(connection_, participant.userIdentity.accountName);
    if (!account) continue;
    connection_.use("INSERT INTO share_access (share, account, permission) VALUES (?, ?, ?)")
        .bind(place->share)
        .bind(account->number)
        .bind(static_cast<std::int64_t>(participant.permission))
        .run();
    touched.push_back(account->number);
  }
  return touched;
}

std::vector<std::int64_t> ShareTable::remove(const SharePlace &place) const {
  const std::vector<std::int64_t> touched = accountsOf(place.share);
  connection_.use("DELETE FROM share_access WHERE share = ?").bind(place.share).run();
  connection_.use("DELETE FROM shares WHERE id = ?").bind(place.share).run();
  countShares(-1);
  return touched;
}

void ShareTable::countShares(int difference) const {
  SqlUse row = connection_.use("UPDATE zones SET shares = shares + ? WHERE id = ? RETURNING shares");
  row.bind(std::int64_t{difference}).bind(zone_);
  const std::int64_t count = row.step() ? row.integer(0) : 0;
  row.run();
  const Hierarchy hierarchy(connection_, zone_);
  if (count == 0) hierarchy.drop();
  if (count == 1 && difference > 0) hierarchy.build();
}

Permission ShareTable::permissionOf(std::int64_t account, const std::vector<ShareNumber> &shares) const {
  Permission highest = Permission::none;
  for (const ShareNumber share : shares) {
    SqlUse row = connection_.use("SELECT permission FROM share_access WHERE share = ? AND account = ?");
    if (row.bind(share).bind(account).step()) {
      highest = std::max(highest, static_cast<Permission>(row.integer(0)));
    }
  }
  return highest;
}

std::vector<std::int64_t> ShareTable::accountsOf(ShareNumber share) const {
  std::vector<std::int64_t> accounts;
  SqlUse row = connection_.use("SELECT account FROM share_access WHERE share = ?");
  row.bind(share);
  while (row.step()) accounts.push_back(row.integer(0));
  return accounts;
}

std::vector<SharePlace> ShareTable::sharesOf(std::int64_t account) const {
  std::vector<SharePlace> places;
  SqlUse row = connection_.use(
      "SELECT id, zone, record, root FROM share_access JOIN shares ON shares.id = share"
      " WHERE account = ? AND zone = ? ORDER BY id");
  row.bind(account).bind(zone_);
  while (row.step()) places.push_back(readPlace(row));
  return places;
}

std::optional<SharePlace> ShareByURL(const Connection &connection, const NSURL &url) {
  SqlUse row = connection.use("SELECT id, zone, record, root FROM shares WHERE url = ?");
  if (!row.bind(url.absoluteString()).step()) return std::nullopt;
  return readPlace(row);
}

std::optional<Account> AccountByName(const Connection &connection, const std::string &name) {
  SqlUse row = connection.use("SELECT id, name, display, handle FROM accounts WHERE name = ?");
  row.bind(name);
  return readAccount(row);
}

std::optional<Account> AccountByHandle(const Connection &connection, const std::string &handle) {
  SqlUse row = connection.use("SELECT id, name, display, handle FROM accounts WHERE handle = ?");
  row.bind(handle);
  return readAccount(row);
}

Account AccountByNumber(const Connection &connection, std::int64_t number) {
  SqlUse row = connection.use("SELECT id, name, display, handle FROM accounts WHERE id = ?");
  row.bind(number);
  if (auto account = readAccount(row)) return *account;
  Fail(CKErrorCode::internalError, "The cloud has lost an account");
}

}  // namespace droxa::embedded
