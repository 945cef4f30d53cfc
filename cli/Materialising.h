#pragma once

#include <functional>
#include <vector>

#include "cli/ContentsArgument.h"
#include "platform/foundation/NSError.h"
#include "platform/foundation/NSURL.h"
#include "tessaly/QVContents.h"

namespace droxa {

struct Materialised {
  NSURL url;  // where the contents are
  NSError error;
  bool wasStopped = false;  // by Ctrl-C: the transfer was cancelled
};

struct MaterialisingOptions {
  bool canBeStopped = false;  // Ctrl-C cancels; otherwise it ends the process, which cancels too
  bool isForced = false;      // fetches what the reader of a document would be granted without
  // Called now and then with how far it is, on the calling thread. May be null.
  std::function<void(const QVContentsStatus &status)> progress;
};

// Brings the contents of the argument here, as any reader does: through the host and the extension.
Materialised materialise(CommandContext &context, const ContentsArgument &contents,
                         const MaterialisingOptions &options);

}  // namespace droxa
