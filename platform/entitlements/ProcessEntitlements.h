#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "platform/entitlements/EntitlementFiles.h"
#include "platform/xpc/NSXPCConnection.h"

namespace droxa {

// Who a process is, as entitlements know applications. A process in a Flatpak sandbox is its application and
// nothing else; any other is its executable.
struct ProcessApplication {
  std::optional<std::string> flatpak;
  std::string executable;  // its path as the process sees it; "" when the kernel doesn't tell
  std::uint64_t device = 0;
  std::uint64_t inode = 0;  // of the executable, by which it is recognised; 0: unknown
};

// What a process is entitled to, and how that came about.
struct ProcessEntitlements {
  std::int32_t processIdentifier = 0;
  ProcessApplication application;
  std::vector<EntitlementGrant> grants;  // those that apply
  std::vector<EntitlementProblem> problems;
  NSError error;  // why nothing is known of the process: nothing is granted then

  bool has(const std::string &entitlement) const;
};

// The entitlements of the process that the kernel named as `peer`. It is looked at through its process
// descriptor: whatever is read of it is read while that still names a living process, started when it was at
// first, so that a later process of the same number inherits nothing. Without a process descriptor, and of an
// all-zero peer, nothing is granted.
//
// A process that isn't in a sandbox can make any program of its user's do what it wants, so this keeps
// sandboxed applications apart, and only those. Any thread; reads files, never waits for the process.
ProcessEntitlements EntitlementsOfPeer(const NSXPCPeer &peer, const EntitlementFiles &files);

}  // namespace droxa
