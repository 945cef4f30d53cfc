#include "platform/cloudkit/embedded/Calls.h"
#include "platform/cloudkit/embedded/ChangeToken.h"
#include "platform/cloudkit/embedded/StoredRecord.h"

namespace droxa::embedded {
namespace {

// A page is not to fill the memory, whatever its records hold.
constexpr std::size_t kMostBytesOfAPage = 8 * 1024 * 1024;

std::int64_t lastChange(const Connection &connection, std::int64_t zone) {
  SqlUse row = connection.use("SELECT seq FROM zones WHERE id = ?");
  return row.bind(zone).step() ? row.integer(0) : 0;
}

// Where to go on. A token that is ahead of the zone is of a cloud that was put back to an earlier state.
std::int64_t startAfter(const Connection &connection, std::int64_t zone, std::int64_t last,
                        const CKServerChangeToken &token) {
  if (!token) return 0;
  const std::optional<ChangeToken> decoded = ChangeToken::decode(token);
  if (!decoded || decoded->cloud != connection.cloud || decoded->zone != zone || decoded->seq < 0 ||
      decoded->seq > last) {
    Fail(CKErrorCode::changeTokenExpired, "The change token isn't of this zone of this cloud");
  }
  return decoded->seq;
}

void fetchPage(const Connection &connection, const CKRecordZoneID &zone, const CKServerChangeToken &token,
               const CKDesiredKeys &desiredKeys, std::size_t limit, CKZoneChanges &page) {
  const std::int64_t number = ZoneNumber(connection, zone);
  const std::int64_t last = lastChange(connection, number);
  const std::int64_t start = startAfter(connection, number, last, token);
  SqlUse row = connection.use("SELECT " DROXA_RECORD_COLUMNS
                              ", seq, deleted FROM records WHERE zone = ? AND seq > ?"
                              " AND (? OR NOT deleted) ORDER BY seq LIMIT ?");
  row.bind(number).bind(start).bind(token ? 1 : 0).bind(static_cast<std::int64_t>(limit) + 1);
  ChangeToken reached{connection.cloud, number, last};
  std::int64_t told = start;
  std::size_t bytes = 0;
  while (row.step()) {
    if (page.changedRecords.size() + page.deletedRecords.size() == limit || bytes > kMostBytesOfAPage) {
      page.moreComing = true;
      reached.seq = told;
      break;
    }
    told = row.integer(6);
    bytes += row.bytes(5).size();
    if (row.integer(7) != 0) {
      page.deletedRecords.push_back({{row.text(0), zone}, row.text(1), row.text(4)});
    } else {
      page.changedRecords.push_back(ReadRecord(row, zone, desiredKeys));
    }
  }
  page.token = reached.encoded();
}

}  // namespace

CKZoneChanges FetchZoneChanges(Home &home, const CKRecordZoneID &zone, const CKServerChangeToken &token,
                               const CKDesiredKeys &desiredKeys, std::size_t limit,
                               const CKCallContext &context) {
  CKZoneChanges page;
  if (limit == 0 || limit > CKMostRecordsPerCall) {
    page.error = CKErrorMake(CKErrorCode::invalidArguments, "No such number of changes can be asked for");
    return page;
  }
  NSError error = home.run(Home::Access::read, context, [&](const Connection &connection) {
    fetchPage(connection, zone, token, desiredKeys, limit, page);
  });
  if (!error) return page;
  CKZoneChanges failed;
  failed.error = std::move(error);
  return failed;
}

}  // namespace droxa::embedded
