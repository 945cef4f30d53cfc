#pragma once

// What a client's operation is told while the daemon shares (QVOperationClient::progressCallbackWithTopic).

namespace droxa {

inline constexpr char QVSharingTopicUpload[] = "com.quorva.sharing.upload";        // items that the cloud has
inline constexpr char QVSharingTopicDownload[] = "com.quorva.sharing.download";    // bytes of the document
inline constexpr char QVSharingTopicSubshares[] = "com.quorva.sharing.subshares";  // shares below a folder

// Both are integers. The total may change on the way.
inline constexpr char QVSharingProgressDone[] = "done";
inline constexpr char QVSharingProgressTotal[] = "total";

}  // namespace droxa
