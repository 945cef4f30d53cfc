#include <cerrno>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include "platform/foundation/ReadFile.h"
#include "tests/platform/TemporaryFolder.h"

namespace droxa {
namespace {

TEST(ReadFile, givesTheWholeFile) {
  const TemporaryFolder folder;
  const std::string bytes = std::string(10'000, 'x') + std::string("\0\xff", 2);
  folder.write("file", bytes);
  const FileContents contents = ReadFile(folder.path() + "/file", bytes.size());
  EXPECT_EQ(contents.code, 0);
  EXPECT_EQ(contents.bytes, bytes);
}

TEST(ReadFile, anEmptyFileIsRead) {
  const TemporaryFolder folder;
  folder.write("file", "");
  EXPECT_EQ(ReadFile(folder.path() + "/file", 0).code, 0);
}

TEST(ReadFile, saysWhyAFileCannotBeRead) {
  const TemporaryFolder folder;
  folder.write("file", "12345");
  EXPECT_EQ(ReadFile(folder.path() + "/file", 4).code, EFBIG);
  EXPECT_EQ(ReadFile(folder.path() + "/none", 4).code, ENOENT);
  EXPECT_EQ(ReadFile(folder.path() + "/file/below", 4).code, ENOTDIR);
  EXPECT_EQ(ReadFile(folder.path(), 4).code, EISDIR);
}

TEST(ReadFile, doesNotWaitForAPipe) {
  const TemporaryFolder folder;
  ASSERT_EQ(mkfifo((folder.path() + "/pipe").c_str(), 0600), 0);
  EXPECT_EQ(ReadFile(folder.path() + "/pipe", 4).code, EINVAL);
}

}  // namespace
}  // namespace droxa
