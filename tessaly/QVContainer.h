#pragma once

#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "platform/foundation/CGSize.h"
#include "platform/foundation/NSData.h"
#include "platform/foundation/NSError.h"
#include "platform/foundation/NSURL.h"
#include "tessaly/QVProtocol.h"

namespace droxa {

inline constexpr char QVUbiquitousDefaultContainerID[] = "com.quorva.Tessaly.default";
inline constexpr char QVUbiquitousDocumentsContainerID[] = "com.quorva.Tessaly.documents";
inline constexpr char QVUbiquitousDesktopContainerID[] = "com.quorva.Tessaly.desktop";
inline constexpr char QVUbiquitousTrashContainerID[] = "com.quorva.Tessaly.trash";

// The name of a container's documents folder: "Documents"; of the trash "files", as file managers lay a trash
// out.
const char *QVDocumentsFolderName(std::string_view containerID);
inline constexpr char QVUbiquitousDocumentsFolderName[] = "Documents";
inline constexpr char QVTrashInfoFolderName[] = "info";  // beside the trash's "files": where things came from

// A folder of the replica with a documents folder in it: replica/<container identifier>/Documents. What else
// is in the container's folder is private to its owner. Thread contract: immutable; the class operations on
// any thread. They block on the daemon when the list isn't known yet, and follow
// QVContainerListDidChangeNotification; without a daemon they give what is known, or nothing.
class QVContainer final {
 public:
  explicit QVContainer(QVContainerDescription description);

  static std::map<std::string, std::shared_ptr<const QVContainer>> allContainersByContainerID();
  static std::vector<std::shared_ptr<const QVContainer>> allContainers();

  const std::string &containerID() const { return description_.containerID; }
  const NSURL &url() const { return description_.url; }
  const NSURL &documentsURL() const { return description_.documentsURL; }

  // The picture (PNG) that fits the size, in pixels, best of those installed: the icon of the application
  // whose identifier the container's is, and then `shouldTransformToAppIcon` (may be null) tells that it is
  // an application's plain icon; or that of a folder of this kind. nil when there is none. Reads files.
  NSData bestFittingImageDataForSize(CGSize size, bool *shouldTransformToAppIcon) const;

 private:
  const QVContainerDescription description_;
};

// The process's cache of the containers.
class QVContainerCache final {
 public:
  // Whether this process serves a managed, data-separated provider: the "managed" entry of the configuration
  // folder's provider.json. Read once.
  static bool isManagedProvider();
  static void setManagedProviderForTesting(bool managed);
  // The next question asks the daemon; until it answers, the list that is known is given.
  static void markOutOfDate();
  static void forget();  // everything, isManagedProvider() too
};

}  // namespace droxa
