#include "keld/sharing/SharingPlace.h"

#include <utility>

#include "keld/sync/DocumentRecord.h"

namespace droxa::keld {

SharingPlaces::SharingPlaces(std::shared_ptr<CKCloud> cloud, std::string accountName)
    : own_(std::move(cloud)), others_(own_->sharedDatabase()), accountName_(std::move(accountName)) {}

SharingPlace SharingPlaces::ofZone(const CKRecordZoneID &zone) const {
  const bool isOwn =
      zone.ownerName == CKCurrentUserDefaultName || (!accountName_.empty() && zone.ownerName == accountName_);
  if (isOwn) return {own_, {zone.zoneName}, true};
  return {others_, zone, false};
}

CKShare SharingPlaces::shareInPlace(const SharingPlace &place, CKShare share) {
  share.recordID.zoneID = place.zone;
  if (share.rootRecordID) share.rootRecordID->zoneID = place.zone;
  return share;
}

}  // namespace droxa::keld
