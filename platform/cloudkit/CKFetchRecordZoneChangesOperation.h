#pragma once

#include <functional>

#include "platform/cloudkit/CKOperation.h"

namespace droxa {

// Fetches what changed in a zone since a token, page by page. The blocks of a page are called in this order:
// the changed records, the deletions, then the token that covers them: a caller that keeps the token with
// what it did for the page can go on from there after any interruption.
// Thread contract: CKOperation's.
class CKFetchRecordZoneChangesOperation final : public CKOperation {
 public:
  CKRecordZoneID zoneID;
  CKServerChangeToken previousServerChangeToken;  // nil: from the start
  CKDesiredKeys desiredKeys;
  std::size_t resultsLimit = 200;  // of a page
  bool fetchAllChanges = true;     // false: one page

  std::function<void(const CKRecord &record)> recordWasChangedBlock;
  std::function<void(const CKDeletedRecord &record)> recordWithIDWasDeletedBlock;
  std::function<void(const CKServerChangeToken &token)> serverChangeTokenUpdatedBlock;
  // The token covers all that the blocks above told, also when there is an error; moreComing: there may be
  // more.
  std::function<void(const CKServerChangeToken &token, bool moreComing, const NSError &error)>
      fetchRecordZoneChangesCompletionBlock;

  // Of the last page, or the previous one before there is any.
  const CKServerChangeToken &serverChangeToken() const { return token(); }
  bool moreComing() const { return moreComing_; }

 private:
  NSError perform() override;
  void complete(const NSError &error) override;
  NSError fetchPage();
  void tell(const CKZoneChanges &page);
  const CKServerChangeToken &token() const { return token_ ? token_ : previousServerChangeToken; }
  CKServerChangeToken token_;
  bool moreComing_ = true;
};

}  // namespace droxa
