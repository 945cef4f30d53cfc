#pragma once

#include <map>
#include <optional>
#include <string>
#include <vector>

#include "platform/cloudkit/embedded/Hierarchy.h"

namespace droxa::embedded {

using Permission = CKShareParticipantPermission;
using ShareNumber = std::int64_t;

// Where a share is.
struct SharePlace {
  ShareNumber share = 0;
  std::int64_t zone = 0;
  std::string record;
  std::string root;
};

// The shares of one zone, in the tables that answer who sees what. Thread contract: the connection's.
class ShareTable {
 public:
  ShareTable(const Connection &connection, std::int64_t zone) : connection_(connection), zone_(zone) {}

  std::optional<SharePlace> byRecord(const std::string &record) const;
  std::optional<SharePlace> byRoot(const std::string &root) const;
  // The shares that have one of these records as their root.
  std::vector<ShareNumber> withRootsAmong(const std::vector<std::string> &records) const;

  // Puts a share that is saved: makes it known where it is new, and gives access to exactly those
  // participants who have accepted it. The first share of a zone makes its hierarchy. Answers the accounts
  // whose access may have changed.
  std::vector<std::int64_t> put(const CKShare &share) const;
  // Forgets a share, its URL and everybody's access; the last one takes the hierarchy along. Answers the
  // accounts that had access.
  std::vector<std::int64_t> remove(const SharePlace &place) const;

  // The account's permission, the highest of those shares'.
  Permission permissionOf(std::int64_t account, const std::vector<ShareNumber> &shares) const;
  // Who has access to a share.
  std::vector<std::int64_t> accountsOf(ShareNumber share) const;
  // The zone's shares that an account has access to.
  std::vector<SharePlace> sharesOf(std::int64_t account) const;

 private:
  void countShares(int difference) const;
  const Connection &connection_;
  const std::int64_t zone_;
};

std::optional<SharePlace> ShareByURL(const Connection &connection, const NSURL &url);

// The account of that name; or, where there is none, with that handle.
struct Account {
  std::int64_t number = 0;
  CKUserIdentity identity;
};
std::optional<Account> AccountByName(const Connection &connection, const std::string &name);
std::optional<Account> AccountByHandle(const Connection &connection, const std::string &handle);
Account AccountByNumber(const Connection &connection, std::int64_t number);

}  // namespace droxa::embedded
