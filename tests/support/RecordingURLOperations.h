#pragma once

#include <deque>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/fileprovider/FPURLOperations.h"
#include "platform/foundation/NSProgress.h"
#include "platform/foundation/ThreadSafety.h"
#include "tests/support/CallLog.h"

namespace droxa {

// The framework's operations on files as a test scripts them: each call takes the next answer, is written
// into the log ("renameWithNewName(/a, b)"), and touches nothing. They are the process's operations while
// this lives. A call without an answer, and an answer without a call, fail the test. Thread contract: any
// thread. Answers are given before the call returns, or by release() after hold().
class RecordingURLOperations final {
 public:
  RecordingURLOperations();
  ~RecordingURLOperations();
  RecordingURLOperations(const RecordingURLOperations &) = delete;
  RecordingURLOperations &operator=(const RecordingURLOperations &) = delete;

  void answer(const NSURL &newURL, const NSError &error = {});
  void fail(const NSError &error) { answer(NSURL(), error); }
  void hold();
  void release();  // what is held, and holds no more

  std::vector<std::string> calls() const;
  CallLog &log();
  // URLs of the calls in order, with their physical properties.
  std::vector<NSURL> urls() const;
  // The progress that was current at the last call.
  std::shared_ptr<NSProgress> progress() const;

 private:
  class Operations;
  const std::shared_ptr<Operations> operations_;
};

}  // namespace droxa
