#pragma once

#include <cstdint>
#include <functional>
#include <vector>

#include "platform/foundation/NSError.h"
#include "platform/foundation/NSURL.h"

namespace droxa {

// Called once a URL: nil when its download has begun (or isn't needed), or why it hasn't.
using QVDownloadStarted = std::function<void(const NSURL &url, const NSError &error)>;

// Has the daemon fetch what isn't here of the items at `urls`, with QVDownload… options
// (tessaly/QVContents.h), and doesn't wait for the contents. The downloads go on until they have ended,
// whatever becomes of the caller, but not longer than this process. Any thread; `started` is called on
// threads of the daemon's connection.
void QVStartDownloadForItemsWithOptions(const std::vector<NSURL> &urls, std::uint64_t options,
                                        const QVDownloadStarted &started);

}  // namespace droxa
