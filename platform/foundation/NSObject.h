#pragma once

#include <string>

namespace droxa {

// The root of the objects that can be described: in log lines ("%@") and inside an error's user info.
// Thread contract: description() may be called on any thread.
class NSObject {
 public:
  virtual ~NSObject() = default;
  virtual std::string description() const;
};

}  // namespace droxa
