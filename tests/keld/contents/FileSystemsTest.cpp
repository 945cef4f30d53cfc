#include <sys/mount.h>

#include "ContentsFixture.h"
#include "keld/contents/FileSteps.h"

namespace droxa::keld {
namespace {

// A small file system of its own, where the test may mount one.
class Mounted {
 public:
  Mounted(const char *type, const char *options) {
    path_ = std::filesystem::temp_directory_path().string() + "/droxa-mount-XXXXXX";
    if (!mkdtemp(path_.data())) ADD_FAILURE() << "can't make " << path_;
    isMounted_ = ::mount("none", path_.c_str(), type, 0, options) == 0;
  }
  ~Mounted() {
    if (isMounted_) ::umount2(path_.c_str(), MNT_DETACH);
    std::error_code ignored;
    std::filesystem::remove(path_, ignored);
  }
  explicit operator bool() const { return isMounted_; }
  const std::string &path() const { return path_; }
  bool setReadOnly(bool isReadOnly) const {
    const unsigned long flags = isReadOnly ? MS_REMOUNT | MS_RDONLY : MS_REMOUNT;
    return ::mount("none", path_.c_str(), nullptr, flags, nullptr) == 0;
  }

 private:
  std::string path_;
  bool isMounted_ = false;
};

#define SKIP_UNLESS(mounted) \
  if (!(mounted)) GTEST_SKIP() << "this process may not mount file systems"

// As a user without privileges, for as long as it lives.
class Unprivileged {
 public:
  Unprivileged() : is_(::geteuid() == 0 && ::setegid(65534) == 0 && ::seteuid(65534) == 0) {}
  ~Unprivileged() { EXPECT_TRUE(!is_ || (::seteuid(0) == 0 && ::setegid(0) == 0)); }
  explicit operator bool() const { return is_; }

