#include "platform/fileprovider/FPSandboxingURLWrapper.h"

#include <cerrno>
#include <fcntl.h>
#include <unistd.h>
#include <utility>

namespace droxa {

// Opening never waits: not for the other end of a pipe either.
std::shared_ptr<const FPSandboxingURLWrapper> FPSandboxingURLWrapper::wrapperWithURL(const NSURL &url,
                                                                                     bool readonly,
                                                                                     NSError *error) {
  constexpr int flags = O_CLOEXEC | O_NONBLOCK | O_NOCTTY;
  int descriptor = -1;
  int code = EINVAL;
  if (url.isFileURL()) {
    descriptor = open(url.path().c_str(), (readonly ? O_RDONLY : O_RDWR) | flags);
    code = errno;
    if (descriptor < 0 && code == EISDIR) {
      descriptor = open(url.path().c_str(), O_RDONLY | O_DIRECTORY | flags);
      code = errno;
    }
  }
  if (descriptor >= 0) return std::make_shared<FPSandboxingURLWrapper>(url, descriptor);
  if (error) *error = NSError::errorWithPOSIXCode(code, url.description() + " can't be opened");
  return nullptr;
}

FPSandboxingURLWrapper::FPSandboxingURLWrapper(NSURL url, int descriptor)
    : url_(std::move(url)), descriptor_(descriptor) {}

FPSandboxingURLWrapper::~FPSandboxingURLWrapper() {
  if (descriptor_ >= 0) close(descriptor_);
}

std::string FPSandboxingURLWrapper::description() const {
  return "<FPSandboxingURLWrapper " + url_.description() + ">";
}

}  // namespace droxa
