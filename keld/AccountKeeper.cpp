#include "keld/AccountKeeper.h"

#include <algorithm>

#include "tessaly/QVAccount.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVHomeCloud.h"

namespace droxa::keld {

AccountKeeper::AccountKeeper(std::string configurationFolder,
                             std::function<std::string(const std::string &)> identifierFor)
    : configurationFolder_(std::move(configurationFolder)), identifierFor_(std::move(identifierFor)) {}

NSError AccountKeeper::load() {
  NSError error;
  const auto stored = QVAccountStoreRead(configurationFolder_, &error);
  const Lock lock(mutex_);
  account_.reset();
  if (stored) account_ = QVAccountDescription{stored->name(), stored->perAppAccountIdentifier()};
  return error;
}

std::optional<QVAccountDescription> AccountKeeper::account() const {
  const Lock lock(mutex_);
  return account_;
}

NSError AccountKeeper::signIn(const std::string &name) {
  if (!isValidName(name))
    return qvc_error(QVErrorInvalidArgument, "\"" + name + "\" isn't an account's name");
  const QVAccountDescription account{name, identifierFor_(name)};
  const Lock lock(mutex_);
  const NSError error =
      QVAccountStoreWrite(configurationFolder_, QVAccount(account.name, account.perAppAccountIdentifier));
  if (!error) account_ = account;
  return error;
}

NSError AccountKeeper::signOut() {
  const Lock lock(mutex_);
  const NSError error = QVAccountStoreRemove(configurationFolder_);
  if (!error) account_.reset();
  return error;
}

bool AccountKeeper::isValidName(const std::string &name) {
  return !name.empty() && std::none_of(name.begin(), name.end(), [](char c) {
    return static_cast<unsigned char>(c) < 0x20 || c == 0x7f;
  });
}

std::string AccountKeeper::localUserName() {
  return QVLocalUserName();
}

}  // namespace droxa::keld
