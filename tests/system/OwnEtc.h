#pragma once

#include <string>
#include <vector>

namespace droxa::testing {

// An /etc that this process and all that it starts have to themselves: the system's, and over it what is
// written here, which nobody else sees and which goes with the last of them. What an administrator alone may
// write is a test's to write there. Thread contract: enter() before any thread exists; the rest one thread.
class OwnEtc {
 public:
  // Once, at the start of main().
  static void enter();
  // Why it couldn't be entered: the system lets this user make no namespaces; "" when it was.
  static const std::string &whyNot();

  // Grants the program at `path` these entitlements, in place of what it had; none: takes them back. Holds
  // from the program's next connection on.
  static void grant(const std::string &path, const std::vector<std::string> &entitlements);
  static void revokeAll();
};

}  // namespace droxa::testing
