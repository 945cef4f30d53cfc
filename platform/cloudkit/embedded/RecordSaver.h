#pragma once

#include <map>
#include <memory>

#include "platform/cloudkit/embedded/RecordCoding.h"
#include "platform/cloudkit/embedded/Views.h"

namespace droxa::embedded {

// Why no cloud takes the record, whatever it holds: its names, its type, its keys, a malformed reference.
// nil: it may be saved.
NSError RecordError(const CKRecord &record);

// Saves and deletes records inside a transaction of a connection, and keeps what others see of them: finish()
// before it ends. What fails throws CallFailed with the record's error and has written nothing.
// Thread contract: the connection's.
class RecordSaver {
 public:
  RecordSaver(const Home &home, const Connection &connection) : home_(home), connection_(connection) {}

  // The record as the cloud has it then.
  CKRecord save(const CKRecord &record, CKRecordSavePolicy policy);
  // Whether there is anything to delete that the account sees. Throws what keeps it from doing so. Ask of all
  // records of a call before the first is removed: a folder takes its documents out of the account's sight.
  bool mayRemove(const CKRecordDeletion &deletion) const;
  void remove(const CKRecordDeletion &deletion);

  // Writes a share anew in the name of a participant whose part in it changed.
  CKRecord rewriteShare(const Zone &zone, const CKShare &share);

  void finish();

 private:
  CKRecord saveShare(const Zone &zone, CKRecord saved, const std::optional<CKRecord> &current);
  CKRecord commit(const Zone &zone, CKRecord saved);
  CKRecord put(const Zone &zone, CKRecord saved);
  void leave(const Zone &zone, const CKRecord &share);
  void removeShare(const Zone &zone, const CKRecord &share);
  void bury(const Zone &zone, CKRecord record);
  Views &views(const Zone &zone);
  Fields merged(const CKRecord &record, const std::optional<CKRecord> &current,
                CKRecordSavePolicy policy) const;
  void checkAssets(const CKRecord &record) const;
  void checkQuota(const Zone &zone, const CKRecord &record) const;
  void refer(const Zone &zone, const CKRecord &record);
  void write(const Zone &zone, const CKRecord &record, const std::string &encoded, bool isDeleted);

  const Home &home_;
  const Connection &connection_;
  std::map<std::int64_t, std::unique_ptr<Views>> views_;  // of zones with shares, by their numbers
};

}  // namespace droxa::embedded
