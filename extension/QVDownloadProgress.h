#pragma once

#include <memory>

#include "platform/foundation/NSProgress.h"
#include "tessaly/QVFileProvidingOperation.h"

namespace droxa {

// Has `progress` (null: nobody watches) tell how far the operation is, in bytes, and cancel it. From the
// operation's end on, the progress is left alone. Any thread.
void QVDownloadReportsToProgress(const std::shared_ptr<QVFileProvidingOperation> &operation,
                                 const std::shared_ptr<NSProgress> &progress);

}  // namespace droxa
