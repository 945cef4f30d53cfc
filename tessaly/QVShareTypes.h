#pragma once

namespace droxa {

// What a share is of: the value of CKShareTypeKey among a share's fields. A share without one is a
// document's.
inline constexpr char QVFolderShareType[] = "com.quorva.folder";
inline constexpr char QVDocumentShareType[] = "com.quorva.document";

}  // namespace droxa
