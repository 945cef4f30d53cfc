#pragma once

#include <cstddef>
#include <string>

namespace droxa {

// The contents of a small file, or why it can't be read.
struct FileContents {
  int code = 0;  // an errno value; 0: `bytes` are the whole file
  std::string bytes;
};

// Reads a regular file of at most `most` bytes. Answers EISDIR for a folder, EINVAL for anything else that
// isn't a file (a pipe is not waited for), EFBIG for a larger one, or what the system said. Any thread.
FileContents ReadFile(const std::string &path, std::size_t most);

}  // namespace droxa
