#include "tessaly/ACAccountStore.h"

#include "tessaly/QVAccount.h"
#include "tessaly/QVLog.h"

namespace droxa {

ACAccountStore &ACAccountStore::defaultStore() {
  static ACAccountStore store;
  return store;
}

std::shared_ptr<const ACAccount> qv_accountForCurrentPersona(ACAccountStore & /*store*/) {
  NSError error;
  const auto account = QVAccount::currentCachedLoggedInAccountWithError(&error);
  if (error) os_log_error(qvc_default_log(), "[ERROR] can't read the account store: %@", error);
  if (!account) return nullptr;
  return std::make_shared<const ACAccount>(account->perAppAccountIdentifier());
}

}  // namespace droxa
