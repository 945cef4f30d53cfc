#pragma once

#include <optional>
#include <string>

#include "platform/cloudkit/CKShare.h"

namespace droxa {

// "none", "read-only", "read-write"; what is neither of them is nothing.
const char *permissionText(CKShareParticipantPermission permission);
std::optional<CKShareParticipantPermission> permissionOfText(const std::string &text);

// One line of `droxa share participants`: name, permission, state.
std::string participantLine(const CKShareParticipant &participant);
// The lines of `droxa share`, and the same as one JSON object. A share that isn't known to the server is
// none; `folder` is the one above the item whose share it is, if it is.
std::string shareLines(const std::string &item, const CKShare &share,
                       const std::optional<std::string> &folder);
std::string shareJSON(const std::string &item, const CKShare &share,
                      const std::optional<std::string> &folder);
// The link alone, as a line or one JSON object.
std::string linkText(const std::string &item, const NSURL &link, bool json);

}  // namespace droxa
