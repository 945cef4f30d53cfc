#pragma once

#include <functional>
#include <vector>

#include "platform/cloudkit/CKOperation.h"

namespace droxa {

// Saves and deletes records in one call; at most CKMostRecordsPerCall of them. A call whose reply was lost is
// repeated: a conflict with what this very device then saved (CKServerRecordIsOwnSave) counts as saved. Where
// the call isn't atomic, records whose own error is transient are tried again.
// Thread contract: CKOperation's.
class CKModifyRecordsOperation final : public CKOperation {
 public:
  CKModifyRequest request;

  // Called once a record, when its outcome is final, before the completion block.
  std::function<void(const CKRecordResult &result)> perRecordSaveBlock;
  std::function<void(const CKDeleteResult &result)> perRecordDeleteBlock;
  // nil: all went well; partialFailure: see the results; otherwise the operation failed as a whole, with the
  // results that had become final before.
  std::function<void(const CKModifyReply &reply)> modifyRecordsCompletionBlock;

  // In the order they became final.
  const CKModifyReply &reply() const { return reply_; }

 private:
  class Run;
  NSError perform() override;
  void complete(const NSError &error) override;
  CKModifyReply reply_;
};

}  // namespace droxa
