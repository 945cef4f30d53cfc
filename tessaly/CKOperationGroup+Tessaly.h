#pragma once

#include "platform/cloudkit/CKOperation.h"

namespace droxa {

// The group of the operations that fetch thumbnails because somebody looks at them: a new one each time.
inline CKOperationGroup qv_downloadThumbnailsUserInitiated() {
  CKOperationGroup group;
  group.name = "DownloadThumbnails-UserInitiated";
  return group;
}

}  // namespace droxa
