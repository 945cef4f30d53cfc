#pragma once

#include <string>
#include <string_view>

#include "cli/ControlClient.h"

namespace droxa {

// PATH|IDENTIFIER, as commands take it. An argument with a slash, "." or ".." is a path; a number after "d"
// or "i", and the framework's names of containers, are identifiers, unless there is no such item but one of
// that name in the root; anything else is a name in the root.
bool looksLikeIdentifier(std::string_view argument);
// The text for the help.
inline constexpr char kItemArgumentHelp[] =
    "a path of the drive (\"/\", \"Documents/a.txt\"), an absolute path inside the replica, or an identifier "
    "(\"d12\", \"i3\"). \"./d12\" is always a path";

// The item that the argument stands for.
CallResult<ControlClient::Item> resolveItem(ControlClient &client, const std::string &argument);

struct ResolvedContainer {
  std::string identifier;
  ControlClient::Item item;  // null for the root and the framework's other containers: nothing was asked
};
// What can be listed or watched, through an alias its target; a document too, which the caller tells by its
// kind.
CallResult<ResolvedContainer> resolveContainer(ControlClient &client, const std::string &argument);

}  // namespace droxa
