#include "cli/DaemonClient.h"

#include "cli/Waiting.h"

namespace droxa {

DaemonClient::DaemonClient(std::shared_ptr<QVDaemonConnection> connection, std::chrono::milliseconds timeout)
    : connection_(std::move(connection)), timeout_(timeout) {}

namespace {

// A lost or absent daemon, said in words.
NSError daemonIsAway(const NSError &cause) {
  if (cause.is(NSCocoaErrorDomain, NSXPCConnectionReplyInvalid)) return cause;
  NSUserInfo information{{NSLocalizedDescriptionKey, std::string("keld doesn't answer")}};
  information[NSUnderlyingErrorKey] = cause;
  return NSError(NSCocoaErrorDomain, NSXPCConnectionInvalid, information);
}

template <class Value, class Call>
CallResult<Value> ask(QVDaemonConnection &connection, std::chrono::milliseconds timeout, Call call) {
  auto slot = std::make_shared<AnswerSlot<Value>>();
  const auto daemon = connection.remoteObjectProxyWithErrorHandler([slot](const NSError &error) {
    slot->put({{}, daemonIsAway(error)});
  });
  call(*daemon, slot);
  return slot->wait(timeout);
}

}  // namespace

CallResult<QVDaemonStatus> DaemonClient::status() {
  return ask<QVDaemonStatus>(*connection_, timeout_, [](QVProtocol &daemon, auto slot) {
    daemon.getStatus([slot](const QVDaemonStatus &status, const NSError &error) {
      slot->put({status, error});
    });
  });
}

CallResult<DaemonClient::Account> DaemonClient::account() {
  return ask<Account>(*connection_, timeout_, [](QVProtocol &daemon, auto slot) {
    daemon.getAccount([slot](const Account &account, const NSError &error) { slot->put({account, error}); });
  });
}

CallResult<DaemonClient::Account> DaemonClient::signIn(const std::string &name) {
  return ask<Account>(*connection_, timeout_, [&](QVProtocol &daemon, auto slot) {
    daemon.signIn(name, [slot](const Account &account, const NSError &error) {
      slot->put({account, error});
    });
  });
}

NSError DaemonClient::signOut() {
  return ask<bool>(*connection_, timeout_,
                   [](QVProtocol &daemon, auto slot) {
                     daemon.signOut([slot](const NSError &error) { slot->put({true, error}); });
                   })
      .error;
}

}  // namespace droxa
