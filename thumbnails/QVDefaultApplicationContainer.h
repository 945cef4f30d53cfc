#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "platform/fileprovider/NSFileProviderExtension.h"

namespace droxa {

// Finds the folder where an application's documents go, for the extension.
// Thread contract: any thread. The completion is called once: on the caller's thread before this returns, on
// the daemon connection's, or wherever the extension completes the making of a folder.
class QVDefaultApplicationContainer {
 public:
  // The item at a URL, or null with the error set.
  using PropertiesForItemAtURL =
      std::function<std::shared_ptr<const NSFileProviderItem>(const NSURL &url, NSError *error)>;

  QVDefaultApplicationContainer(std::shared_ptr<NSFileProviderExtension> extension,
                                PropertiesForItemAtURL propertiesForItemAtURL);

  void findForBundleIdentifier(const std::optional<std::string> &bundleIdentifier,
                               NSFileProviderItemCompletion completionHandler) const;

 private:
  void askDaemon(const std::string &containerID, const NSFileProviderItemCompletion &completion) const;

  const std::shared_ptr<NSFileProviderExtension> extension_;
  const PropertiesForItemAtURL propertiesForItemAtURL_;
};

}  // namespace droxa
