#pragma once

#include <chrono>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "cli/Waiting.h"
#include "tessaly/QVDaemonConnection.h"

namespace droxa {

// The daemon's calls that `droxa` makes itself, each waited for, at most for the timeout.
// Thread contract: one thread.
class DaemonClient {
 public:
  using Account = std::optional<QVAccountDescription>;

  DaemonClient(std::shared_ptr<QVDaemonConnection> connection, std::chrono::milliseconds timeout);
  CallResult<QVDaemonStatus> status();
  CallResult<Account> account();
  CallResult<Account> signIn(const std::string &name);
  NSError signOut();
  CallResult<std::vector<QVContainerDescription>> containers();

  CallResult<QVContentsStatus> contentsStatus(const NSURL &url);
  CallResult<QVTransferStatus> transferStatus();
  NSError setPinned(const NSURL &url, bool isPinned);
  NSError confirmDeletions(bool carryOut);

  // How an item is shared, as far as it is known here.
  struct ShareOptions {
    bool isShared = false;
    bool isSharedByOthers = false;
    bool isSharedByItself = false;
    std::optional<std::string> folder;  // the uppermost shared one
  };
  CallResult<ShareOptions> shareOptions(const std::string &identifier);
  CallResult<NSURL> acceptShare(const NSURL &shareURL);  // where it is now

  // These take as long as they take: the answer is waited for by the caller.
  std::shared_ptr<AnswerSlot<QVContentsResult>> evict(const NSURL &url);
  std::shared_ptr<AnswerSlot<bool>> waitForUpload(const NSURL &url);  // nil: everything

 private:
  const std::shared_ptr<QVDaemonConnection> connection_;
  const std::chrono::milliseconds timeout_;
};

}  // namespace droxa
