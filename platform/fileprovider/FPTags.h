#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "platform/foundation/NSData.h"

namespace droxa {

// A tag of an item, as the framework hands it over.
struct FPTag {
  std::string label;       // UTF-8, without control characters
  std::uint8_t color = 0;  // 0 none, 1 grey, 2 green, 3 purple, 4 blue, 5 yellow, 6 red, 7 orange
  bool operator==(const FPTag &) const = default;
};

// The tags of a blob of tag data, in its order; none of an empty blob. What isn't tag data, from the first
// byte that can't be understood, is passed over: the tags before it are given. Never fails. Any thread.
std::vector<FPTag> FPGetTagsFromTagsData(const NSData &tagData);
// The blob of these tags; nil for none. A tag whose label can't be one (empty, not UTF-8, with control
// characters, or beyond 65,535 bytes) is left out, and an unknown colour becomes none.
NSData FPGetTagsDataFromTags(const std::vector<FPTag> &tags);

}  // namespace droxa
