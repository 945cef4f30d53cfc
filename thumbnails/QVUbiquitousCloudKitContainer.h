#pragma once

namespace droxa {

// Makes this process open the drive's cloud where the home says it is (tessaly/QVHomeCloud.h), as the drive's
// account and device, when its container is first asked for (CKContainer::containerWithIdentifier with
// QVUbiquitousCloudKitContainerIdentifier): once, unless the home names another one. A cloud that isn't there
// isn't made. May be called again. Any thread.
void QVRegisterUbiquitousCloudKitContainer();

}  // namespace droxa
