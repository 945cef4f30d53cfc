#pragma once

#include <functional>
#include <optional>
#include <string>

#include "platform/foundation/NSError.h"
#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVProtocol.h"

namespace droxa::keld {

// Who is signed in: the account store, as this daemon last read or wrote it.
// Thread contract: any thread.
class AccountKeeper {
 public:
  // `identifierFor` gives the stable identifier of an account's name; it may block.
  AccountKeeper(std::string configurationFolder,
                std::function<std::string(const std::string &)> identifierFor);

  // Reads the store. nil, or what is wrong with it: then nobody is signed in.
  NSError load();
  std::optional<QVAccountDescription> account() const;
  bool isSignedIn() const { return account().has_value(); }
  NSError signIn(const std::string &name);
  NSError signOut();

  // "" for a name that an account can't have.
  static bool isValidName(const std::string &name);
  // The name of who runs this process.
  static std::string localUserName();

 private:
  const std::string configurationFolder_;
  const std::function<std::string(const std::string &)> identifierFor_;
  mutable Mutex mutex_;
  std::optional<QVAccountDescription> account_ GUARDED_BY(mutex_);
};

}  // namespace droxa::keld
