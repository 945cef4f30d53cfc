#pragma once

#include <optional>
#include <string>

#include "platform/cloudkit/embedded/Home.h"

namespace droxa::embedded {

// A zone as the connection's account reaches it. Thread contract: a value, of one transaction.
struct Zone {
  std::int64_t number = 0;
  std::int64_t owner = 0;  // the account whose zone it is, and whose quota it uses
  bool hasShares = false;
  std::int64_t view = 0;  // the account's view of another's zone; 0: the zone is its own

  bool isOwn() const { return view == 0; }
};

// The zone of that name in the connection's database. Throws CallFailed: zoneNotFound; also of a zone in
// which nothing is shared with the account.
Zone FindZone(const Connection &connection, const CKRecordZoneID &zone);

// Whether the account sees the record, if there is one: all of its own zones, what is shared of others'.
bool Sees(const Connection &connection, const Zone &zone, const std::string &record);

// The same for any account and any zone that it may reach, whichever database the connection is of.
bool AccountSees(const Connection &connection, std::int64_t account, std::int64_t zone,
                 const std::string &record);

// The zone's name as the connection's account writes it; its owner. Throws CallFailed: zoneNotFound.
struct NamedZone {
  Zone zone;  // as its owner's; without the view
  CKRecordZoneID id;
};
NamedZone ZoneByNumber(const Connection &connection, std::int64_t number);

}  // namespace droxa::embedded
