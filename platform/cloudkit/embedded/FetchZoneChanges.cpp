#include "platform/cloudkit/embedded/Calls.h"
#include "platform/cloudkit/embedded/ChangeToken.h"
#include "platform/cloudkit/embedded/StoredRecord.h"

namespace droxa::embedded {
namespace {

// A page is not to fill the memory, whatever its records hold.
constexpr std::size_t kMostBytesOfAPage = 8 * 1024 * 1024;

// A feed of changes: of a zone to its owner, or of an account's view of it. Change tokens tell them apart by
// the number: a view's is negative.
struct Feed {
  Zone zone;
  std::int64_t number() const { return zone.isOwn() ? zone.number : -zone.view; }
};

std::int64_t lastChange(const Connection &connection, const Feed &feed) {
  if (feed.zone.isOwn()) {
    SqlUse row = connection.use("SELECT seq FROM zones WHERE id = ?");
    return row.bind(feed.zone.number).step() ? row.integer(0) : 0;
  }
  SqlUse row = connection.use("SELECT seq FROM views WHERE id = ?");
  return row.bind(feed.zone.view).step() ? row.integer(0) : 0;
}

// Where to go on. A token that is ahead of the feed is of a cloud that was put back to an earlier state.
std::int64_t startAfter(const Connection &connection, const Feed &feed, std::int64_t last,
                        const CKServerChangeToken &token) {
  if (!token) return 0;
  const std::optional<ChangeToken> decoded = ChangeToken::decode(token);
  if (!decoded || decoded->cloud != connection.cloud || decoded->zone != feed.number() || decoded->seq < 0 ||
      decoded->seq > last) {
    Fail(CKErrorCode::changeTokenExpired, "The change token isn't of this zone of this cloud");
  }
  return decoded->seq;
}

// Rows of DROXA_RECORD_COLUMNS, the number of the change and whether it is told as a deletion. To be bound:
// the zone or the view, the last change that is known, whether deletions are told, and how many.
constexpr char kChangesOfZone[] = "SELECT " DROXA_RECORD_COLUMNS
                                  ", seq, deleted FROM records WHERE zone = ? AND seq > ?"
                                  " AND (? OR NOT deleted) ORDER BY seq LIMIT ?";
constexpr char kChangesOfView[] =
    "SELECT records.name, view_records.type, tag, time, iif(visible, records.device, view_records.device),"
    " fields, view_records.seq, NOT visible FROM view_records CROSS JOIN views ON views.id = view"
    " CROSS JOIN records ON records.zone = views.zone AND records.name = view_records.record"
    " WHERE view_records.view = ? AND view_records.seq > ? AND (? OR visible)"
    " ORDER BY view_records.seq LIMIT ?";

void fetchPage(const Connection &connection, const CKRecordZoneID &zone, const CKServerChangeToken &token,
               const CKDesiredKeys &desiredKeys, std::size_t limit, CKZoneChanges &page) {
  const Feed feed{FindZone(connection, zone)};
  const std::int64_t last = lastChange(connection, feed);
  const std::int64_t start = startAfter(connection, feed, last, token);
  SqlUse row = connection.use(feed.zone.isOwn() ? kChangesOfZone : kChangesOfView);
  row.bind(feed.zone.isOwn() ? feed.zone.number : feed.zone.view);
  row.bind(start).bind(token ? 1 : 0).bind(static_cast<std::int64_t>(limit) + 1);
  ChangeToken reached{connection.cloud, feed.number(), last};
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
