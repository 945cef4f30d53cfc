#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstdlib>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/foundation/Paths.h"
#include "tessaly/NSURL+Tessaly.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVDaemonConnection.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVQueryItem.h"

namespace droxa {

namespace {

constexpr int kLongestLinkChain = 40;  // as the kernel's

// A path inside a container's folder, taken apart: replica/<containerID>/<rest>.
struct ContainerPath {
  std::string_view containerID;
  std::string_view rest;  // "Documents/a.txt"; never empty
};

// The layout alone tells the containers, so these questions need no daemon.
std::optional<ContainerPath> containerPath(std::string_view path, std::string_view replica) {
  if (path.size() <= replica.size() || path.substr(0, replica.size()) != replica ||
      path[replica.size()] != '/')
    return std::nullopt;
  path.remove_prefix(replica.size() + 1);
  const std::size_t slash = path.find('/');
  if (slash == 0 || slash == std::string_view::npos || slash + 1 == path.size()) return std::nullopt;
  if (path[0] == '.') return std::nullopt;
  return ContainerPath{path.substr(0, slash), path.substr(slash + 1)};
}

bool isInContainer(const NSURL &url) {
  return url.isFileURL() && containerPath(url.path(), DroxaProcessHome().replica()).has_value();
}

bool isInDocuments(const ContainerPath &path) {
  const std::string_view documents = QVDocumentsFolderName(path.containerID);
  return path.rest.substr(0, path.rest.find('/')) == documents;
}

std::string realPath(const std::string &path) {
  char *resolved = realpath(path.c_str(), nullptr);
  if (!resolved) return {};
  std::string result = resolved;
  std::free(resolved);
  return result;
}

bool isSymbolicLink(const NSURL &url) {
  struct stat status {};
  return url.isFileURL() && lstat(url.path().c_str(), &status) == 0 && S_ISLNK(status.st_mode);
}

// The path under the name by which this process knows the replica, which itself may be reached through links.
std::string inReplicaTerms(const std::string &path) {
  const std::string replica = DroxaProcessHome().replica();
  const std::string real = realPath(replica);
  const bool isBelow = !real.empty() && path.compare(0, real.size() + 1, real + "/") == 0;
  return isBelow ? replica + path.substr(real.size()) : path;
}

// One step along a chain of links: what the link at `url` says, against its folder as it really is.
NSURL linkTarget(const NSURL &url) {
  char target[PATH_MAX];
  const ssize_t length = readlink(url.path().c_str(), target, sizeof target);
  if (length <= 0) return NSURL();
  const std::string text(target, static_cast<std::size_t>(length));
  const std::string folder =
      text[0] == '/' ? "" : realPath(url.URLByDeletingLastPathComponent().path()) + "/";
  const NSURL next = NSURL::fileURLWithPath(folder + text);
  return NSURL::fileURLWithPath(inReplicaTerms(next.path()));
}

// Where a chain of links leads.
struct LinkChain {
  NSURL end;  // the first that is no link; where the chain was given up when it is circular
  bool isCircular = false;
  bool exists = false;
};

LinkChain followLinks(const NSURL &url) {
  LinkChain chain;
  chain.end = url;
  for (int step = 0; isSymbolicLink(chain.end); ++step) {
    if (step == kLongestLinkChain) {
      chain.isCircular = true;
      return chain;
    }
    const NSURL next = linkTarget(chain.end);
    if (!next) return chain;
    chain.end = next;
  }
  chain.exists = access(chain.end.path().c_str(), F_OK) == 0;
  return chain;
}

// In a synced location, by its text and, if it exists, on disk too: no folder on the way leads out.
bool endsInSyncedLocation(const LinkChain &chain) {
  if (!isInContainer(chain.end)) return false;
  return !chain.exists || isInContainer(NSURL::fileURLWithPath(inReplicaTerms(realPath(chain.end.path()))));
}

bool hasPrefix(std::string_view text, std::string_view prefix) {
  return text.substr(0, prefix.size()) == prefix;
}
bool hasSuffix(std::string_view text, std::string_view suffix) {
  return text.size() >= suffix.size() && text.substr(text.size() - suffix.size()) == suffix;
}

}  // namespace

NSURL qv_documentURLFromFileObjectID(const QVFileObjectID &fileObjectID, NSError *error) {
  const std::unique_ptr<QVSyncProxy> proxy = QVDaemonConnection::defaultConnection()->newSyncProxy();
  (*proxy)->getURLForFileObjectID(fileObjectID, [&proxy](const NSURL &url, const NSError &problem) {
    proxy->setObjResult(url, problem);
  });
  const NSURL url = proxy->result<NSURL>();
  if (!url && error) *error = proxy->error() ? proxy->error() : qvc_errorNoSuchItem(fileObjectID.asString());
  return url;
}

std::optional<std::string> qv_typeIdentifierWithError(const NSURL &url, NSError *error) {
  if (!url) {
    if (error) *error = qvc_error(QVErrorInvalidArgument, "there is no URL whose type could be told");
    return std::nullopt;
  }
  const auto item = QVQueryItem::askDaemonQueryItemForURL(url, false, error);
  return item ? std::optional(item->fields().typeIdentifier) : std::nullopt;
}

bool qv_isExternalDocumentReference(const NSURL &url) {
  return isSymbolicLink(url) && endsInSyncedLocation(followLinks(url));
}

NSURL qv_URLByResolvingExternalDocumentReferenceWithError(const NSURL &url, NSError *error) {
  const LinkChain chain = followLinks(url);
  if (chain.exists && !chain.isCircular) return chain.end;
  if (error) {
    const NSError beneath = NSError::errorWithPOSIXCode(chain.isCircular ? ELOOP : ENOENT, chain.end.path());
    *error = NSError(NSCocoaErrorDomain, NSFileReadNoSuchFileError,
                     {{NSLocalizedDescriptionKey,
                       "the alias " + url.path() +
                           (chain.isCircular ? " leads round in a circle"
                                             : " leads to " + chain.end.path() + ", where nothing is")},
                      {NSUnderlyingErrorKey, beneath}});
  }
  return NSURL();
}

bool qv_isInTessalyPrivateStorages(const NSURL &url) {
  if (!url.isFileURL()) return false;
  const auto path = containerPath(url.path(), DroxaProcessHome().replica());
  return path && !isInDocuments(*path);
}

bool qv_isNameExcludedFromSync(std::string_view name) {
  for (const std::string_view prefix : {"~$", ".#", ".fuse_hidden"})
    if (hasPrefix(name, prefix)) return true;
  for (const std::string_view suffix : {".nosync", ".tmp", ".swp", ".part", ".crdownload"})
    if (hasSuffix(name, suffix)) return true;
  return false;
}

bool qv_wouldBeExcludedFromSync(const NSURL &url) {
  if (!url.isFileURL()) return false;
  const auto path = containerPath(url.path(), DroxaProcessHome().replica());
  if (!path) return false;
  for (std::string_view rest = path->rest; !rest.empty();) {
    const std::size_t slash = std::min(rest.find('/'), rest.size());
    if (qv_isNameExcludedFromSync(rest.substr(0, slash))) return true;
    rest.remove_prefix(std::min(slash + 1, rest.size()));
  }
  return false;
}

bool qv_isInSyncedLocation(const NSURL &url) {
  return isInContainer(url);
}

bool qv_isPromiseURL(const NSURL &url) {
  if (!url.isFileURL()) return false;
  constexpr std::string_view kSuffix = ".droxafault";
  const std::string name = url.lastPathComponent();
  return hasPrefix(name, ".") && hasSuffix(name, kSuffix) && name.size() > 1 + kSuffix.size();
}

bool qv_isParentOfURL(const NSURL &parent, const NSURL &child) {
  return parent && child && !(parent == child) && child.isEqualToOrBelow(parent);
}

void qv_addPhysicalProperty(NSURL &url) {
  if (url) url = url.URLWithPhysicalProperty();
}

std::optional<std::string> qv_containerIDIfIsDocumentsContainerURL(const NSURL &url) {
  if (!url.isFileURL()) return std::nullopt;
  const auto path = containerPath(url.path(), DroxaProcessHome().replica());
  if (!path || path->rest != QVDocumentsFolderName(path->containerID)) return std::nullopt;
  return std::string(path->containerID);
}

}  // namespace droxa
