#pragma once

#include "platform/xpc/NSXPCConnection.h"

namespace droxa {

inline constexpr char QVSharingProxyEntitlement[] = "com.quorva.Tessaly.sharing-proxy";
inline constexpr char QVSharingPrivateInterfaceEntitlement[] = "com.quorva.Tessaly.sharing-private-interface";
inline constexpr char QVFolderSharingProxyEntitlement[] = "com.quorva.Tessaly.folder-sharing-proxy";

// What a connected client may ask of the sharing operations. Its entitlements are read once, when this is
// made (platform/entitlements/), so a client keeps through a connection what it had when it connected.
// Thread contract: immutable.
class QVCClientPrivilegesDescriptor {
 public:
  // The token names the client's process (NSXPCConnection::peer()); an all-zero one has no privileges.
  explicit QVCClientPrivilegesDescriptor(const NSXPCPeer &auditToken);

  bool isSharingProxyEntitled() const { return isSharingProxyEntitled_; }
  bool isSharingPrivateInterfaceEntitled() const { return isSharingPrivateInterfaceEntitled_; }
  bool isFolderSharingProxyEntitled() const { return isFolderSharingProxyEntitled_; }

 private:
  bool isSharingProxyEntitled_ = false;
  bool isSharingPrivateInterfaceEntitled_ = false;
  bool isFolderSharingProxyEntitled_ = false;
};

}  // namespace droxa
