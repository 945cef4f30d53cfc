#pragma once

#include <string>

#include "platform/fileprovider/FPTags.h"
#include "platform/fileprovider/NSFileProviderRemote.h"

namespace droxa {

// One line of `droxa ls -l`: type and permissions, size, date, identifier and name, in columns.
std::string longLine(const NSFileProviderItemFields &item);
// All properties, one a line, as `droxa stat` prints them.
std::string propertyLines(const NSFileProviderItemFields &item);
// One JSON object without a line break. A name that isn't UTF-8 is shown with replacement characters, and
// whole in "nameBytes" (base64).
std::string itemJSON(const NSFileProviderItemFields &item);
// The same with "path" and "depth", for `droxa tree`.
std::string treeJSON(const NSFileProviderItemFields &item, const std::string &path, std::size_t depth);

// One line of `droxa watch`: "+ name", "~ name", "> old -> new", "- name", "* listed anew".
std::string changeLine(const FPDChange &change);
std::string changeJSON(const FPDChange &change);

// "work", "work (red)".
std::string tagText(const FPTag &tag);

std::string kindText(NSFileProviderItemKind kind);

}  // namespace droxa
