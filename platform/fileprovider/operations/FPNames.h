#pragma once

#include <cstddef>
#include <string>

#include "platform/foundation/NSError.h"

namespace droxa {

inline constexpr std::size_t kFPLongestName = 255;  // bytes

// Whether an item may bear the name, which is any bytes; an error that quotes it (514) otherwise.
NSError FPCheckName(const std::string &name);

// The names that an item tries where its own is taken: "name 2.ext", "name 3.ext", …. One that ends in a
// number already ("name 2") goes on from it; a number of four digits and more is taken for a year or a
// serial number, which isn't counted on. Folders and names that begin with a dot have no extension. Names
// are shortened, between characters, to fit. Thread contract: for one thread.
class FPBouncedNames {
 public:
  FPBouncedNames(const std::string &name, bool isFolder);
  std::string next();

 private:
  std::string stem_;
  std::string extension_;  // with its dot
  std::size_t number_ = 2;
};

}  // namespace droxa
