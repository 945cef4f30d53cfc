#pragma once

#include "keld/FolderReading.h"

namespace droxa::keld {

enum class ContentsOutcome {
  done,
  nameTaken,         // something stands at the name already
  folderGone,        // the folder was removed
  gone,              // nothing is at the name any more
  changedMeanwhile,  // what stands there isn't what was expected; it was left, or put back, as it was
  inUse,             // somebody has it open
  noSpace,
  wrongContents,  // size or digest aren't what was promised; the part is removed
  busy,           // another writer has the part
  error,          // see `error`
};

// How an operation on the replica's files ended.
struct ContentsResult {
  ContentsOutcome outcome = ContentsOutcome::done;
  int error = 0;    // the errno, where there was one
  FileFacts facts;  // when done: of what now stands at the name (of a promise: the promise file's own)
  // Something of the user's had to be left in the storage: see ContentsStorage::rescuedFiles().
  bool hasRescued = false;

  bool isDone() const { return outcome == ContentsOutcome::done; }
  static ContentsResult failed(ContentsOutcome outcome, int error = 0) { return {outcome, error, {}, false}; }
  // ENOSPC and EDQUOT are noSpace, everything else is error.
  static ContentsResult failedWith(int error);
};

}  // namespace droxa::keld
