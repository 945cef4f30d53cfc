#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "platform/foundation/NSError.h"
#include "platform/foundation/NSURL.h"
#include "tessaly/QVFileObjectID.h"

// What the Tessaly library adds to URLs. A nil receiver answers nil or false. Any thread; those that say so
// block on the daemon.

namespace droxa {

// Where the document or folder is on disk; nil with `error` (may be null) set. Blocks on the daemon.
NSURL qv_documentURLFromFileObjectID(const QVFileObjectID &fileObjectID, NSError *error);

// What kind of item is there, as the daemon tells it ("text/plain", "inode/directory"); nullopt with `error`
// (may be null) set: 22 for a nil URL, 14 when there is nothing. Blocks on the daemon.
std::optional<std::string> qv_typeIdentifierWithError(const NSURL &url, NSError *error);

// Whether it is an alias (bookmark): a symbolic link whose target is in a synced location.
bool qv_isExternalDocumentReference(const NSURL &url);
// The alias's target, through further aliases; nil with `error` (may be null) set for a dangling or circular
// one.
NSURL qv_URLByResolvingExternalDocumentReferenceWithError(const NSURL &url, NSError *error);

// Inside a container, but outside its documents folder.
bool qv_isInTessalyPrivateStorages(const NSURL &url);
// Kept local: names that editors and systems use for passing things ("*.nosync", "*.tmp", "~$…", ".#…",
// "*.swp",
// "*.part", "*.crdownload", ".fuse_hidden…"), and everything below such a folder.
bool qv_wouldBeExcludedFromSync(const NSURL &url);
bool qv_isNameExcludedFromSync(std::string_view name);
// Inside a container's folder.
bool qv_isInSyncedLocation(const NSURL &url);
// The side-fault (promise) file that stands for a document which isn't here, where the file system can't mark
// the document itself: ".<name>.droxafault".
bool qv_isPromiseURL(const NSURL &url);
// Whether `child` lies below `parent`, at any depth; nothing is its own parent.
bool qv_isParentOfURL(const NSURL &parent, const NSURL &child);
// Marks the URL so that later file operations use the physical, not the logical, file.
void qv_addPhysicalProperty(NSURL &url);
// The container whose documents folder `url` is; nullopt otherwise.
std::optional<std::string> qv_containerIDIfIsDocumentsContainerURL(const NSURL &url);

}  // namespace droxa
