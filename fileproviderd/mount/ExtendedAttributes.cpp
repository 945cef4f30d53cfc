#include <algorithm>
#include <cerrno>
#include <string_view>
#include <sys/xattr.h>
#include <vector>

#include "fileproviderd/mount/DocumentState.h"
#include "fileproviderd/mount/Operations.h"

namespace droxa::requests {

namespace {

constexpr std::string_view kState = "user.droxa.state";
constexpr std::string_view kOwnPrefix = "user.droxa.";
// Those of the system's own that mean something on a document.
constexpr std::string_view kShared[] = {"user.droxa.last-used", "user.droxa.favorite-rank",
                                        "user.droxa.package"};

// Kept on the replica's file as it is: what users and programs note. Refused is what the sync keeps for
// itself, and what belongs to the system that the replica lies on.
bool isKept(std::string_view name) {
  if (!name.starts_with("user.")) return false;
  if (!name.starts_with(kOwnPrefix)) return true;
  return std::find(std::begin(kShared), std::end(kShared), name) != std::end(kShared);
}

std::string linkOf(const Descriptor &file) {
  return "/proc/self/fd/" + std::to_string(file.get());
}

void replyWithValue(fuse_req_t request, std::string_view value, std::size_t size) {
  if (size == 0)
    fuse_reply_xattr(request, value.size());
  else if (size < value.size())
    fuse_reply_err(request, ERANGE);
  else
    fuse_reply_buf(request, value.data(), value.size());
}

// What the extension says of a document that its own marker doesn't tell everything of.
std::string stateOfItem(const NSFileProviderItemFields &fields) {
  if (!fields.isDownloaded) return "dataless,in the cloud";
  if (fields.isUploaded) return "local,in the cloud";
  return fields.isExcludedFromSync ? "local" : "local,uploading";
}

// Answered later: "local" alone where the extension doesn't say more.
void replyWithAskedState(fuse_req_t request, const std::string &path, std::size_t size) {
  const auto calls = driveOf(request).calls;
  const auto answer = [request, size, pending = pendingOf(request)](const std::string &state) {
    replyWithValue(request, state, size);
  };
  calls->identifierForItemAtURL(
      NSURL::fileURLWithPath(path),
      [calls, answer](const std::optional<std::string> &identifier, const NSError &) {
        if (!identifier) return answer("local");
        calls->itemForIdentifier(*identifier, [answer](const auto &item, const NSError &) {
          answer(item ? stateOfItem(item->fields()) : "local");
        });
      });
}

void replyWithState(fuse_req_t request, NodeId node, std::size_t size) {
  MountedDrive &drive = driveOf(request);
  const auto view = drive.nodes.view(node);
  int error = 0;
  const SharedDescriptor file = drive.path(node, &error);
  if (!file || !view || !S_ISREG(view->type)) {
    fuse_reply_err(request, error != 0 ? error : ENODATA);
    return;
  }
  switch (stateOfPath(file->get())) {
    case DocumentState::dataless:
      return replyWithValue(request, "dataless,in the cloud", size);
    case DocumentState::present:
      return replyWithValue(request, "local,in the cloud", size);
    case DocumentState::edited:
      return replyWithValue(request, "local,uploading", size);
    case DocumentState::unmarked:
      break;
  }
  const std::string path = drive.replicaPath(node);
  if (path.empty()) return replyWithValue(request, "local", size);
  replyWithAskedState(request, path, size);
}

void change(fuse_req_t request, NodeId node, std::string_view name,
            const std::function<int(const char *)> &apply) {
  MountedDrive &drive = driveOf(request);
  int error = isKept(name) ? 0 : ENOTSUP;
  const SharedDescriptor file = error == 0 ? drive.path(node, &error) : nullptr;
  if (file) {
    OwnChange own(drive, node);
    if (apply(linkOf(*file).c_str()) != 0) error = errno;
    own.setDescriptor(file->get());
  }
  fuse_reply_err(request, error);
}

}  // namespace

void getExtendedAttribute(fuse_req_t request, fuse_ino_t node, const char *name, std::size_t size) {
  if (name == kState) return replyWithState(request, node, size);
  if (!isKept(name)) {
    // Who asks for an attribute of the system learns that there are none, once and for all.
    fuse_reply_err(request, std::string_view(name).starts_with("user.") ? ENODATA : ENOTSUP);
    return;
  }
  int error = 0;
  const SharedDescriptor file = driveOf(request).path(node, &error);
  if (!file) {
    fuse_reply_err(request, error);
    return;
  }
  std::vector<char> value(size);
  const ssize_t length = ::getxattr(linkOf(*file).c_str(), name, value.data(), size);
  if (length < 0)
    fuse_reply_err(request, errno);
  else if (size == 0)
    fuse_reply_xattr(request, static_cast<std::size_t>(length));
  else
    fuse_reply_buf(request, value.data(), static_cast<std::size_t>(length));
}

void setExtendedAttribute(fuse_req_t request, fuse_ino_t node, const char *name, const char *value,
                          std::size_t size, int flags) {
  change(request, node, name, [=](const char *path) { return ::setxattr(path, name, value, size, flags); });
}

void removeExtendedAttribute(fuse_req_t request, fuse_ino_t node, const char *name) {
  change(request, node, name, [=](const char *path) { return ::removexattr(path, name); });
}

// The state isn't listed: who copies what is listed could set it nowhere.
void listExtendedAttributes(fuse_req_t request, fuse_ino_t node, std::size_t size) {
  constexpr std::size_t kMost = 64 * 1024;
  int error = 0;
  const SharedDescriptor file = driveOf(request).path(node, &error);
  std::vector<char> names(kMost);
  const ssize_t length = file ? ::listxattr(linkOf(*file).c_str(), names.data(), names.size()) : -1;
  if (length < 0) {
    fuse_reply_err(request, file ? errno : error);
    return;
  }
  std::string shown;
  std::string_view left(names.data(), static_cast<std::size_t>(length));
  while (!left.empty()) {
    const std::string_view name = left.substr(0, left.find('\0'));
    left.remove_prefix(std::min(left.size(), name.size() + 1));
    if (isKept(name)) shown.append(name).push_back('\0');
  }
  replyWithValue(request, shown, size);
}

}  // namespace droxa::requests
