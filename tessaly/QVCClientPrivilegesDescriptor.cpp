#include "tessaly/QVCClientPrivilegesDescriptor.h"

#include "platform/entitlements/ProcessEntitlements.h"

namespace droxa {

QVCClientPrivilegesDescriptor::QVCClientPrivilegesDescriptor(const NSXPCPeer &auditToken) {
  if (auditToken.processIdentifier == 0) return;
  const ProcessEntitlements entitlements = EntitlementsOfPeer(auditToken, EntitlementFiles::processFiles());
  isSharingProxyEntitled_ = entitlements.has(QVSharingProxyEntitlement);
  isSharingPrivateInterfaceEntitled_ = entitlements.has(QVSharingPrivateInterfaceEntitlement);
  isFolderSharingProxyEntitled_ = entitlements.has(QVFolderSharingProxyEntitlement);
}

}  // namespace droxa
