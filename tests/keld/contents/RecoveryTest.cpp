#include <sys/wait.h>

#include "ContentsFixture.h"
#include "keld/contents/ExchangeNote.h"

namespace droxa::keld {
namespace {

const std::string kBytes = BytesOfLength(20'000);
const std::string kNewer = BytesOfLength(30'000, 2);

class Recovering : public EachStorageKind {
 protected:
  // Runs `operation` in a process that dies in one of the hooks; then recovers, as the next run does.
  void dieIn(std::function<void()> &hook, const std::function<void()> &operation,
             const std::function<void()> &afterDeath) {
    hook = [] { ::_exit(42); };
    const pid_t child = ::fork();
    if (child == 0) {
      operation();
      ::_exit(0);
    }
    int status = 0;
    ASSERT_EQ(::waitpid(child, &status, 0), child);
    ASSERT_TRUE(WIFEXITED(status));
    ASSERT_EQ(WEXITSTATUS(status), 42);
    hook = nullptr;
    if (afterDeath) afterDeath();
    replica_.reopen();
    rescued_ = replica_.storage().recover();
  }
  void dieIn(std::function<void()> &hook, const std::function<void()> &operation) {
    dieIn(hook, operation, nullptr);
    replica_.expectTidy();
  }
  // The file that a dead process left in the storage.
  std::string leftBehind() const {
    for (const auto &entry :
         std::filesystem::directory_iterator(replica_.root() + "/.droxa-private/temporary"))
      if (entry.path().extension() != ".note") return entry.path().string();
    ADD_FAILURE() << "nothing was left behind";
    return {};
  }
  void fill() { replica_.fill("a", kBytes); }
  void evict() {
    replica_.storage().evict(replica_.folder(), "a", replica_.look("a").facts, replica_.markerOf(kBytes));
  }
  void replace() {
    auto prepared = replica_.preparedContents(kNewer);
    replica_.storage().replaceContents(replica_.folder(), "a", prepared, replica_.look("a").facts);
  }
  std::vector<RescuedFile> rescued_;
};
constexpr auto kKinds = {kPlaceholders, kWithoutLeases, kPromises, kPromisesWithoutExchange};
INSTANTIATE_TEST_SUITE_P(Each, Recovering, testing::ValuesIn(kKinds), StorageKindName);

TEST_P(Recovering, beforeTheExchangeLeavesThePlaceholderAndThePart) {
  ASSERT_TRUE(replica_.publishPlaceholder("a", kBytes).isDone());
  dieIn(replica_.hooks.beforeExchange, [&] { fill(); });
  EXPECT_EQ(replica_.look("a").kind, DocumentClass::dataless);
  EXPECT_TRUE(rescued_.empty());
  EXPECT_TRUE(replica_.storage().openPart(ContentsDigest::of(kBytes), kBytes.size()).part->isFinished());
  EXPECT_TRUE(replica_.fill("a", kBytes).isDone());
  EXPECT_EQ(replica_.read("a"), kBytes);
}

TEST_P(Recovering, afterTheExchangeLeavesTheDocument) {
  ASSERT_TRUE(replica_.publishPlaceholder("a", kBytes).isDone());
  dieIn(replica_.hooks.afterExchange, [&] { fill(); });
  EXPECT_EQ(replica_.read("a"), kBytes);
  const auto kind = replica_.look("a").kind;
  EXPECT_EQ(kind, DocumentClass::present);  // a promise that was left says so, too
  EXPECT_TRUE(rescued_.empty());
  EXPECT_TRUE(replica_.storage().removePromise(replica_.folder(), "a").isDone());
  EXPECT_FALSE(replica_.look("a").isPromised);
}

TEST_P(Recovering, afterTheExchangeOfContentsRemovesTheOldOnesOrPutsThemBack) {
  replica_.publishPresent("a", kBytes);
  dieIn(replica_.hooks.afterExchange, [&] { replace(); });
  EXPECT_EQ(replica_.read("a"), GetParam().capabilities.exchange ? kNewer : kBytes);
  EXPECT_TRUE(rescued_.empty());
}

TEST_P(Recovering, takesNewerContentsForTheCloudsAfterTheyWerePublished) {
  ASSERT_TRUE(replica_.publishPlaceholder("a", kBytes).isDone());
  dieIn(replica_.hooks.afterExchange, [&] { replace(); });
  EXPECT_EQ(replica_.read("a"), kNewer);
  EXPECT_EQ(replica_.look("a").kind, DocumentClass::present);
  EXPECT_EQ(replica_.look("a").marker->contentVersion, "2");
}

TEST_P(Recovering, doesntPutContentsBackThatANewerPromiseReplaced) {
  if (hasPlaceholders()) return;
  replica_.publishPresent("a", kBytes);
  const auto promise = PromiseNameFor("a");
  const auto replace = [&] {
    auto newer = replica_.storage().preparePlaceholder(replica_.markerOf(kNewer, "2"), 0640, {0, 5});
    replica_.storage().replaceContents(replica_.folder(), "a", newer.file, replica_.look("a").facts);
  };
  const auto publish = [&] {
    PromiseFile file{"a", replica_.markerOf(kNewer, "2"), 0640, 5};
    replica_.write(promise, EncodePromise(file));
  };
  dieIn(replica_.hooks.afterExchange, replace, publish);
  replica_.expectTidy();
  EXPECT_EQ(replica_.look("a").kind, DocumentClass::dataless);
  EXPECT_EQ(replica_.look("a").marker->contentVersion, "2");
}

TEST_P(Recovering, rescuesWhatAUserPutThere) {
  replica_.publishPresent("a", kBytes);
  replica_.hooks.beforeExchange = [&] {
    replica_.write("new", "mine");
    ASSERT_EQ(::rename(replica_.path("new").c_str(), replica_.path("a").c_str()), 0);
  };
  dieIn(replica_.hooks.afterExchange, [&] { replace(); });
  if (!GetParam().capabilities.exchange) {
    EXPECT_EQ(replica_.read("a"), "mine");  // nothing had its name
    return;
  }
  ASSERT_EQ(rescued_.size(), 1U);
  EXPECT_EQ(rescued_[0].folderPath, "folder");
  EXPECT_EQ(rescued_[0].folderInode, ReadFolderFacts(replica_.folder(), 0)->inode);
  EXPECT_EQ(rescued_[0].name, "a");
  EXPECT_EQ(rescued_[0].facts.size, 4U);
  EXPECT_EQ(replica_.storage().recover().size(), 1U);  // until somebody has placed it
  EXPECT_TRUE(replica_.storage().placeRescued(rescued_[0].id, replica_.folder(), "conflict").isDone());
  EXPECT_EQ(replica_.read("conflict"), "mine");
  EXPECT_EQ(replica_.read("a"), kNewer);
}

TEST_P(Recovering, rescuesWhatAUserWroteIntoThePlaceholder) {
  if (!hasPlaceholders()) return;
  ASSERT_TRUE(replica_.publishPlaceholder("a", kBytes).isDone());
  const auto write = [&] {
    std::fstream(leftBehind(), std::ios::in | std::ios::out | std::ios::binary) << "mine";
  };
  dieIn(
      replica_.hooks.afterExchange, [&] { fill(); }, write);
  replica_.expectTidy();
  EXPECT_EQ(replica_.read("a"), kBytes);
  ASSERT_EQ(rescued_.size(), 1U);
  EXPECT_EQ(rescued_[0].marker, replica_.markerOf(kBytes));
  EXPECT_EQ(rescued_[0].name, "a");
}

TEST_P(Recovering, waitsForWhoStillWritesIntoTheOldContents) {
  if (!hasPlaceholders()) return;
  replica_.publishPresent("a", kBytes);
  OwnedDescriptor writer;
  const auto open = [&] { writer = OwnedDescriptor(::open(leftBehind().c_str(), O_WRONLY | O_CLOEXEC)); };
  dieIn(
      replica_.hooks.afterExchange, [&] { replace(); }, open);
  EXPECT_EQ(replica_.read("a"), kNewer);
  EXPECT_TRUE(rescued_.empty());
  EXPECT_EQ(replica_.count("temporary"), 2U);
  EXPECT_EQ(::pwrite(writer.get(), "mine", 4, 0), 4);
  writer = OwnedDescriptor();
  EXPECT_EQ(replica_.storage().recover().size(), 1U);
  replica_.expectTidy();
}

TEST_P(Recovering, removesWhatWasNeverPublished) {
  const pid_t child = ::fork();
  if (child == 0) {
    const auto placeholder = replica_.storage().preparePlaceholder(replica_.markerOf(kBytes), 0640, {0, 1});
    const auto folder = replica_.storage().prepareFolder(DocumentMarker::ofFolder("record"));
    const auto contents = replica_.preparedContents(kNewer);
    ::_exit(placeholder.result.isDone() && folder.result.isDone() && contents ? 42 : 0);
  }
  int status = 0;
  ASSERT_EQ(::waitpid(child, &status, 0), child);
  ASSERT_EQ(WEXITSTATUS(status), 42);
  EXPECT_GE(replica_.count("temporary"), 2U);
  EXPECT_TRUE(replica_.storage().recover().empty());
  replica_.expectTidy();
  EXPECT_TRUE(replica_.storage().openPart(ContentsDigest::of(kNewer), kNewer.size()).part->isFinished());
}

TEST_P(Recovering, anEvictionLosesNothingBeforeItIsMarked) {
  replica_.publishPresent("a", kBytes);
  dieIn(replica_.hooks.beforePunch, [&] { evict(); });
  EXPECT_EQ(replica_.read("a"), kBytes);
  const auto look = replica_.look("a");
  EXPECT_EQ(look.kind, hasPlaceholders() ? DocumentClass::evicting : DocumentClass::present);
  if (!hasPlaceholders()) return;
  EXPECT_TRUE(replica_.storage().finishEviction(replica_.folder(), "a").isDone());
  EXPECT_EQ(replica_.look("a").kind, DocumentClass::dataless);
}

TEST_P(Recovering, anEvictionIsEndedWhenTheContentsAreGone) {
  replica_.publishPresent("a", kBytes);
  dieIn(replica_.hooks.afterPunch, [&] { evict(); });
  const auto look = replica_.look("a");
  if (!hasPlaceholders()) {
    EXPECT_EQ(look.kind, DocumentClass::dataless);
    return;
  }
  EXPECT_EQ(look.kind, DocumentClass::evicting);
  EXPECT_TRUE(replica_.storage().finishEviction(replica_.folder(), "a").isDone());
  EXPECT_EQ(replica_.look("a").kind, DocumentClass::dataless);
  EXPECT_EQ(replica_.look("a").facts.modified, ContentsReplica::kDate);
}

TEST(ExchangeNote, readsBackAsItWasWritten) {
  ExchangeNote note;
  note.incoming = {1, 2, -3};
  note.outgoing = {4, UINT64_MAX, 6};
  note.wasDataless = true;
  note.folderInode = 7;
  note.folderPath = "a b/c\nd";
  note.name = std::string(255, 'n');
  EXPECT_EQ(ParseNote(EncodeNote(note)), note);
  note.folderPath.clear();
  const std::string bytes = EncodeNote(note);
  EXPECT_EQ(ParseNote(bytes), note);
  for (std::size_t length = 0; length < bytes.size(); ++length)
    EXPECT_FALSE(ParseNote(bytes.substr(0, length))) << length;
  EXPECT_FALSE(ParseNote("droxa-note-1 1 2 3 4 5 6 2 7 a" + std::string("\0b\0", 3)));
}

}  // namespace
}  // namespace droxa::keld
