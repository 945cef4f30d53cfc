#include <cerrno>
#include <gtest/gtest.h>

#include "fileproviderd/mount/ErrnoForError.h"
#include "platform/fileprovider/NSFileProviderError.h"

namespace droxa::testing {
namespace {

struct Row {
  NSError error;
  int number;
};

class ErrnoForError : public ::testing::TestWithParam<Row> {};

TEST_P(ErrnoForError, tellsTheErrorOfTheSameMeaning) {
  EXPECT_EQ(errnoForError(GetParam().error), GetParam().number) << GetParam().error.description();
}

NSError cocoa(std::int64_t code) {
  return NSError(NSCocoaErrorDomain, code);
}
NSError provider(std::int64_t code) {
  return NSError(NSFileProviderErrorDomain, code);
}
NSError sync(std::int64_t code) {
  return NSError("QVTessalyErrorDomain", code);
}

INSTANTIATE_TEST_SUITE_P(
    Rows, ErrnoForError,
    ::testing::Values(
        Row{provider(-1000), EACCES}, Row{provider(-1001), EEXIST}, Row{provider(-1003), EDQUOT},
        Row{provider(-1004), ENETDOWN}, Row{provider(-1005), ESTALE}, Row{cocoa(4), ESTALE},
        Row{cocoa(260), ESTALE}, Row{cocoa(513), EACCES}, Row{cocoa(514), EINVAL}, Row{cocoa(516), EEXIST},
        Row{cocoa(640), ENOSPC}, Row{cocoa(642), EROFS}, Row{cocoa(3072), ECANCELED},
        Row{cocoa(3328), EOPNOTSUPP}, Row{cocoa(4097), ENETDOWN}, Row{cocoa(4099), ENETDOWN},
        Row{cocoa(4101), ETIMEDOUT}, Row{cocoa(4354), EDQUOT}, Row{cocoa(4355), ENETDOWN},
        Row{sync(2), EACCES}, Row{sync(14), ESTALE}, Row{sync(33), ENETDOWN}, Row{sync(34), ECANCELED},
        Row{sync(35), EIO}, Row{sync(37), EBUSY}, Row{NSError(NSPOSIXErrorDomain, ENOSPC), ENOSPC},
        Row{NSError(NSPOSIXErrorDomain, ENOENT), ESTALE}, Row{NSError(NSPOSIXErrorDomain, 0), EIO},
        Row{NSError("Unheard", 1), EIO},
        Row{NSError("Unheard", 1, {{NSUnderlyingErrorKey, NSError(NSPOSIXErrorDomain, EROFS)}}), EROFS}));

}  // namespace
}  // namespace droxa::testing
