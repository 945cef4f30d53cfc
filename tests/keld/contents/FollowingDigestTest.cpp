#include <cerrno>
#include <unistd.h>

#include "ContentsFixture.h"
#include "keld/contents/FollowingDigest.h"

namespace droxa::keld {
namespace {

// A file without a name.
class GrowingFile {
 public:
  GrowingFile() : file_(::open("/tmp", O_TMPFILE | O_RDWR | O_CLOEXEC, 0600)) {}
  int descriptor() const { return file_.get(); }
  void append(std::string_view bytes) const {
    ASSERT_EQ(::write(file_.get(), bytes.data(), bytes.size()), static_cast<ssize_t>(bytes.size()));
  }
  void cutTo(std::size_t size) const { ASSERT_EQ(::ftruncate(file_.get(), static_cast<off_t>(size)), 0); }

 private:
  OwnedDescriptor file_;
};

std::string digestOfPieces(const std::string &bytes, std::size_t piece) {
  const GrowingFile file;
  FollowingDigest digest(file.descriptor());
  for (std::size_t at = 0; at < bytes.size(); at += piece) {
    file.append(std::string_view(bytes).substr(at, piece));
    digest.grewTo(std::min(at + piece, bytes.size()));
  }
  std::string text;
  EXPECT_EQ(digest.finish(&text), 0);
  return text;
}

TEST(FollowingDigest, isTheContentsWhateverThePieces) {
  const std::string bytes = BytesOfLength(5'000'011);
  const std::string expected = ContentsDigest::of(bytes);
  for (const std::size_t piece : {700UL, 262'144UL, 1'048'576UL, 1'048'577UL, 5'000'011UL})
    EXPECT_EQ(digestOfPieces(bytes, piece), expected) << piece;
  EXPECT_EQ(digestOfPieces("", 1), ContentsDigest::of(""));
  EXPECT_EQ(digestOfPieces("x", 1), ContentsDigest::of("x"));
}

TEST(FollowingDigest, ofAFileThatWasCutIsAnError) {
  const GrowingFile file;
  file.append(BytesOfLength(3'000'000));
  file.cutTo(1'000'000);
  FollowingDigest digest(file.descriptor());
  digest.grewTo(3'000'000);
  std::string text;
  EXPECT_EQ(digest.finish(&text), EIO);
  EXPECT_EQ(text, "");
}

TEST(FollowingDigest, nobodyWantsAnyMoreLetsGoOfTheFile) {
  for (int i = 0; i < 50; ++i) {
    const GrowingFile file;
    file.append(BytesOfLength(2'000'000));
    FollowingDigest digest(file.descriptor());
    digest.grewTo(2'000'000);
  }
}

}  // namespace
}  // namespace droxa::keld
