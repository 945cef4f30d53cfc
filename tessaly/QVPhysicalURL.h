#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "platform/foundation/NSURL.h"

// What stands on the disk for a document that isn't there: on a file system without extended attributes, a
// promise ".<name>.droxafault" beside where it would be. The URL of the document is its logical URL, that of
// what is on the disk the physical one. Asks the file system alone. Any thread.

namespace droxa {

// Whether the middle of a promise's name, between "." and ".droxafault", is a shortened one: "…~" and 16
// hexadecimal digits. Which document it belongs to is told by its text alone.
bool QVIsShortenedPromiseName(std::string_view middle);
// The name of the promise for a document; nullopt for a document whose promise's name is shortened.
std::optional<std::string> QVPromiseNameForName(std::string_view name);
// The document's name in a promise's text; nullopt when it isn't one.
std::optional<std::string> QVNameInPromise(std::string_view text);

// The promise when it is there and nothing stands at `url` itself, else `url`.
NSURL QVPhysicalURL(const NSURL &url);

}  // namespace droxa
