#pragma once

#include <string>
#include <string_view>

namespace droxa::keld {

// The containers that show what others share: one for each owner, named after the owner's account.

// The container of that owner. Account names are any bytes: those that a folder's name can't be trusted with
// are written as "_" and two digits, and what is too long ends with its digest instead.
std::string SharedContainerOf(std::string_view ownerName);
bool IsSharedContainer(std::string_view containerID);

// "Shared by " and the owner, as a folder may be called: separators and control characters replaced, and cut
// where it is too long.
std::string SharedContainerTitle(std::string_view owner);

}  // namespace droxa::keld
