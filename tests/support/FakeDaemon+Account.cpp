// What is asked about the account and the daemon itself.

#include <algorithm>
#include <utility>

#include "tessaly/QVNotifications.h"
#include "tests/support/FakeDaemon.h"

namespace droxa {

void FakeDaemon::subscribeToNotifications(std::shared_ptr<QVDaemonNotificationReceiving> receiver,
                                          QVErrorReply reply) {
  const NSError error = begin("subscribeToNotifications", "");
  if (!error) {
    const Lock lock(mutex_);
    subscribers_.push_back(std::move(receiver));
  }
  replies_->give("subscribeToNotifications", [=, reply = std::move(reply)] { reply(error); });
}

void FakeDaemon::getAccount(QVAccountReply reply) {
  const NSError error = begin("getAccount", "");
  std::optional<QVAccountDescription> account;
  if (!error) {
    const Lock lock(mutex_);
    account = account_;
  }
  replies_->give("getAccount", [=, reply = std::move(reply)] { reply(account, error); });
}

void FakeDaemon::signIn(const std::string &name, QVAccountReply reply) {
  NSError error = begin("signIn", name);
  const bool hasControl = std::any_of(
      name.begin(), name.end(), [](char c) { return static_cast<unsigned char>(c) < 0x20 || c == 0x7f; });
  if (!error && (name.empty() || hasControl))
    error = qvc_error(QVErrorInvalidArgument, "\"" + name + "\" isn't an account's name");
  std::optional<QVAccountDescription> account;
  if (!error) {
    account = QVAccountDescription{name, "account-" + name};
    setAccount(account);
    notify(QVAccountTokenDidChangeNotification);
  }
  replies_->give("signIn", [=, reply = std::move(reply)] { reply(account, error); });
}

void FakeDaemon::signOut(QVErrorReply reply) {
  const NSError error = begin("signOut", "");
  if (!error) {
    setAccount(std::nullopt);
    notify(QVAccountTokenDidChangeNotification);
  }
  replies_->give("signOut", [=, reply = std::move(reply)] { reply(error); });
}

void FakeDaemon::getStatus(QVStatusReply reply) {
  const NSError error = begin("getStatus", "");
  QVDaemonStatus status;
  if (!error) {
    status.senders = liveSenders();
    const Lock lock(mutex_);
    status.rank = drive_.rank();
    status.documents = drive_.count(NSFileProviderItemKind::document);
    status.folders = drive_.count(NSFileProviderItemKind::folder);
    status.aliases = drive_.count(NSFileProviderItemKind::alias);
    status.watcher = "none";
    status.firstScanDone = true;
  }
  replies_->give("getStatus", [=, reply = std::move(reply)] { reply(status, error); });
}

}  // namespace droxa
