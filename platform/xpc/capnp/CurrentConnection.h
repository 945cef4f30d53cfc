#pragma once

#include <memory>

namespace droxa {

class NSXPCConnection;
class XPCConnection;

// Makes a connection the calling thread's current one for a scope.
// Thread contract: made and destroyed on one thread.
class CurrentConnectionScope {
 public:
  explicit CurrentConnectionScope(const std::weak_ptr<XPCConnection> &connection);
  ~CurrentConnectionScope();
  CurrentConnectionScope(const CurrentConnectionScope &) = delete;
  CurrentConnectionScope &operator=(const CurrentConnectionScope &) = delete;

 private:
  std::shared_ptr<NSXPCConnection> previous_;
};

}  // namespace droxa
