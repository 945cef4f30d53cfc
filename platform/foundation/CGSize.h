#pragma once

namespace droxa {

// A width and a height, in points or pixels as its user says.
// Thread contract: a value.
struct CGSize {
  double width = 0;
  double height = 0;
  bool operator==(const CGSize &) const = default;
};

}  // namespace droxa
