// What thumbnails/ does for the extension.

#include <utility>

#include "extension/QVFileProviderExtension.h"
#include "tessaly/QVQueryItem.h"
#include "thumbnails/QVDefaultApplicationContainer.h"
#include "thumbnails/QVThumbnailFetching.h"

namespace droxa {

std::shared_ptr<NSProgress> QVFileProviderExtension::fetchThumbnailsForItemIdentifiers(
    const std::vector<std::string> &identifiers, CGSize requestedSize,
    NSFileProviderThumbnailHandler perThumbnailCompletionHandlerWithType,
    NSFileProviderErrorCompletion completionHandler) {
  return std::make_shared<QVThumbnailFetching>(self())->fetchThumbnailsForItemIdentifiers(
      identifiers, requestedSize, std::move(perThumbnailCompletionHandlerWithType),
      std::move(completionHandler));
}

void QVFileProviderExtension::_defaultApplicationContainerForBundleIdentifier(
    const std::optional<std::string> &bundleIdentifier, NSFileProviderItemCompletion completionHandler) {
  const auto propertiesForItemAtURL = [extension = self()](const NSURL &url, NSError *error) {
    return extension->_propertiesForItemAtURL(url, error);
  };
  QVDefaultApplicationContainer(self(), propertiesForItemAtURL)
      .findForBundleIdentifier(bundleIdentifier, std::move(completionHandler));
}

}  // namespace droxa
