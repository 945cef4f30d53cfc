#include "platform/cloudkit/embedded/ShareGuard.h"

#include <algorithm>

namespace droxa::embedded {
namespace {

[[noreturn]] void refuse(const CKRecordID &record, const std::string &reason) {
  Fail(CKErrorCode::permissionFailure, reason + ": " + record.description());
}

}  // namespace

Permission ShareGuard::permission(const std::string &record) const {
  return table_.permissionOf(account_, table_.withRootsAmong(hierarchy_.wayUp(record)));
}

void ShareGuard::checkSave(const CKRecord &record, const std::optional<CKRecord> &current) const {
  if (record.recordType == CKRecordTypeShare) {
    refuse(record.recordID, "Only the owner of a share changes it");
  }
  if (!current) return;
  const Permission allowed = permission(record.recordID.recordName);
  if (allowed == Permission::readWrite) return;
  // What isn't seen is gone for who means that very record; its name is taken all the same.
  if (allowed == Permission::none && !record.recordChangeTag.empty()) {
    Fail(CKErrorCode::unknownItem, "The record is gone: " + record.recordID.description());
  }
  refuse(record.recordID, allowed == Permission::none ? "The record can't be made by this account"
                                                      : "The record is shared for reading only");
}

void ShareGuard::checkPlace(const CKRecord &saved, bool isNew) const {
  const std::string &name = saved.recordID.recordName;
  const std::string to = ParentOf(saved);
  if (!isNew) {
    const std::string from = hierarchy_.parentOf(name).value_or(std::string());
    if (from != to) checkMove(saved.recordID, from, to);
    return;
  }
  if (permission(to) != Permission::readWrite) {
    refuse(saved.recordID, "A new record must be put below one that is shared for writing");
  }
  // Others' records that name a parent which isn't there would come into the share with it.
  if (hierarchy_.isNamedAsParent(name)) {
    refuse(saved.recordID, "The record would take records along that are elsewhere");
  }
}

void ShareGuard::checkMove(const CKRecordID &record, const std::string &from, const std::string &to) const {
  if (permission(from) != Permission::readWrite || permission(to) != Permission::readWrite) {
    refuse(record, "The record can't be moved out of what is shared for writing, nor into it");
  }
  const std::vector<std::string> way = hierarchy_.wayUp(to);
  if (std::find(way.begin(), way.end(), record.recordName) != way.end()) {
    refuse(record, "The record can't be put below itself");
  }
  const std::vector<ShareNumber> after = sharesSeen(way);
  for (const ShareNumber share : sharesSeen(hierarchy_.wayUp(from))) {
    if (std::find(after.begin(), after.end(), share) == after.end()) {
      refuse(record, "The record can't be moved out of the share that it is in");
    }
  }
}

std::vector<ShareNumber> ShareGuard::sharesSeen(const std::vector<std::string> &wayUp) const {
  std::vector<ShareNumber> shares = table_.withRootsAmong(wayUp);
  std::erase_if(shares, [this](ShareNumber share) {
    return table_.permissionOf(account_, {share}) == Permission::none;
  });
  return shares;
}

void ShareGuard::checkRemoval(const CKRecordID &record) const {
  if (permission(record.recordName) != Permission::readWrite) {
    refuse(record, "The record is shared for reading only");
  }
  if (table_.byRoot(record.recordName)) refuse(record, "Only its owner deletes what was shared as a whole");
}

}  // namespace droxa::embedded
