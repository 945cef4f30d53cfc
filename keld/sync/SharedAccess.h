#pragma once

#include <optional>
#include <string>

#include "keld/sync/DocumentRecord.h"
#include "keld/sync/SyncContext.h"

namespace droxa::keld {

// What this account may do with the records of another's zone, by the shares that it sees there. Where no
// share is known yet, the cloud is left to decide. Thread contract: any thread, as the store.
class SharedAccess {
 public:
  SharedAccess(SyncStore &store, const SyncScope &scope) : store_(store), scope_(scope) {}

  // Whether the record may be changed, and things put below it. The most permissive share on the way up
  // counts.
  bool isWritable(const std::string &record) const { return isWritable(record, ""); }
  // The same of one that has no row yet.
  bool isWritable(const std::string &record, const std::string &parent) const;
  // The record at the top of the container that this one is below, or is itself; nullopt when that isn't
  // known (any more).
  std::optional<SyncRow> topOf(const SyncRow &row) const;

 private:
  SyncStore &store_;
  const SyncScope &scope_;
};

// The record with the mode that its document is to have here: without the write bits, where it may only be
// read.
DocumentRecord AsItMayBeUsed(DocumentRecord document, const SyncContext &context);

}  // namespace droxa::keld
