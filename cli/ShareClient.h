#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "cli/CallResult.h"
#include "cli/CommandContext.h"
#include "platform/cloudkit/CKShare.h"

namespace droxa {

// One item's share, through a service that the extension offers on the item, as any application reaches it.
// Each call is waited for, at most for the timeout; a change that isn't answered in time is cancelled. Thread
// contract: one thread.
class ShareClient {
 public:
  virtual ~ShareClient() = default;
  // One that isn't shared gives a new share, which isn't known to the server.
  virtual CallResult<CKShare> fetch() = 0;
  virtual CallResult<CKShare> save(const CKShare &share) = 0;
  virtual CallResult<NSURL> link(const CKShare &share) = 0;
  virtual NSError withdraw(const CKShare &share) = 0;
  // The participant whom the cloud knows by that account name or handle.
  virtual CallResult<CKShareParticipant> lookUp(const std::string &nameOrHandle) = 0;
};

// Of a document: com.quorva.Tessaly.SharingV1, which is for everybody. People are looked up where this
// program is entitled to that; otherwise the name is taken as it is, and the cloud finds out when the share
// is saved.
CallResult<std::unique_ptr<ShareClient>> documentShare(CommandContext &context,
                                                       const std::string &identifier);
// Of a folder at `url`: com.quorva.Tessaly.private.SharingOperation, which is for entitled programs.
CallResult<std::unique_ptr<ShareClient>> folderShare(CommandContext &context, const std::string &identifier,
                                                     const NSURL &url);

// What to do about a refusal for want of a privilege: which entitlement is missing, which file an
// administrator has to write, and what is in it for this program. "" for any other error.
std::string privilegeAdvice(const NSError &error);

}  // namespace droxa
