#pragma once

#include <string>

#include "platform/foundation/NSData.h"
#include "platform/foundation/NSError.h"

namespace droxa {

// The folder that pictures are written to. Thread contract: one thread.
class PictureFolder {
 public:
  explicit PictureFolder(std::string path) : path_(std::move(path)) {}

  // Makes it where it is missing; nil, or why it can't be.
  NSError make() const;
  // Writes "<name>.png", or "<name> 2.png", … where there is one already, and gives its path. The file
  // appears as a whole; "" with `error` set when it can't be written.
  std::string write(const std::string &name, const NSData &picture, NSError *error) const;

 private:
  const std::string path_;
};

}  // namespace droxa
