#include "platform/cloudkit/embedded/Calls.h"
#include "platform/cloudkit/embedded/ShareTable.h"

namespace droxa::embedded {
namespace {

bool canBeText(const std::string &text) {
  return text.empty() || CKNameIsValid(text);
}

CKShareParticipantResult lookUp(const Connection &connection, const std::string &nameOrHandle) {
  CKShareParticipantResult result{nameOrHandle, {}, {}};
  std::optional<Account> account = AccountByName(connection, nameOrHandle);
  if (!account && !nameOrHandle.empty()) account = AccountByHandle(connection, nameOrHandle);
  if (account) {
    result.participant.userIdentity = std::move(account->identity);
  } else {
    result.error = CKErrorMake(CKErrorCode::unknownItem, "The cloud has no account " + nameOrHandle);
  }
  return result;
}

}  // namespace

CKUserIdentityReply CurrentUserIdentity(Home &home, const CKCallContext &context) {
  CKUserIdentityReply reply;
  reply.error = home.run(Home::Access::read, context, [&](const Connection &connection) {
    reply.identity = AccountByNumber(connection, connection.account).identity;
  });
  return reply;
}

NSError SetUserIdentity(Home &home, const std::string &displayName, const std::string &handle,
                        const CKCallContext &context) {
  if (!canBeText(displayName) || !canBeText(handle)) {
    return CKErrorMake(CKErrorCode::invalidArguments, "An account can't be called so: " + displayName);
  }
  return home.run(Home::Access::write, context, [&](const Connection &connection) {
    for (const auto &other : {AccountByName(connection, handle), AccountByHandle(connection, handle)}) {
      if (handle.empty() || !other || other->number == connection.account) continue;
      Fail(CKErrorCode::invalidArguments, "The handle is another account's: " + handle);
    }
    SqlUse update = connection.use("UPDATE accounts SET display = ?, handle = ? WHERE id = ?");
    update.bind(displayName);
    handle.empty() ? update.bindNull() : update.bind(handle);
    update.bind(connection.account).run();
  });
}

CKShareParticipantsReply LookUpShareParticipants(Home &home, const std::vector<std::string> &namesOrHandles,
                                                 const CKCallContext &context) {
  if (namesOrHandles.size() > CKMostShareParticipants) {
    return {CKErrorMake(CKErrorCode::limitExceeded, "Too many participants in one call"), {}};
  }
  CKShareParticipantsReply reply;
  bool isPartial = false;
  reply.error = home.run(Home::Access::read, context, [&](const Connection &connection) {
    for (const std::string &nameOrHandle : namesOrHandles) {
      reply.results.push_back(lookUp(connection, nameOrHandle));
      isPartial = isPartial || reply.results.back().error;
    }
  });
  if (reply.error) return {reply.error, {}};
  if (isPartial) reply.error = CKErrorMake(CKErrorCode::partialFailure, "Some accounts weren't found");
  return reply;
}

}  // namespace droxa::embedded
