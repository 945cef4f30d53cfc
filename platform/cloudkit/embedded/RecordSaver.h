#pragma once

#include "platform/cloudkit/embedded/Home.h"
#include "platform/cloudkit/embedded/RecordCoding.h"

namespace droxa::embedded {

// Why no cloud takes the record, whatever it holds: its names, its type, its keys, a malformed reference.
// nil: it may be saved.
NSError RecordError(const CKRecord &record);

// Saves and deletes single records inside a transaction of a connection. What fails throws CallFailed with
// the record's error and has written nothing. Thread contract: the connection's.
class RecordSaver {
 public:
  RecordSaver(const Home &home, const Connection &connection) : home_(home), connection_(connection) {}

  // The record as the cloud has it then.
  CKRecord save(const CKRecord &record, CKRecordSavePolicy policy);
  void remove(const CKRecordDeletion &deletion);

 private:
  Fields merged(const CKRecord &record, const std::optional<CKRecord> &current,
                CKRecordSavePolicy policy) const;
  void checkAssets(const CKRecord &record) const;
  void checkQuota(std::int64_t zone, const CKRecord &record) const;
  void refer(std::int64_t zone, const CKRecord &record);
  void write(std::int64_t zone, const CKRecord &record, const std::string &encoded, bool isDeleted);

  const Home &home_;
  const Connection &connection_;
};

}  // namespace droxa::embedded
