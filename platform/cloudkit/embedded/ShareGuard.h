#pragma once

#include <optional>

#include "platform/cloudkit/embedded/ShareTable.h"

namespace droxa::embedded {

// What an account may do in another's zone, as the shares and the hierarchy stand in the middle of a
// transaction. Each check throws CallFailed. Thread contract: the connection's.
class ShareGuard {
 public:
  ShareGuard(const Connection &connection, const Zone &zone)
      : account_(connection.account), hierarchy_(connection, zone.number), table_(connection, zone.number) {}

  bool mayRead(const std::string &record) const { return permission(record) != Permission::none; }
  // `current`: the record as the zone has it, whether or not the account sees it.
  void checkSave(const CKRecord &record, const std::optional<CKRecord> &current) const;
  // `saved`: as it would be then. Whether that is where the account may put it.
  void checkPlace(const CKRecord &saved, bool isNew) const;
  void checkRemoval(const CKRecordID &record) const;

 private:
  Permission permission(const std::string &record) const;
  void checkMove(const CKRecordID &record, const std::string &from, const std::string &to) const;
  std::vector<ShareNumber> sharesSeen(const std::vector<std::string> &wayUp) const;

  const std::int64_t account_;
  const Hierarchy hierarchy_;
  const ShareTable table_;
};

}  // namespace droxa::embedded
