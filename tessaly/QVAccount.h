#pragma once

#include <memory>
#include <optional>
#include <string>

#include "platform/foundation/NSError.h"

namespace droxa {

// Who is signed in.
// Thread contract: immutable; the class operations on any thread.
class QVAccount final {
 public:
  QVAccount(std::string name, std::optional<std::string> perAppAccountIdentifier);

  // The account in the account store; cached, and read again after an account-token change. Needs no daemon.
  // Null without error when nobody is signed in; null with `error` (may be null) set when the store can't be
  // read.
  static std::shared_ptr<const QVAccount> currentCachedLoggedInAccountWithError(NSError *error);
  // Subscribes this process to the daemon's notifications, once; it subscribes anew whenever the daemon comes
  // back, and posts QVAccountTokenDidChangeNotification and QVContainerListDidChangeNotification.
  static void startAccountTokenChangeObserverIfNeeded();
  static void forgetCachedAccount();  // the next question reads the store

  const std::string &name() const { return name_; }
  const std::optional<std::string> &perAppAccountIdentifier() const { return perAppAccountIdentifier_; }

 private:
  const std::string name_;
  const std::optional<std::string> perAppAccountIdentifier_;
};

// The account store: <configuration folder>/account.json. Written atomically; only the daemon writes it.
std::shared_ptr<const QVAccount> QVAccountStoreRead(const std::string &configurationFolder, NSError *error);
NSError QVAccountStoreWrite(const std::string &configurationFolder, const QVAccount &account);
NSError QVAccountStoreRemove(const std::string &configurationFolder);

}  // namespace droxa