 private:
  const bool is_;
};

const std::string kBytes = BytesOfLength(20'000);

TEST(FileSystems, oneWithoutAttributesAndHolesGetsPromises) {
  const Mounted mounted("ramfs", "mode=0700");
  SKIP_UNLESS(mounted);
  ContentsReplica replica(kPlaceholders, mounted.path());
  replica.settings().assume.reset();
  replica.reopen();
  EXPECT_FALSE(replica.storage().capabilities().extendedAttributes);
  EXPECT_FALSE(replica.storage().capabilities().holes);
  ASSERT_EQ(replica.storage().form(), DatalessForm::promise);
  ASSERT_EQ(replica.publishPlaceholder("a", kBytes).outcome, ContentsOutcome::done);
  EXPECT_FALSE(replica.exists("a"));
  ASSERT_EQ(replica.fill("a", kBytes).outcome, ContentsOutcome::done);
  EXPECT_EQ(replica.read("a"), kBytes);
  EXPECT_EQ(replica.storage()
                .evict(replica.folder(), "a", replica.look("a").facts, replica.markerOf(kBytes))
                .outcome,
            ContentsOutcome::done);
  EXPECT_EQ(replica.look("a").kind, DocumentClass::dataless);
}

TEST(FileSystems, theProbeLeavesNothingBehind) {
  ContentsReplica replica;
  replica.settings().assume.reset();
  replica.reopen();
  EXPECT_EQ(replica.count(""), 3U);
  struct stat status;
  ASSERT_EQ(::stat((replica.root() + "/.droxa-private").c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777, 0700U);
}

TEST(FileSystems, aFullOneIsToldBeforeTheDownload) {
  const Mounted mounted("tmpfs", "size=1m");
  SKIP_UNLESS(mounted);
  const ContentsReplica replica(kPlaceholders, mounted.path());
  const std::string bytes = BytesOfLength(3 << 20);
  EXPECT_EQ(replica.storage().openPart(ContentsDigest::of(bytes), bytes.size()).result.outcome,
            ContentsOutcome::noSpace);
  EXPECT_EQ(replica.count("parts"), 0U);
}

TEST(FileSystems, aDownloadGoesOnAfterTheDiskWasFull) {
  const Mounted mounted("tmpfs", "size=1m");
  SKIP_UNLESS(mounted);
  const ContentsReplica replica(kPlaceholders, mounted.path());
  const std::string bytes = BytesOfLength(700'000);
  auto part = replica.storage().openPart(ContentsDigest::of(bytes), bytes.size()).part;
  ASSERT_TRUE(part);
  ASSERT_TRUE(part->append(std::string_view(bytes).substr(0, 100'000)).isDone());
  replica.write("filler", std::string(500'000, 'x'));
  EXPECT_EQ(part->append(std::string_view(bytes).substr(100'000)).outcome, ContentsOutcome::noSpace);
  EXPECT_GE(part->length(), 100'000U);
  EXPECT_LT(part->length(), bytes.size());
  ASSERT_EQ(::unlink(replica.path("filler").c_str()), 0);
  EXPECT_TRUE(part->append(std::string_view(bytes).substr(part->length())).isDone());
  EXPECT_TRUE(part->finish().isDone());
}

TEST(FileSystems, aFullOneKeepsThePlaceholder) {
  const Mounted mounted("tmpfs", "size=1m");
  SKIP_UNLESS(mounted);
  const ContentsReplica replica(kPlaceholders, mounted.path());
  const std::string bytes = BytesOfLength(400'000);
  ASSERT_TRUE(replica.publishPlaceholder("a", bytes).isDone());
  const auto part = replica.finishedPart(bytes);
  replica.write("filler", std::string(400'000, 'x'));
  EXPECT_EQ(replica.storage()
                .materialise(replica.folder(), "a", *part, PartUse::keep, replica.markerOf(bytes), 0640,
                             replica.look("a").facts)
                .outcome,
            ContentsOutcome::noSpace);
  EXPECT_EQ(replica.look("a").kind, DocumentClass::dataless);
  replica.expectTidy();
}

TEST(FileSystems, oneThatIsReadOnlyIsTold) {
  const Mounted mounted("tmpfs", "size=1m");
  SKIP_UNLESS(mounted);
  const ContentsReplica replica(kPlaceholders, mounted.path());
  replica.publishPresent("a", kBytes);
  ASSERT_TRUE(mounted.setReadOnly(true));
  const auto published = replica.publishPlaceholder("b", kBytes);
  EXPECT_EQ(published.outcome, ContentsOutcome::error);
  EXPECT_EQ(published.error, EROFS);
  const auto evicted =
      replica.storage().evict(replica.folder(), "a", replica.look("a").facts, replica.markerOf(kBytes));
  EXPECT_EQ(evicted.outcome, ContentsOutcome::error);
  EXPECT_EQ(evicted.error, EROFS);
  int error = 0;
  EXPECT_FALSE(ContentsStorage::open(replica.root(), {}, &error));
  EXPECT_EQ(error, EROFS);
  EXPECT_EQ(replica.read("a"), kBytes);
  ASSERT_TRUE(mounted.setReadOnly(false));
}

TEST(FileSystems, aFolderThatMayNotBeWrittenIsTold) {
  const Unprivileged unprivileged;
  if (!unprivileged) GTEST_SKIP() << "only the superuser can become somebody else";
  const ContentsReplica replica;
  replica.publishPresent("a", kBytes);
  ASSERT_TRUE(replica.publishPlaceholder("b", kBytes).isDone());
  ASSERT_EQ(::chmod(replica.path("").c_str(), 0555), 0);
  EXPECT_EQ(replica.publishPlaceholder("c", kBytes).error, EACCES);
  EXPECT_EQ(replica.fill("b", kBytes).error, EACCES);
  EXPECT_EQ(replica.look("b").kind, DocumentClass::dataless);
  auto prepared = replica.preparedContents(BytesOfLength(5, 2));
  EXPECT_EQ(replica.storage().replaceContents(replica.folder(), "a", prepared, replica.look("a").facts).error,
            EACCES);
  EXPECT_EQ(replica.read("a"), kBytes);
  prepared = PreparedFile();
  replica.expectTidy();
  ASSERT_EQ(::chmod(replica.path("").c_str(), 0755), 0);
  ASSERT_EQ(::chmod(replica.root().c_str(), 0), 0);
  int error = 0;
  EXPECT_FALSE(ContentsStorage::open(replica.root(), {}, &error));
  EXPECT_EQ(error, EACCES);
  ASSERT_EQ(::chmod(replica.root().c_str(), 0700), 0);
}

TEST(FileSystems, documentsThatTheirOwnerMayNotWriteAreFilledAndEvicted) {
  const Unprivileged unprivileged;
  const ContentsReplica replica;
  ASSERT_EQ(replica.publishPlaceholder("a", kBytes, 0444).outcome, ContentsOutcome::done);
  ASSERT_EQ(replica.fill("a", kBytes, 0444).outcome, ContentsOutcome::done);
  ASSERT_EQ(replica.storage()
                .evict(replica.folder(), "a", replica.look("a").facts, replica.markerOf(kBytes))
                .outcome,
            ContentsOutcome::done);
  EXPECT_EQ(replica.look("a").kind, DocumentClass::dataless);
  EXPECT_EQ(replica.look("a").facts.mode & 07777, 0444U);
}

TEST(FileSystems, aPlaceholderThatMayNotBeReadIsNotTakenForContents) {
  const Unprivileged unprivileged;
  if (!unprivileged) GTEST_SKIP() << "only the superuser can become somebody else";
  const ContentsReplica replica;
  ASSERT_TRUE(replica.publishPlaceholder("a", kBytes).isDone());
  ASSERT_EQ(::chmod(replica.path("a").c_str(), 0), 0);
  EXPECT_EQ(replica.look("a").kind, DocumentClass::unreadable);
  EXPECT_EQ(replica.look("a").error, EACCES);
}

TEST(FileSystems, aMissingReplicaIsTold) {
  int error = 0;
  EXPECT_FALSE(ContentsStorage::open("/nowhere/at/all", {}, &error));
  EXPECT_EQ(error, ENOENT);
}

}  // namespace
}  // namespace droxa::keld
