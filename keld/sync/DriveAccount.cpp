#include "keld/sync/DriveAccount.h"

#include <stdexcept>
#include <unistd.h>

#include "keld/AccountKeeper.h"

namespace droxa::keld {

namespace {

constexpr char kAccount[] = "driveAccount";

// "" for a home that has never met its cloud.
std::string accountBefore(const DroxaHome &home) {
  const std::string path = home.state() + "/sync.sqlite";
  if (::access(path.c_str(), F_OK) != 0) return "";
  SyncStore store(path);
  const std::string known = store.text(kAccount);
  // Drives of before this was remembered are those of who runs them.
  if (known.empty() && !store.text(kSyncCloudIdentifier).empty()) return AccountKeeper::localUserName();
  return known;
}

}  // namespace

std::string DriveAccount(const DroxaHome &home, const std::string &asked) {
  const std::string before = accountBefore(home);
  if (asked.empty()) return before.empty() ? AccountKeeper::localUserName() : before;
  if (!AccountKeeper::isValidName(asked) || asked.size() > 255)
    throw std::runtime_error("\"" + asked + "\" isn't an account's name");
  if (before.empty() || before == asked) return asked;
  throw std::runtime_error("the drive of " + home.root() + " is the account \"" + before +
                           "\"'s, and can't become \"" + asked +
                           "\"'s; leave --account out, or name another --home");
}

void RememberDriveAccount(SyncStore &store, const std::string &account) {
  if (store.text(kAccount).empty()) store.setText(kAccount, account);
}

}  // namespace droxa::keld
