#pragma once

#include <map>
#include <memory>
#include <string>
#include <vector>

#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVItemActions.h"
#include "tests/support/CallLog.h"

namespace droxa {

// The Tessaly library's actions as a test scripts them: each call is written into the log
// ("setFavoriteRank(7, /a)") and touches nothing. They are the process's while this lives.
// Thread contract: any thread; what it answers is set before it is asked.
class RecordingItemActions final {
 public:
  RecordingItemActions();
  ~RecordingItemActions();
  RecordingItemActions(const RecordingItemActions &) = delete;
  RecordingItemActions &operator=(const RecordingItemActions &) = delete;

  // How they answer.
  NSURL &trashed();       // nil: trashing fails
  NSError &trashError();  // stored also when trashing gives a URL
  NSURL &putBack();
  NSURL &physical();  // nil: the URL itself
  NSError &tagError();
  bool &areTagsSet();

  std::vector<std::string> calls() const;
  // URLs of the calls in order, with their physical properties.
  std::vector<NSURL> urls() const;

 private:
  class Actions;
  const std::shared_ptr<Actions> actions_;
};

}  // namespace droxa
