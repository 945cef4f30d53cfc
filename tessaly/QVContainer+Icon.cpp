// What a container looks like: the icon of the application that it belongs to, or the one that the icon
// themes have for such a folder.

#include <algorithm>
#include <cmath>

#include "platform/imaging/PNGImage.h"
#include "platform/launchservices/IconTheme.h"
#include "platform/launchservices/LSBundleProxy.h"
#include "tessaly/QVContainer.h"

namespace droxa {
namespace {

// nullptr: the container is an application's.
const char *FolderIconName(const std::string &containerID) {
  if (containerID == QVUbiquitousDefaultContainerID) return "folder";
  if (containerID == QVUbiquitousDocumentsContainerID) return "folder-documents";
  if (containerID == QVUbiquitousDesktopContainerID) return "user-desktop";
  if (containerID == QVUbiquitousTrashContainerID) return "user-trash";
  return nullptr;
}

int Side(CGSize size) {
  constexpr double kLargest = 1024;
  const double side = std::ceil(std::max(size.width, size.height));
  return side >= 1 ? static_cast<int>(std::min(side, kLargest)) : 0;
}

// Where only a larger one is installed, it is scaled down; one that can't be read stays as it is.
NSData IconOfSide(const std::string &name, int side) {
  NSData data = IconImageData(name, side);
  const auto picture = data ? PNGImage::read(data, nullptr) : std::nullopt;
  const auto longest = static_cast<std::uint32_t>(side);
  if (!picture || std::max(picture->width(), picture->height()) <= longest) return data;
  return picture->scaledToFit(longest).file();
}

}  // namespace

NSData QVContainer::bestFittingImageDataForSize(CGSize size, bool *shouldTransformToAppIcon) const {
  if (shouldTransformToAppIcon) *shouldTransformToAppIcon = false;
  const int side = Side(size);
  if (side == 0) return {};
  if (const char *name = FolderIconName(containerID())) {
    NSData data = IconOfSide(name, side);
    return data ? data : IconOfSide("folder", side);
  }
  const auto application = LSBundleProxy::bundleProxyForIdentifier(containerID());
  if (!application) return {};
  NSData data = IconOfSide(application->iconName(), side);
  if (data && shouldTransformToAppIcon) *shouldTransformToAppIcon = true;
  return data;
}

}  // namespace droxa
