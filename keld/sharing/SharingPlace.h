#pragma once

#include <memory>
#include <optional>
#include <string>

#include "keld/sync/SyncStore.h"
#include "platform/cloudkit/CKCloud.h"

namespace droxa::keld {

// Where something is in the cloud: a zone, and the database that this account reaches it by.
struct SharingPlace {
  std::shared_ptr<CKCloud> cloud;
  CKRecordZoneID zone;
  bool isOwn = true;  // the account's own zone; otherwise one in which somebody shares with it

  CKRecordID recordID(const std::string &record) const { return {record, zone}; }
};

// Finds the places of zones. Thread contract: any thread.
class SharingPlaces {
 public:
  // `accountName` may be "", when it isn't known.
  SharingPlaces(std::shared_ptr<CKCloud> cloud, std::string accountName);

  // The account may name itself as the owner of its zones.
  SharingPlace ofZone(const CKRecordZoneID &zone) const;
  // The share as the database of its place writes it.
  static CKShare shareInPlace(const SharingPlace &place, CKShare share);

 private:
  const std::shared_ptr<CKCloud> own_, others_;
  const std::string accountName_;
};

}  // namespace droxa::keld
