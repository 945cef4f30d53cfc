#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "keld/sync/SyncStore.h"
#include "platform/cloudkit/CKCloud.h"

namespace droxa::keld {

struct ImportReport {
  std::uint64_t documents = 0, folders = 0, links = 0;
  std::uint64_t bytes = 0;
  std::uint64_t skipped = 0;          // what a drive doesn't hold: sockets, devices, names kept local
  std::vector<std::string> problems;  // "path: why", of what couldn't be read; at most 1,000
  NSError error;                      // why the import ended early; nil when it didn't
};

// Told of documents that are in the cloud now and are to have thumbnails, with the files to make them of.
using ThumbnailsWanted = std::function<void(const std::vector<WantedThumbnail> &wanted)>;

// Puts everything below a folder into the cloud, as the contents of the default container. The folder is only
// read, and what lies in one of the `except` folders isn't. Done again after it was cut short, it goes on:
// what is in the cloud already stays as it is. Thumbnails aren't made here, since they take longer than all
// the rest. Blocks; both functions are called on the calling thread.
ImportReport ImportIntoCloud(CKCloud &cloud, const std::string &folder,
                             const std::vector<std::string> &except,
                             const std::function<void(const ImportReport &)> &progress,
                             const ThumbnailsWanted &thumbnailsWanted = nullptr);

}  // namespace droxa::keld
