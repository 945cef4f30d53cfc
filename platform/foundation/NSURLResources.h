#pragma once

#include <string>

#include "platform/foundation/NSError.h"
#include "platform/foundation/NSURL.h"

// What the file system says of the file at a URL. A symbolic link is looked at itself, not what it leads to.
// Thread contract: any thread.

namespace droxa {

// Whether the contents can be read at once: there is something, and it isn't a document whose contents are
// elsewhere (NSFileManager::ubiquitousItemProvider). Otherwise `error` (may be null) is set:
// NSFileReadNoSuchFileError with the system's error beneath.
bool checkResourceIsReachableAndReturnError(const NSURL &url, NSError *error);

inline constexpr char NSURLIsDirectoryKey[] = "NSURLIsDirectoryKey";
// A folder that is shown and opened as one document. It has the extended attribute "user.droxa.package", or
// one of the extensions in <configuration folder>/package-extensions (one a line, without the dot, "#" starts
// a comment; read once). Without that file: bundle, odpkg, rtfd, sparsebundle.
inline constexpr char NSURLIsPackageKey[] = "NSURLIsPackageKey";

// A symbolic link: what stands for another item.
inline constexpr char NSURLIsAliasFileKey[] = "NSURLIsAliasFileKey";

// Shared with other people: what the sync service says of it (NSFileManager::ubiquitousItemProvider), which
// may take a question to its daemon. Without a service nothing is shared.
inline constexpr char NSURLUbiquitousItemIsSharedKey[] = "NSURLUbiquitousItemIsSharedKey";

// Whether `key` is known and there is a file; `value` is its resource value then. Otherwise `value` stays,
// and `error` (may be null) is set.
bool getResourceValue(const NSURL &url, bool *value, const std::string &key, NSError *error);

// The same of an item whose contents may still be to come: what can be told without them.
bool getPromisedItemResourceValue(const NSURL &url, bool *value, const std::string &key, NSError *error);

// For tests: the next question reads the extensions again.
void NSURLForgetPackageExtensions();

}  // namespace droxa
