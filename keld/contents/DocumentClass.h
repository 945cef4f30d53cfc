#pragma once

#include <optional>
#include <string>

#include "keld/FolderReading.h"
#include "keld/contents/ContentsCapabilities.h"
#include "keld/contents/DocumentMarker.h"

namespace droxa::keld {

enum class DocumentClass {
  missing,        // nothing of that name, and no promise of it
  notADocument,   // a folder, a link or something else
  plain,          // no marker: contents that the cloud needn't know
  present,        // the contents that the marker tells
  edited,         // was present; size or modification time say that it was changed here
  dataless,       // an untouched placeholder, or a promise
  evicting,       // an eviction was cut short: finishEviction
  overwritten,    // was dataless; somebody has written the whole of it anew, or emptied it
  partlyWritten,  // was dataless; somebody wrote into it or cut it, and what they didn't write is missing
  unreadable,     // the file system refused to tell: `error`
};

// What a document on disk is.
struct DocumentLook {
  DocumentClass kind = DocumentClass::missing;
  std::optional<DocumentMarker> marker;
  // The file's own; of a promised document the promise's inode and times of change, and the document's size,
  // mode and modification time.
  FileFacts facts;
  bool isPromised = false;  // a promise stands in the folder (besides the document, unless it is dataless)
  int error = 0;            // an errno, when unreadable
};

// Looks at `name` in the folder (which may be open as a path alone) without changing anything. In the promise
// form a promise beside a document counts as its marker: a document that agrees with it is present.
//
// What nobody can tell: a placeholder whose user wrote zeros alone by leaving holes (of the same size) reads
// as dataless; one that fits into a block and was written in part reads as overwritten, unless all of the old
// range reads as zeros (then something was appended: partlyWritten).
DocumentLook ClassifyDocument(int folder, const std::string &name, DatalessForm form,
                              std::uint64_t ownDevice);
// The same of an open regular file (open for reading), whatever its name.
DocumentLook ClassifyOpenDocument(int descriptor, std::uint64_t ownDevice);
// What is shown of a document that a promise stands for, as in DocumentLook::facts; nullopt when there is no
// promise of it.
std::optional<FileFacts> ReadPromisedFacts(int folder, const std::string &name, std::uint64_t ownDevice);

}  // namespace droxa::keld
