#include "cli/ShareText.h"

#include <nlohmann/json.hpp>

#include "cli/Text.h"

namespace droxa {

namespace {

using Json = nlohmann::ordered_json;
constexpr CKShareParticipantPermission kPermissions[] = {CKShareParticipantPermission::none,
                                                         CKShareParticipantPermission::readOnly,
                                                         CKShareParticipantPermission::readWrite};

const char *roleText(CKShareParticipantRole role) {
  switch (role) {
    case CKShareParticipantRole::owner:
      return "owner";
    case CKShareParticipantRole::publicUser:
      return "came by the link";
    case CKShareParticipantRole::privateUser:
      break;
  }
  return "invited";
}

const char *statusText(CKShareParticipantAcceptanceStatus status) {
  switch (status) {
    case CKShareParticipantAcceptanceStatus::accepted:
      return "accepted";
    case CKShareParticipantAcceptanceStatus::removed:
      return "left";
    case CKShareParticipantAcceptanceStatus::pending:
      break;
  }
  return "not accepted yet";
}

std::string nameText(const CKUserIdentity &who) {
  std::string also = who.displayName;
  if (!who.handle.empty()) also += (also.empty() ? "" : ", ") + who.handle;
  if (who.accountName.empty()) return escapedText(also);
  return escapedText(who.accountName) + (also.empty() ? "" : " (" + escapedText(also) + ")");
}

Json participantJSON(const CKShareParticipant &participant) {
  const CKUserIdentity &who = participant.userIdentity;
  return {{"account", who.accountName},
          {"name", who.displayName},
          {"handle", who.handle},
          {"role", roleText(participant.role)},
          {"permission", permissionText(participant.permission)},
          {"status", statusText(participant.acceptanceStatus)}};
}

Json textOrNull(const std::string *text) {
  return text ? Json(*text) : Json(nullptr);
}

}  // namespace

const char *permissionText(CKShareParticipantPermission permission) {
  switch (permission) {
    case CKShareParticipantPermission::readOnly:
      return "read-only";
    case CKShareParticipantPermission::readWrite:
      return "read-write";
    case CKShareParticipantPermission::none:
      break;
  }
  return "none";
}

std::optional<CKShareParticipantPermission> permissionOfText(const std::string &text) {
  for (const CKShareParticipantPermission one : kPermissions)
    if (text == permissionText(one)) return one;
  return std::nullopt;
}

std::string participantLine(const CKShareParticipant &participant) {
  std::string line = nameText(participant.userIdentity) + ": ";
  if (participant.role == CKShareParticipantRole::owner) return line + "owner\n";
  return line + permissionText(participant.permission) + ", " + roleText(participant.role) + ", " +
         statusText(participant.acceptanceStatus) + "\n";
}

std::string shareLines(const std::string &item, const CKShare &share,
                       const std::optional<std::string> &folder) {
  if (!share.isKnownToServer()) return escapedText(item) + ": not shared\n";
  std::string lines =
      escapedText(item) + ": shared" + (folder ? " with the folder " + escapedText(*folder) : "") + "\n";
  if (share.URL) lines += "  link      " + escapedText(share.URL.absoluteString()) + "\n";
  if (const auto *title = share.get<std::string>(CKShareTitleKey))
    lines += "  title     " + escapedText(*title) + "\n";
  lines += std::string("  everyone  ") + permissionText(share.publicPermission) + "\n";
  for (const CKShareParticipant &one : share.participants) lines += "  " + participantLine(one);
  return lines;
}

std::string shareJSON(const std::string &item, const CKShare &share,
                      const std::optional<std::string> &folder) {
  Json object{{"item", item}, {"shared", share.isKnownToServer()}};
  if (share.isKnownToServer()) {
    object["link"] = share.URL ? Json(share.URL.absoluteString()) : Json(nullptr);
    object["title"] = textOrNull(share.get<std::string>(CKShareTitleKey));
    object["type"] = textOrNull(share.get<std::string>(CKShareTypeKey));
    object["folder"] = textOrNull(folder ? &*folder : nullptr);
    object["everyone"] = permissionText(share.publicPermission);
    object["participants"] = Json::array();
    for (const CKShareParticipant &one : share.participants)
      object["participants"].push_back(participantJSON(one));
  }
  return object.dump(-1, ' ', false, Json::error_handler_t::replace) + "\n";
}

std::string linkText(const std::string &item, const NSURL &link, bool json) {
  if (!json) return escapedText(link.absoluteString()) + "\n";
  const Json object{{"item", item}, {"link", link ? Json(link.absoluteString()) : Json(nullptr)}};
  return object.dump(-1, ' ', false, Json::error_handler_t::replace) + "\n";
}

}  // namespace droxa
