#include "fileproviderd/mount/MountedDrive.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>

#include "fileproviderd/mount/DocumentState.h"
#include "fileproviderd/mount/HiddenNames.h"

namespace droxa {

namespace {

constexpr std::size_t kMostFolders = 1024;
constexpr double kLong = 24.0 * 3600;
constexpr double kLongestAbsence = 60;
constexpr double kShort = 1;  // where changes can't be seen

}  // namespace

MountedDrive::MountedDrive(std::shared_ptr<MountRoots> mountRoots,
                           std::shared_ptr<Materialising> mountMaterialising,
                           std::shared_ptr<ExtensionCalls> extensionCalls)
    : folders(kMostFolders),
      roots(std::move(mountRoots)),
      materialising(std::move(mountMaterialising)),
      calls(std::move(extensionCalls)) {}

std::optional<std::string> MountedDrive::fixedPath(NodeId node, const NodeView &view) const {
  if (node == kRootNode) return roots->root();
  return view.parent == kRootNode ? roots->folderNamed(view.name) : std::nullopt;
}

Descriptor MountedDrive::openFolder(NodeId node, const SharedDescriptor &parent, int *error) {
  const auto view = nodes.view(node);
  *error = ESTALE;
  if (!view) return {};
  constexpr int kFlags = O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;
  if (const auto fixed = fixedPath(node, *view)) {
    Descriptor folder(::open(fixed->c_str(), kFlags));
    *error = folder ? 0 : errno;
    return folder;
  }
  if (!parent || view->parent == 0) return {};
  Descriptor folder(::openat(parent->get(), view->name.c_str(), kFlags));
  struct stat status;
  if (!folder || ::fstat(folder.get(), &status) != 0) {
    *error = errno == ENOENT || errno == ENOTDIR || errno == ELOOP ? ESTALE : errno;
    return {};
  }
  if (status.st_ino != view->told.inode) return {};
  *error = 0;
  return folder;
}

SharedDescriptor MountedDrive::folder(NodeId node, int *error) {
  *error = 0;
  if (auto known = folders.find(node)) return known;
  const std::vector<NodeId> chain = nodes.chain(node);
  *error = ESTALE;
  if (chain.empty()) return nullptr;
  // From the nearest folder above that is open, or from the outermost.
  std::size_t first = chain.size() - 1;
  SharedDescriptor folder;
  while (first > 0 && !(folder = folders.find(chain[first - 1]))) --first;
  for (std::size_t index = first; index < chain.size(); ++index) {
    Descriptor opened = openFolder(chain[index], folder, error);
    if (!opened) return nullptr;
    folder = folders.keep(chain[index], std::move(opened));
  }
  return folder;
}

std::string MountedDrive::replicaPath(NodeId node) const {
  const std::vector<NodeId> chain = nodes.chain(node);
  if (chain.empty()) return {};
  std::string path = roots->root();
  for (std::size_t index = 1; index < chain.size(); ++index) {
    const auto view = nodes.view(chain[index]);
    if (!view || view->parent == 0) return {};
    const auto fixed = fixedPath(chain[index], *view);
    path = fixed ? *fixed : path + "/" + view->name;
  }
  return path;
}

std::optional<std::string> MountedDrive::shownPath(NodeId node) const {
  const std::vector<NodeId> chain = nodes.chain(node);
  if (chain.empty()) return std::nullopt;
  std::string path;
  for (std::size_t index = 1; index < chain.size(); ++index) {
    const auto view = nodes.view(chain[index]);
    if (!view || view->parent == 0) return std::nullopt;
    path += (path.empty() ? "" : "/") + view->name;
  }
  return path;
}

bool MountedDrive::isOwnName(NodeId parent, const std::string &name) const {
  return isHiddenName(name) || (parent == kRootNode && roots->folderNamed(name));
}

int MountedDrive::look(NodeId parent, const std::string &name, struct stat *status) {
  if (isHiddenName(name)) return ENOENT;
  if (parent == kRootNode) {
    if (const auto fixed = roots->folderNamed(name)) return ::lstat(fixed->c_str(), status) == 0 ? 0 : errno;
  }
  int error = 0;
  const SharedDescriptor above = folder(parent, &error);
  if (!above) return error;
  return ::fstatat(above->get(), name.c_str(), status, AT_SYMLINK_NOFOLLOW) == 0 ? 0 : errno;
}

int MountedDrive::statusOf(NodeId node, struct stat *status) {
  if (node == kRootNode) {
    int error = 0;
    const SharedDescriptor root = folder(node, &error);
    if (!root) return error;
    return ::fstat(root->get(), status) == 0 ? 0 : errno;
  }
  for (int attempt = 0; attempt < 3; ++attempt) {
    const auto view = nodes.view(node);
    if (!view) return ESTALE;
    if (view->parent != 0 && look(view->parent, view->name, status) == 0) {
      if (const auto hasChanged = nodes.see(node, *status)) {
        if (*hasChanged && news) news->contentsChanged(node);
        return 0;
      }
    }
    if (const SharedDescriptor file = openFiles.anyOf(node))
      return ::fstat(file->get(), status) == 0 ? 0 : errno;
    const auto now = nodes.view(node);  // it may have been renamed meanwhile
    if (!now || (now->parent == view->parent && now->name == view->name)) break;
  }
  return ESTALE;
}

SharedDescriptor MountedDrive::path(NodeId node, int *error) {
  const auto view = nodes.view(node);
  if (view && S_ISDIR(view->type)) return folder(node, error);
  if (SharedDescriptor file = openFiles.anyOf(node)) {
    struct stat status;
    if (::fstat(file->get(), &status) == 0 && view && view->told.inode == status.st_ino) return file;
    if (view && view->parent == 0) return file;
  }
  Descriptor opened = open(node, O_PATH, error);
  return opened ? std::make_shared<const Descriptor>(std::move(opened)) : nullptr;
}

Descriptor MountedDrive::open(NodeId node, int flags, int *error) {
  for (int attempt = 0; attempt < 3; ++attempt) {
    *error = ESTALE;
    const auto view = nodes.view(node);
    if (!view || view->parent == 0) return {};
    const SharedDescriptor above = folder(view->parent, error);
    if (!above) return {};
    Descriptor file(::openat(above->get(), view->name.c_str(), flags | O_NOFOLLOW | O_CLOEXEC));
    *error = file ? 0 : errno;
    struct stat status;
    if (file && ::fstat(file.get(), &status) == 0) {
      const auto hasChanged = nodes.see(node, status);
      if (hasChanged && *hasChanged && news) news->contentsChanged(node);
      if (hasChanged) return file;
    }
    if (!file && *error != ENOENT) return {};
    *error = ESTALE;  // another file's by now
  }
  return {};
}

bool MountedDrive::isHereByNow(OpenFile &file, int *error) {
  Descriptor now = open(file.node, O_RDONLY, error);
  if (!now || stateOfOpenDocument(now.get()) == DocumentState::dataless) return false;
  if ((file.flags & O_ACCMODE) != O_RDONLY) {
    // The descriptor for reading stays until the other is there: nobody lets go of the contents in between.
    Descriptor writable = open(file.node, file.flags, error);
    if (!writable) return false;
    file.replace(std::move(writable));
  } else {
    file.replace(std::move(now));
  }
  return true;
}

double MountedDrive::entryTimeout(NodeId parent) const {
  return watch.isWatched(parent) ? kLong : kShort;
}

// Nobody can be told of these one by one when changes were missed.
double MountedDrive::absenceTimeout(NodeId parent) const {
  return std::min(kLongestAbsence, entryTimeout(parent));
}

// What happens to a file under another of its names isn't seen.
double MountedDrive::attributeTimeout(NodeId parent, const struct stat &status) const {
  const bool hasOtherNames = !S_ISDIR(status.st_mode) && status.st_nlink > 1;
  return hasOtherNames ? kShort : entryTimeout(parent);
}

void MountedDrive::watchFolder(NodeId node, NodeId parent, const std::string &name, struct stat *status) {
  if (watch.isWatched(node)) return;
  int error = 0;
  const SharedDescriptor opened = folder(node, &error);
  if (opened && watch.add(node, opened->get())) look(parent, name, status);
}

void MountedDrive::forget(NodeId node, std::uint64_t times) {
  for (const NodeId freed : nodes.forget(node, times)) {
    folders.drop(freed);
    watch.remove(freed);
  }
}

OwnChange::~OwnChange() {
  struct stat status;
  const bool isKnown = descriptor_ >= 0 && ::fstat(descriptor_, &status) == 0;
  drive_.nodes.endOwnChange(node_, isKnown ? &status : nullptr);
}

}  // namespace droxa
