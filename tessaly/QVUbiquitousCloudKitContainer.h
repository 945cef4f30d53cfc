#pragma once

namespace droxa {

// The container of the cloud that the drive's documents are in, and in whose name it is asked.
inline constexpr char QVUbiquitousCloudKitContainerIdentifier[] = "com.quorva.clouddocs";
inline constexpr char QVDaemonBundleID[] = "com.quorva.keld";

}  // namespace droxa
