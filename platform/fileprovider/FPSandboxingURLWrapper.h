#pragma once

#include <memory>
#include <string>

#include "platform/foundation/NSError.h"
#include "platform/foundation/NSObject.h"
#include "platform/foundation/NSURL.h"

namespace droxa {

// A URL together with what lets its receiver open the document there, whatever it may open itself: a
// descriptor that was opened by who wrapped it, and that crosses connections with it. For a folder it leads
// to what is inside (openat). Thread contract: immutable; the descriptor's offset is shared by all who hold
// it.
class FPSandboxingURLWrapper final : public NSObject {
 public:
  // Opens the file at `url`, for reading and, unless `readonly`, for writing (a folder: for reading); null
  // with `error` (may be null) set: NSPOSIXErrorDomain.
  static std::shared_ptr<const FPSandboxingURLWrapper> wrapperWithURL(const NSURL &url, bool readonly,
                                                                      NSError *error);
  // Takes ownership of the descriptor; -1: there is none, and the URL is all that there is.
  FPSandboxingURLWrapper(NSURL url, int descriptor);
  ~FPSandboxingURLWrapper() override;
  FPSandboxingURLWrapper(const FPSandboxingURLWrapper &) = delete;
  FPSandboxingURLWrapper &operator=(const FPSandboxingURLWrapper &) = delete;

  const NSURL &url() const { return url_; }
  int descriptor() const { return descriptor_; }  // the wrapper's own
  std::string description() const override;

 private:
  const NSURL url_;
  const int descriptor_;
};

}  // namespace droxa
