#pragma once

#include <memory>
#include <optional>
#include <string>
#include <utility>

namespace droxa {

// An account of this drive's. Thread contract: immutable.
class ACAccount final {
 public:
  explicit ACAccount(std::optional<std::string> identifier) : identifier_(std::move(identifier)) {}
  const std::optional<std::string> &identifier() const { return identifier_; }

 private:
  const std::optional<std::string> identifier_;
};

// The accounts that this process may know of: whoever is signed in to the drive. Thread contract: any thread.
class ACAccountStore final {
 public:
  static ACAccountStore &defaultStore();
};

// The account for the calling thread's persona: a drive has one account, whatever the persona. Null when
// nobody is signed in, or the account store can't be read.
std::shared_ptr<const ACAccount> qv_accountForCurrentPersona(ACAccountStore &store);

}  // namespace droxa
