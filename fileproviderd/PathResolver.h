#pragma once

#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "fileproviderd/ExtensionCalls.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// The components of a drive path; "." and empty ones are dropped, ".." is resolved by text and stops at the
// root.
std::vector<std::string> driveComponents(std::string_view path);

// Finds the item at a path of the drive ("/", "Documents/a.txt", ".Trash") or at an absolute path of the
// replica. The first component may name a container, whose files lie in a folder of their own: those are
// known by asking the extension for the documents folder of each folder in the replica. Thread contract: any
// thread; blocks on the extension, so never on a thread that answers it. lock_ guards what is remembered of
// the containers and is never held during a call.
class PathResolver {
 public:
  PathResolver(std::shared_ptr<ExtensionCalls> calls, std::string replica);

  // The item, or null with `error` set: NSFileProviderErrorNoSuchItem, or what the extension says. Of an
  // alias, whose identifier leads the extension to the target, it is the alias's identity with the target's
  // size and dates.
  std::shared_ptr<const NSFileProviderItem> itemAtPath(const std::string &path, NSError *error);

 private:
  // What stands at a path: its identifier, and the URL under which it was found.
  struct Place {
    std::string identifier;
    NSURL url;
  };
  std::optional<Place> placeOfPath(const std::string &path, NSError *error);
  std::optional<Place> walk(const NSURL &root, const std::vector<std::string> &components, NSError *error);
  std::optional<Place> placeAt(const NSURL &url, NSError *error);
  std::shared_ptr<const NSFileProviderItem> aliasAt(const Place &place, const NSFileProviderItem &target,
                                                    NSError *error);
  std::optional<Place> containerNamed(const NSURL &root, const std::string &name, NSError *error);
  // The container item whose documents folder is `url`, remembered under the folder's name.
  void rememberContainer(const std::string &folder, const NSURL &url, NSError *error);

  std::shared_ptr<const NSFileProviderItem> item(const std::string &identifier, NSError *error);
  NSURL urlOf(const std::string &identifier, NSError *error);
  std::optional<std::string> identifierAt(const NSURL &url, NSError *error);

  const std::shared_ptr<ExtensionCalls> calls_;
  const std::string replica_;

  struct Container {
    std::string name;
    Place place;
  };
  Mutex lock_;
  std::map<std::string, Container> containers_ GUARDED_BY(lock_);  // by the name of its folder in the replica
};

}  // namespace droxa
