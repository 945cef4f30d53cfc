#include "keld/sync/KnownShares.h"

namespace droxa::keld {

void KnownShares::note(const CKShare &share) {
  store_.transaction([&] {
    const auto before = store_.share(share.recordID);
    if (!share.rootRecordID) {
      if (before) forget(share.recordID);
      return;
    }
    KnownShare known{share.recordID, share.rootRecordID->recordName, ""};
    if (const CKShareParticipant *owner = share.owner()) known.owner = owner->userIdentity.accountName;
    store_.putShare(known);
    if (before && before->root != known.root) show(before->root);
    show(known.root);
  });
}

void KnownShares::forget(const CKRecordID &share) {
  store_.transaction([&] {
    const auto before = store_.share(share);
    if (!before) return;
    store_.eraseShare(share);
    show(before->root);
  });
}

void KnownShares::forgetUnseen(const CKRecordZoneID &zone, const std::set<std::string> &seen) {
  for (const KnownShare &known : store_.shares())
    if (known.record.zoneID == zone && seen.count(known.record.recordName) == 0) forget(known.record);
}

void KnownShares::show(const std::string &root) {
  const auto row = store_.byRecord(root);
  if (row && row->item != 0) states_.showShared(row->item, store_.shareOfRoot(root).has_value());
}

}  // namespace droxa::keld
