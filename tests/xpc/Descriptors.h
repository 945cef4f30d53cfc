#pragma once

#include <cstddef>
#include <dirent.h>

namespace droxa {

// How many descriptors this process has open.
inline std::size_t openDescriptors() {
  std::size_t count = 0;
  DIR *const folder = opendir("/proc/self/fd");
  while (readdir(folder)) ++count;
  closedir(folder);
  return count;
}

}  // namespace droxa
