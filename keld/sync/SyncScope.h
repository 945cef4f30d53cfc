#pragma once

#include <string>

#include "keld/sync/DocumentRecord.h"
#include "platform/cloudkit/CKRecordID.h"

namespace droxa::keld {

// What one engine of the sync looks after: the drive's own zone with all containers that aren't shared ones,
// or one owner's zone with the one container that shows it. Each item is of exactly one scope. Thread
// contract: a value.
struct SyncScope {
  CKRecordZoneID zone = DriveZone();
  std::string container;  // the shared zone's; "" for the drive

  bool isShared() const { return !container.empty(); }
  bool hasContainer(const std::string &containerID) const;
  CKRecordID recordID(const std::string &record) const { return {record, zone}; }
  // The parent of what hangs in the shared zone's documents folder itself.
  std::string top() const { return ContainerRecord(container); }
};

}  // namespace droxa::keld
