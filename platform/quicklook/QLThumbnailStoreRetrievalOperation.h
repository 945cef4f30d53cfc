#pragma once

#include <string>

namespace droxa {

// What is asked of the desktop's thumbnailers. Thread contract: any thread.
class QLThumbnailStoreRetrievalOperation {
 public:
  // Whether an installed thumbnailer says that it makes thumbnails of documents of that MIME type.
  static bool canMostRecentClientsGenerateThumbnailsForUTI(const std::string &mimeType);
};

}  // namespace droxa
