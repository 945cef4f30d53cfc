#include "platform/foundation/NSFileHandle.h"

#include <atomic>
#include <unistd.h>

#include "platform/foundation/NSFileHandleTesting.h"

namespace droxa {
namespace {

std::atomic<int> activeInitFailures = 0;

}  // namespace

NSFileHandleInitFailure::NSFileHandleInitFailure() {
  ++activeInitFailures;
}

NSFileHandleInitFailure::~NSFileHandleInitFailure() {
  --activeInitFailures;
}

bool NSFileHandleInitFailure::isActive() {
  return activeInitFailures > 0;
}

std::shared_ptr<NSFileHandle> NSFileHandle::initWithFileDescriptor(int descriptor, bool closeOnDealloc) {
  if (NSFileHandleInitFailure::isActive()) return nullptr;
  return std::shared_ptr<NSFileHandle>(new NSFileHandle(descriptor, closeOnDealloc));
}

NSFileHandle::NSFileHandle(int descriptor, bool closeOnDealloc)
    : descriptor_(descriptor), closeOnDealloc_(closeOnDealloc) {}

NSFileHandle::~NSFileHandle() {
  if (closeOnDealloc_ && descriptor_ >= 0) close(descriptor_);
}

}  // namespace droxa
