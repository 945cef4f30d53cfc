#pragma once

#include <algorithm>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "platform/cloudkit/CKShare.h"

namespace droxa::contract {

// Who sees what of a zone and may do what, told from the rules alone. Thread contract: one thread.
class ShareModel {
 public:
  struct Part {
    CKShareParticipantPermission permission = CKShareParticipantPermission::none;
    bool hasAccepted = false;
  };
  using Parts = std::map<std::string, Part>;  // by account

  std::map<std::string, std::string> parents;  // of the records that there are
  std::map<std::string, Parts> shares;         // by the root

  void remove(const std::string &record) {
    parents.erase(record);
    shares.erase(record);
  }

  std::set<std::string> sharesOver(const std::string &record) const {
    std::set<std::string> over;
    std::set<std::string> met;
    for (std::string at = record; parents.contains(at) && met.insert(at).second; at = parents.at(at)) {
      if (shares.contains(at)) over.insert(at);
    }
    return over;
  }

  CKShareParticipantPermission inShare(const std::string &account, const std::string &root) const {
    const Parts &parts = shares.at(root);
    const auto part = parts.find(account);
    if (part == parts.end() || !part->second.hasAccepted) return CKShareParticipantPermission::none;
    return part->second.permission;
  }

  CKShareParticipantPermission permission(const std::string &account, const std::string &record) const {
    auto highest = CKShareParticipantPermission::none;
    for (const std::string &root : sharesOver(record)) highest = std::max(highest, inShare(account, root));
    return highest;
  }
  bool mayWrite(const std::string &account, const std::string &record) const {
    return permission(account, record) == CKShareParticipantPermission::readWrite;
  }

  // The records and the roots' shares.
  std::set<std::string> seenBy(const std::string &account) const {
    std::set<std::string> seen;
    for (const auto &record : parents) {
      if (permission(account, record.first) != CKShareParticipantPermission::none) seen.insert(record.first);
    }
    for (const auto &share : shares) {
      if (inShare(account, share.first) != CKShareParticipantPermission::none) {
        seen.insert("share of " + share.first);
      }
    }
    return seen;
  }

  bool maySave(const std::string &account, const std::string &record, const std::string &parent) const {
    const auto current = parents.find(record);
    if (current == parents.end()) {
      const bool isNamed = std::any_of(parents.begin(), parents.end(),
                                       [&](const auto &other) { return other.second == record; });
      return mayWrite(account, parent) && !isNamed;
    }
    if (!mayWrite(account, record)) return false;
    if (current->second == parent) return true;
    if (!mayWrite(account, current->second) || !mayWrite(account, parent)) return false;
    std::set<std::string> met;
    for (std::string at = parent; parents.contains(at) && met.insert(at).second; at = parents.at(at)) {
      if (at == record) return false;
    }
    const std::set<std::string> after = sharesOver(parent);
    for (const std::string &root : sharesOver(current->second)) {
      if (inShare(account, root) != CKShareParticipantPermission::none && !after.contains(root)) return false;
    }
    return true;
  }
  bool mayDelete(const std::string &account, const std::string &record) const {
    return mayWrite(account, record) && !shares.contains(record);
  }
};

}  // namespace droxa::contract
