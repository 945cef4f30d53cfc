#include <thread>

#include "ContentsFixture.h"

namespace droxa::keld {
namespace {

const std::string kBytes = BytesOfLength(20'000);
const std::string kNewer = BytesOfLength(30'000, 2);

// A user who opens the document while it is being replaced, and writes as soon as the kernel lets them.
class SlowWriter {
 public:
  explicit SlowWriter(const ContentsReplica &replica) : path_(replica.path("a")) {}
  ~SlowWriter() { finish(); }
  void open() {
    // The first open is refused, and breaks the lease for certain; the second waits for it.
    const int refused = ::open(path_.c_str(), O_WRONLY | O_NONBLOCK | O_CLOEXEC);
    EXPECT_EQ(refused, -1);
    EXPECT_EQ(errno, EWOULDBLOCK);
    thread_ = std::thread([path = path_] {
      const OwnedDescriptor file(::open(path.c_str(), O_WRONLY | O_CLOEXEC));
      EXPECT_EQ(::pwrite(file.get(), "mine", 4, 0), 4);
    });
  }
  void finish() {
    if (thread_.joinable()) thread_.join();
  }

 private:
  const std::string path_;
  std::thread thread_;
};

TEST(Races, aWriterWhoOpensAPlaceholderBeforeTheExchangeKeepsIt) {
  ContentsReplica replica;
  ASSERT_TRUE(replica.publishPlaceholder("a", kBytes).isDone());
  SlowWriter writer(replica);
  replica.hooks.beforeExchange = [&] { writer.open(); };
  EXPECT_EQ(replica.fill("a", kBytes).outcome, ContentsOutcome::inUse);
  writer.finish();
  EXPECT_EQ(replica.read("a").substr(0, 4), "mine");
}

TEST(Races, aWriterWhoOpensADocumentBeforeTheExchangeKeepsIt) {
  ContentsReplica replica;
  replica.publishPresent("a", kBytes);
  auto prepared = replica.preparedContents(kNewer);
  SlowWriter writer(replica);
  replica.hooks.beforeExchange = [&] { writer.open(); };
  EXPECT_EQ(
      replica.storage().replaceContents(replica.folder(), "a", prepared, replica.look("a").facts).outcome,
      ContentsOutcome::inUse);
  writer.finish();
  EXPECT_EQ(replica.read("a").substr(0, 4), "mine");
}

class RacesWithoutLeases : public testing::Test {
 protected:
  ContentsOutcome replace() {
    auto prepared = replica_.preparedContents(kNewer);
    result_ = replica_.storage().replaceContents(replica_.folder(), "a", prepared, replica_.look("a").facts);
    return result_.outcome;
  }
  ContentsReplica replica_{kWithoutLeases};
  ContentsResult result_;
};

TEST_F(RacesWithoutLeases, whatIsWrittenIntoAPlaceholderBeforeTheExchangeStays) {
  ASSERT_TRUE(replica_.publishPlaceholder("a", kBytes).isDone());
  replica_.hooks.beforeExchange = [&] { replica_.write("a", "mine"); };
  EXPECT_EQ(replica_.fill("a", kBytes).outcome, ContentsOutcome::changedMeanwhile);
  EXPECT_EQ(replica_.read("a"), "mine");
  EXPECT_EQ(replica_.look("a").kind, DocumentClass::overwritten);
  EXPECT_EQ(replica_.count("parts"), 1U);
  replica_.expectTidy();
}

TEST_F(RacesWithoutLeases, whatIsWrittenIntoADocumentBeforeTheExchangeStays) {
  replica_.publishPresent("a", kBytes);
  replica_.hooks.beforeExchange = [&] { replica_.write("a", "mine"); };
  EXPECT_EQ(replace(), ContentsOutcome::changedMeanwhile);
  EXPECT_EQ(replica_.read("a"), "mine");
  EXPECT_EQ(replica_.look("a").kind, DocumentClass::edited);
  replica_.expectTidy();
}

TEST_F(RacesWithoutLeases, aDocumentThatIsOpenForWritingStays) {
  replica_.publishPresent("a", kBytes);
  OwnedDescriptor writer;
  replica_.hooks.beforeExchange = [&] {
    writer = OwnedDescriptor(::open(replica_.path("a").c_str(), O_WRONLY | O_CLOEXEC));
  };
  EXPECT_EQ(replace(), ContentsOutcome::inUse);
  EXPECT_EQ(::pwrite(writer.get(), "mine", 4, 0), 4);
  EXPECT_EQ(replica_.read("a").substr(0, 4), "mine");
  replica_.expectTidy();
}

TEST_F(RacesWithoutLeases, whatIsWrittenIntoTheNewContentsStaysWhenTheOldOnesWereChangedToo) {
  replica_.publishPresent("a", kBytes);
  replica_.hooks.beforeExchange = [&] { replica_.write("a", "first"); };
  replica_.hooks.afterExchange = [&] { replica_.write("a", "second"); };
  EXPECT_EQ(replace(), ContentsOutcome::changedMeanwhile);
  EXPECT_EQ(replica_.read("a"), "second");
  EXPECT_TRUE(result_.hasRescued);
  const auto rescued = replica_.storage().rescuedFiles();
  ASSERT_EQ(rescued.size(), 1U);
  EXPECT_EQ(rescued[0].name, "a");
  EXPECT_TRUE(replica_.storage().placeRescued(rescued[0].id, replica_.folder(), "a (mine)").isDone());
  EXPECT_EQ(replica_.read("a (mine)"), "first");
  EXPECT_TRUE(replica_.storage().rescuedFiles().empty());
  EXPECT_EQ(replica_.count("rescued"), 0U);
}

TEST_F(RacesWithoutLeases, anEditSurvivesThatTheUserRemovesTheNewContents) {
  replica_.publishPresent("a", kBytes);
  replica_.hooks.beforeExchange = [&] { replica_.write("a", "first"); };
  replica_.hooks.afterExchange = [&] { ASSERT_EQ(::unlink(replica_.path("a").c_str()), 0); };
  EXPECT_EQ(replace(), ContentsOutcome::changedMeanwhile);
  EXPECT_FALSE(replica_.exists("a"));
  const auto rescued = replica_.storage().rescuedFiles();
  ASSERT_EQ(rescued.size(), 1U);
  replica_.write("taken", "x");
  const auto place = [&](const char *name) {
    return replica_.storage().placeRescued(rescued[0].id, replica_.folder(), name).outcome;
  };
  EXPECT_EQ(place("taken"), ContentsOutcome::nameTaken);
  EXPECT_EQ(place("a"), ContentsOutcome::done);
  EXPECT_EQ(place("b"), ContentsOutcome::gone);
  EXPECT_EQ(replica_.read("a"), "first");
}

}  // namespace
}  // namespace droxa::keld
