#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "keld/sharing/SharingOperation.h"
#include "keld/sharing/SharingPlace.h"
#include "keld/sync/SyncEngine.h"
#include "platform/foundation/NSURL.h"

namespace droxa::keld {

// What sharing asks of the daemon around it.
struct SharingHost {
  std::string replicaPath;
  std::function<Keeper &()> keeper;
  ReplicaFiles::Read read;
  std::function<std::optional<std::string>(const NSURL &url)> pathBelowReplica;
  std::function<bool()> isSignedIn;
  // The sync that looks after the item, or the zone: the drive's own, or that of what somebody shares. Of a
  // zone that nobody looks after: null.
  std::function<std::shared_ptr<SyncEngine>(const ItemRecord &item)> engineOf;
  std::function<std::shared_ptr<SyncEngine>(const CKRecordZoneID &zone)> engineOfZone;
};

// An item that a client named.
struct SharingItem {
  ItemRecord item;
  std::string path;                    // absolute
  std::shared_ptr<SyncEngine> engine;  // that looks after it
  std::optional<SyncRow> row;          // absent, or without a tag: the cloud doesn't have it yet
  bool isInCloud() const { return row && !row->tag.empty(); }
};

// Finds the items that sharing is about, says which of them can be shared, and gets them into the cloud.
// Thread contract: any thread; what takes an operation waits, on its thread.
class SharingItems {
 public:
  explicit SharingItems(SharingHost host) : host_(std::move(host)) {}

  // The item at the URL, which may have come there a moment ago. 22 for nil, 14, 41 for what isn't shared.
  NSError find(SharingOperation &operation, const NSURL &url, SharingItem *found);
  // The same, and in the cloud: one that isn't yet is waited for. The sync's errors when it can't be sent.
  NSError findInCloud(SharingOperation &operation, const NSURL &url, SharingItem *found);
  // Waits until the cloud has everything below the item, and the item, that has changed so far.
  NSError upload(SharingOperation &operation, const SharingItem &item);
  // nil, or 41 with why it isn't shared, and what to do.
  NSError checkShareable(const ItemRecord &item, const std::string &path) const;
  std::optional<ItemRecord> item(ItemNumber item) const;
  SharingItem described(const ItemRecord &item) const;

  // Shares, as far as they are known here.
  std::optional<KnownShare> shareOf(const ItemRecord &item) const;
  // Its own, or that of the nearest folder above it.
  std::optional<KnownShare> nearestShare(const ItemRecord &item) const;
  bool isBelow(ItemNumber item, ItemNumber folder) const;
  // The item, and every folder that it is below, upwards; ends when `each` says false.
  void forEachUpwards(const ItemRecord &item, const std::function<bool(const ItemRecord &)> &each) const;

 private:
  NSError look(SharingOperation &operation, const std::string &path, std::optional<ItemRecord> *found);
  std::vector<ItemNumber> unsentBelow(const ItemRecord &item) const;
  static std::string problemOfCloud(const SharingItem &item);

  const SharingHost host_;
};

}  // namespace droxa::keld
