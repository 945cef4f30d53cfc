#pragma once

#include <set>
#include <string>

#include "keld/sync/ItemStates.h"
#include "keld/sync/SyncStore.h"
#include "platform/cloudkit/CKShare.h"

namespace droxa::keld {

// What this device knows of shares, kept as the cloud tells it and shown with the items that are their roots:
// what was told offline, and what listings show, comes from here. Thread contract: any thread; calls inside a
// transaction of the store belong to it. What is to be shown goes out with ItemStates' next flush.
class KnownShares {
 public:
  KnownShares(SyncStore &store, ItemStates &states) : store_(store), states_(states) {}

  void note(const CKShare &share);
  void forget(const CKRecordID &share);
  // Everything of the zone was seen: the shares that weren't among it are gone.
  void forgetUnseen(const CKRecordZoneID &zone, const std::set<std::string> &seen);

 private:
  // As the table has it when this is called.
  void show(const std::string &root);

  SyncStore &store_;
  ItemStates &states_;
};

}  // namespace droxa::keld
