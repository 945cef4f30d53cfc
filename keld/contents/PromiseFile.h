#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "keld/contents/DocumentMarker.h"

namespace droxa::keld {

// The side-fault form of a dataless document, for file systems without extended attributes or holes: a hidden
// file `.<name>.droxafault` in the document's folder, while nothing stands at the document's own name. It
// holds all that is shown of the document.
struct PromiseFile {
  std::string name;  // the document's
  DocumentMarker marker;
  std::uint32_t mode = 0644;  // permission bits
  std::int64_t modified = 0;  // nanoseconds since 1970

  bool operator==(const PromiseFile &) const = default;
};

// Whether a file of this name is a promise: its document is what is shown, not it.
bool IsPromiseName(std::string_view name);
// The name of the promise for a document. A name that leaves no room is shortened, and made unique by a hash.
std::string PromiseNameFor(std::string_view documentName);
// The document's name; nullopt when it isn't a promise's, or was shortened: then ReadPromise tells.
std::optional<std::string> NameOfPromise(std::string_view promiseName);

std::string EncodePromise(const PromiseFile &promise);
// nullopt for anything that EncodePromise doesn't write.
std::optional<PromiseFile> ParsePromise(std::string_view bytes);
// Reads the promise of that file name in the folder (which may be open as a path alone); nullopt when there
// is none, it doesn't parse, or its name is a shortened one that belongs to another document's. Its
// document's name follows from the file's name where that isn't shortened, so that a promise is renamed as
// any file is.
std::optional<PromiseFile> ReadPromise(int folder, const std::string &promiseName);

}  // namespace droxa::keld
