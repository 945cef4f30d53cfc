#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <gtest/gtest.h>
#include <string>
#include <sys/stat.h>
#include <sys/xattr.h>
#include <unistd.h>

#include "fileproviderd/mount/Descriptor.h"
#include "fileproviderd/mount/DocumentState.h"

namespace droxa::testing {
namespace {

constexpr off_t kSize = 100'000;
constexpr std::int64_t kModified = 1'700'000'000'000'000'000;

class DocumentStateTest : public ::testing::Test {
 protected:
  void SetUp() override {
    char folder[] = "/tmp/droxa-document-state-XXXXXX";
    ASSERT_NE(mkdtemp(folder), nullptr);
    folder_ = folder;
    file = Descriptor(open((folder_ + "/a").c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600));
    ASSERT_EQ(ftruncate(file.get(), kSize), 0);
  }
  void TearDown() override { std::filesystem::remove_all(folder_); }
  void mark(char state) {
    const std::string marker = std::string("1 ") + state + " " + std::to_string(kSize) + " " +
                               std::to_string(kModified) + " 0 digest v1 name";
    if (fsetxattr(file.get(), kDocumentAttribute, marker.data(), marker.size(), 0) != 0)
      GTEST_SKIP() << "no extended attributes here";
    setModified(kModified);
  }
  void setModified(std::int64_t nanoseconds) const {
    const timespec times[2] = {{0, UTIME_OMIT}, {nanoseconds / 1'000'000'000, nanoseconds % 1'000'000'000}};
    ASSERT_EQ(futimens(file.get(), times), 0);
  }

  Descriptor file;

 private:
  std::string folder_;
};

TEST_F(DocumentStateTest, aFileWithoutAMarkerIsUnmarked) {
  EXPECT_EQ(stateOfOpenDocument(file.get()), DocumentState::unmarked);
  EXPECT_EQ(stateOfPath(file.get()), DocumentState::unmarked);
}

TEST_F(DocumentStateTest, anUntouchedPlaceholderIsDataless) {
  mark('d');
  EXPECT_EQ(stateOfOpenDocument(file.get()), DocumentState::dataless);
  mark('e');
  EXPECT_EQ(stateOfOpenDocument(file.get()), DocumentState::dataless);
}

TEST_F(DocumentStateTest, aPlaceholderThatWasWrittenAnewIsNot) {
  mark('d');
  ASSERT_EQ(pwrite(file.get(), "x", 1, 0), 1);
  EXPECT_EQ(stateOfOpenDocument(file.get()), DocumentState::edited);
  ASSERT_EQ(ftruncate(file.get(), 0), 0);
  EXPECT_EQ(stateOfOpenDocument(file.get()), DocumentState::present);
}

TEST_F(DocumentStateTest, aDocumentIsPresentUntilItIsEdited) {
  mark('p');
  EXPECT_EQ(stateOfOpenDocument(file.get()), DocumentState::present);
  setModified(kModified + 1);
  EXPECT_EQ(stateOfOpenDocument(file.get()), DocumentState::edited);
}

}  // namespace
}  // namespace droxa::testing
