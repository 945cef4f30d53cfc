#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include "platform/foundation/NSFileHandle.h"
#include "platform/foundation/NSFileHandleTesting.h"

namespace droxa {
namespace {

bool isOpen(int descriptor) {
  return fcntl(descriptor, F_GETFD) >= 0;
}

int openRoot() {
  return open("/", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
}

TEST(NSFileHandle, closesItsDescriptorWithTheLastReference) {
  const int descriptor = openRoot();
  auto handle = NSFileHandle::initWithFileDescriptor(descriptor, true);
  auto other = handle;
  EXPECT_EQ(handle->fileDescriptor(), descriptor);
  handle.reset();
  EXPECT_TRUE(isOpen(descriptor));
  other.reset();
  EXPECT_FALSE(isOpen(descriptor));
}

TEST(NSFileHandle, leavesABorrowedDescriptorOpen) {
  const int descriptor = openRoot();
  NSFileHandle::initWithFileDescriptor(descriptor, false).reset();
  EXPECT_TRUE(isOpen(descriptor));
  close(descriptor);
}

TEST(NSFileHandle, takesANegativeDescriptor) {
  const auto handle = NSFileHandle::initWithFileDescriptor(-1, true);
  ASSERT_TRUE(handle);
  EXPECT_EQ(handle->fileDescriptor(), -1);
}

TEST(NSFileHandle, isNullWhileItsInitIsMadeToFail) {
  const int descriptor = openRoot();
  {
    const NSFileHandleInitFailure failure;
    EXPECT_FALSE(NSFileHandle::initWithFileDescriptor(descriptor, true));
  }
  EXPECT_TRUE(isOpen(descriptor));
  EXPECT_TRUE(NSFileHandle::initWithFileDescriptor(descriptor, true));
  EXPECT_FALSE(isOpen(descriptor));
}

}  // namespace
}  // namespace droxa
