#pragma once

#include <cstdint>
#include <string>

namespace droxa {

// The sync's marker on a document: version "1", a letter ("p": the contents are here, "d": they are in the
// cloud alone, "e": they are being let go of, "f": a folder's), size and date of the cloud's contents, ….
inline constexpr char kDocumentAttribute[] = "user.droxa.document";

enum class DocumentState : std::uint8_t {
  unmarked,  // the cloud may not know it
  present,   // here, and as the cloud has it
  edited,    // here, and changed since
  dataless,  // in the cloud alone
};

// What an open file is (open for reading, or for writing alone), by its marker and its extents: one that was
// written anew isn't dataless, whatever its marker says. Asks the file system alone. Any thread.
DocumentState stateOfOpenDocument(int descriptor);
// The same of a file that is open as a path alone.
DocumentState stateOfPath(int descriptor);

}  // namespace droxa
