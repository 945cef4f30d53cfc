#include "cli/DaemonClient.h"

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
std::shared_ptr<AnswerSlot<Value>> begin(QVDaemonConnection &connection, Call call) {
  auto slot = std::make_shared<AnswerSlot<Value>>();
  const auto daemon = connection.remoteObjectProxyWithErrorHandler([slot](const NSError &error) {
    slot->put({{}, daemonIsAway(error)});
  });
  call(*daemon, slot);
  return slot;
}

template <class Value, class Call>
CallResult<Value> ask(QVDaemonConnection &connection, std::chrono::milliseconds timeout, Call call) {
  return begin<Value>(connection, std::move(call))->wait(timeout);
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

CallResult<std::vector<QVContainerDescription>> DaemonClient::containers() {
  using Containers = std::vector<QVContainerDescription>;
  return ask<Containers>(*connection_, timeout_, [](QVProtocol &daemon, auto slot) {
    daemon.getContainers([slot](const Containers &containers, const NSError &error) {
      slot->put({containers, error});
    });
  });
}

CallResult<QVContentsStatus> DaemonClient::contentsStatus(const NSURL &url) {
  return ask<QVContentsStatus>(*connection_, timeout_, [&](QVProtocol &daemon, auto slot) {
    daemon.getContentsStatusAtURL(url, [slot](const QVContentsStatus &status, const NSError &error) {
      slot->put({status, error});
    });
  });
}

CallResult<QVTransferStatus> DaemonClient::transferStatus() {
  return ask<QVTransferStatus>(*connection_, timeout_, [](QVProtocol &daemon, auto slot) {
    daemon.getTransferStatus([slot](const QVTransferStatus &status, const NSError &error) {
      slot->put({status, error});
    });
  });
}

NSError DaemonClient::setPinned(const NSURL &url, bool isPinned) {
  return ask<bool>(*connection_, timeout_,
                   [&](QVProtocol &daemon, auto slot) {
                     daemon.setPinnedAtURL(url, isPinned, [slot](const NSError &error) {
                       slot->put({true, error});
                     });
                   })
      .error;
}

NSError DaemonClient::confirmDeletions(bool carryOut) {
  return ask<bool>(
             *connection_, timeout_,
             [&](QVProtocol &daemon, auto slot) {
               daemon.confirmDeletions(carryOut, [slot](const NSError &error) { slot->put({true, error}); });
             })
      .error;
}

CallResult<DaemonClient::ShareOptions> DaemonClient::shareOptions(const std::string &identifier) {
  return ask<ShareOptions>(*connection_, timeout_, [&](QVProtocol &daemon, auto slot) {
    daemon.getShareOptionsOfItemIdentifier(
        identifier, [slot](bool isShared, bool byOthers, bool byItself,
                           const std::optional<std::string> &folder, const NSError &error) {
          slot->put({{isShared, byOthers, byItself, folder}, error});
        });
  });
}

CallResult<NSURL> DaemonClient::acceptShare(const NSURL &shareURL) {
  return ask<NSURL>(*connection_, timeout_, [&](QVProtocol &daemon, auto slot) {
    daemon.acceptShareWithURL(shareURL, [slot](const NSURL &url, const NSError &error) {
      slot->put({url, error});
    });
  });
}

std::shared_ptr<AnswerSlot<QVContentsResult>> DaemonClient::evict(const NSURL &url) {
  return begin<QVContentsResult>(*connection_, [&](QVProtocol &daemon, auto slot) {
    daemon.evictItemAtURL(url, [slot](const QVContentsResult &result, const NSError &error) {
      slot->put({result, error});
    });
  });
}

std::shared_ptr<AnswerSlot<bool>> DaemonClient::waitForUpload(const NSURL &url) {
  return begin<bool>(*connection_, [&](QVProtocol &daemon, auto slot) {
    daemon.waitForUploadAtURL(url, [slot](const NSError &error) { slot->put({true, error}); });
  });
}

}  // namespace droxa
