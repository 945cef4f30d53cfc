#include <sys/time.h>

#include "ContentsFixture.h"
#include "keld/contents/PartFile.h"

namespace droxa::keld {
namespace {

class Parts : public testing::Test {
 protected:
  std::unique_ptr<PartFile> open(const std::string &bytes) const {
    return replica_.storage().openPart(ContentsDigest::of(bytes), bytes.size()).part;
  }
  ContentsReplica replica_;
};

TEST_F(Parts, onesFinishedHasTheContents) {
  const std::string bytes = BytesOfLength(300'000);
  const auto part = open(bytes);
  ASSERT_TRUE(part);
  EXPECT_TRUE(part->append(std::string_view(bytes).substr(0, 100'000)).isDone());
  EXPECT_TRUE(part->append(std::string_view(bytes).substr(100'000)).isDone());
  EXPECT_FALSE(part->isFinished());
  EXPECT_TRUE(part->finish().isDone());
  EXPECT_TRUE(part->isFinished());
  EXPECT_TRUE(part->finish().isDone());
  EXPECT_EQ(replica_.count("parts"), 1U);
}

TEST_F(Parts, anEmptyOneIsFinishedAtOnce) {
  const auto part = open("");
  EXPECT_TRUE(part->finish().isDone());
}

TEST_F(Parts, goOnWhereACrashEndedThem) {
  const std::string bytes = BytesOfLength(300'000);
  for (const std::size_t length :
       {0UL, 1UL, 4095UL, 4096UL, 4097UL, 131'071UL, 131'072UL, 131'073UL, 299'999UL, 300'000UL}) {
    {
      const auto part = open(bytes);
      ASSERT_TRUE(part->append(std::string_view(bytes).substr(0, length)).isDone());
    }
    replica_.reopen();
    replica_.storage().recover();
    const auto part = open(bytes);
    ASSERT_TRUE(part) << length;
    EXPECT_EQ(part->length(), length);
    EXPECT_TRUE(part->append(std::string_view(bytes).substr(length)).isDone());
    EXPECT_TRUE(part->finish().isDone()) << length;
    part->discard();
  }
}

TEST_F(Parts, aFinishedOneIsStillFinishedAfterwards) {
  const std::string bytes = BytesOfLength(1000);
  replica_.finishedPart(bytes).reset();
  replica_.reopen();
  replica_.storage().recover();
  const auto part = open(bytes);
  EXPECT_TRUE(part->isFinished());
  EXPECT_EQ(part->length(), bytes.size());
}

TEST_F(Parts, ofOtherContentsAreRemoved) {
  const std::string bytes = BytesOfLength(1000);
  for (const std::string &wrong : {BytesOfLength(1000, 2), BytesOfLength(999), std::string()}) {
    const auto part = open(bytes);
    ASSERT_TRUE(part->append(wrong).isDone());
    EXPECT_EQ(part->finish().outcome, ContentsOutcome::wrongContents);
    EXPECT_EQ(replica_.count("parts"), 0U);
  }
  const auto part = open(bytes);
  EXPECT_EQ(part->append(BytesOfLength(1001)).outcome, ContentsOutcome::wrongContents);
  EXPECT_EQ(part->append("x").outcome, ContentsOutcome::error);
  EXPECT_EQ(replica_.count("parts"), 0U);
}

TEST_F(Parts, damagedWhileNobodyLookedAreNotTrusted) {
  const std::string bytes = BytesOfLength(10'000);
  ASSERT_TRUE(open(bytes)->append(std::string_view(bytes).substr(0, 8'000)).isDone());
  const std::string path = replica_.root() + "/.droxa-private/parts/" + ContentsDigest::of(bytes) + ".part";
  {
    std::fstream file(path, std::ios::in | std::ios::out | std::ios::binary);
    file.seekp(4096) << std::string(3'904, '\0');
  }
  const auto part = open(bytes);
  EXPECT_EQ(part->length(), 8'000U);
  ASSERT_TRUE(part->append(std::string_view(bytes).substr(8'000)).isDone());
  EXPECT_EQ(part->finish().outcome, ContentsOutcome::wrongContents);
}

TEST_F(Parts, haveOneWriter) {
  const std::string bytes = BytesOfLength(10);
  auto part = open(bytes);
  const auto second = replica_.storage().openPart(ContentsDigest::of(bytes), bytes.size());
  EXPECT_EQ(second.result.outcome, ContentsOutcome::busy);
  EXPECT_FALSE(second.part);
  EXPECT_EQ(replica_.storage().forgetPart(part->digest()).outcome, ContentsOutcome::busy);
  part.reset();
  EXPECT_TRUE(replica_.storage().forgetPart(ContentsDigest::of(bytes)).isDone());
  EXPECT_EQ(replica_.count("parts"), 0U);
  EXPECT_TRUE(replica_.storage().forgetPart(ContentsDigest::of(bytes)).isDone());
}

TEST_F(Parts, areRefusedForWhatIsNoDigest) {
  for (const char *digest : {"", "../../x", "abc"}) {
    EXPECT_EQ(replica_.storage().openPart(digest, 1).result.outcome, ContentsOutcome::error);
    EXPECT_EQ(replica_.storage().forgetPart(digest).outcome, ContentsOutcome::error);
  }
}

TEST_F(Parts, areRefusedWhenTheyWouldFillTheDisk) {
  replica_.settings().spaceToLeave = 1ULL << 62;
  replica_.reopen();
  const std::string bytes = BytesOfLength(10);
  EXPECT_EQ(replica_.storage().openPart(ContentsDigest::of(bytes), 10).result.outcome,
            ContentsOutcome::noSpace);
  EXPECT_EQ(replica_.count("parts"), 0U);
}

TEST_F(Parts, nobodyResumedInTimeAreRemoved) {
  ASSERT_TRUE(open("first")->append("fir").isDone());
  replica_.storage().recover();
  EXPECT_EQ(replica_.count("parts"), 1U);
  replica_.settings().partLifetime = std::chrono::hours(-1);
  replica_.reopen();
  const auto held = open("second");
  replica_.storage().recover();
  EXPECT_EQ(replica_.count("parts"), 1U);  // the one that is being written
}

}  // namespace
}  // namespace droxa::keld
