#pragma once

#include <string>

namespace droxa {

// Below what path programs see what lies below a path of the replica.
struct ShownFolder {
  std::string replica;
  std::string shown;
};

}  // namespace droxa
