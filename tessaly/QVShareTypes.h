#pragma once

// What a share is of, as its CKShareTypeKey tells.

namespace droxa {

inline constexpr char QVFolderShareType[] = "com.quorva.folder";
inline constexpr char QVDocumentShareType[] = "com.quorva.document";

}  // namespace droxa
