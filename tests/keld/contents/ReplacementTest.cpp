#include <sys/xattr.h>

#include "ContentsFixture.h"

namespace droxa::keld {
namespace {

const std::string kBytes = BytesOfLength(20'000);
const std::string kNewer = BytesOfLength(30'000, 2);

class Publishing : public EachStorageKind {};
class Materialising : public EachStorageKind {};
class Replacing : public EachStorageKind {};
constexpr auto kKinds = {kPlaceholders, kWithoutLeases, kPromises, kPromisesWithoutExchange};
INSTANTIATE_TEST_SUITE_P(Each, Publishing, testing::ValuesIn(kKinds), StorageKindName);
INSTANTIATE_TEST_SUITE_P(Each, Materialising, testing::ValuesIn(kKinds), StorageKindName);
INSTANTIATE_TEST_SUITE_P(Each, Replacing, testing::ValuesIn(kKinds), StorageKindName);

TEST_P(Publishing, showsSizeDatesAndModeOfADatalessDocument) {
  const auto result = replica_.publishPlaceholder("a", kBytes, 0604);
  ASSERT_EQ(result.outcome, ContentsOutcome::done);
  const auto look = replica_.look("a");
  EXPECT_EQ(look.kind, DocumentClass::dataless);
  EXPECT_EQ(look.facts.size, kBytes.size());
  EXPECT_EQ(look.facts.mode & 07777, 0604U);
  EXPECT_EQ(look.facts.modified, ContentsReplica::kDate);
  EXPECT_EQ(look.facts.inode, result.facts.inode);
  EXPECT_EQ(replica_.exists("a"), hasPlaceholders());
  struct stat status;
  if (hasPlaceholders()) {
    ASSERT_EQ(::stat(replica_.path("a").c_str(), &status), 0);
    EXPECT_LE(status.st_blocks, 8);  // the attributes' own
  }
  replica_.expectTidy();
}

TEST_P(Publishing, leavesWhatHasTheNameAlready) {
  replica_.write("a", "mine");
  EXPECT_EQ(replica_.publishPlaceholder("a", kBytes).outcome, ContentsOutcome::nameTaken);
  EXPECT_EQ(replica_.read("a"), "mine");
  ASSERT_TRUE(replica_.publishPlaceholder("b", kBytes).isDone());
  EXPECT_EQ(replica_.publishPlaceholder("b", kNewer).outcome, ContentsOutcome::nameTaken);
  EXPECT_EQ(replica_.look("b").marker, replica_.markerOf(kBytes));
  replica_.expectTidy();
}

TEST_P(Publishing, canBeTriedAgainUnderAnotherName) {
  replica_.write("a", "mine");
  auto prepared = replica_.storage().preparePlaceholder(replica_.markerOf(kBytes), 0640, {0, 5});
  EXPECT_EQ(replica_.storage().publishNew(prepared.file, replica_.folder(), "a").outcome,
            ContentsOutcome::nameTaken);
  EXPECT_TRUE(prepared.file);
  EXPECT_TRUE(replica_.storage().publishNew(prepared.file, replica_.folder(), "b").isDone());
  EXPECT_FALSE(prepared.file);
  EXPECT_EQ(replica_.look("b").kind, DocumentClass::dataless);
  replica_.expectTidy();
}

TEST_P(Publishing, tellsThatTheFolderIsGone) {
  ASSERT_EQ(::mkdir(replica_.path("inner").c_str(), 0755), 0);
  const OwnedDescriptor inner = OpenFolder(replica_.folder(), "inner");
  ASSERT_EQ(::rmdir(replica_.path("inner").c_str()), 0);
  auto prepared = replica_.storage().preparePlaceholder(replica_.markerOf(kBytes), 0640, {0, 5});
  EXPECT_EQ(replica_.storage().publishNew(prepared.file, inner.get(), "a").outcome,
            ContentsOutcome::folderGone);
}

TEST_P(Publishing, makesFoldersAndEmptyDocuments) {
  auto folder = replica_.storage().prepareFolder(DocumentMarker::ofFolder("record"), 0750);
  ASSERT_TRUE(folder.result.isDone());
  ASSERT_TRUE(replica_.storage().publishNew(folder.file, replica_.folder(), "inner").isDone());
  EXPECT_EQ(ReadMarker(replica_.folder(), "inner").has_value(), GetParam().capabilities.extendedAttributes);
  auto second = replica_.storage().prepareFolder(DocumentMarker::ofFolder("record"));
  EXPECT_EQ(replica_.storage().publishNew(second.file, replica_.folder(), "inner").outcome,
            ContentsOutcome::nameTaken);
  second.file = PreparedFile();
  ASSERT_TRUE(replica_.publishPlaceholder("empty", "").isDone());
  EXPECT_TRUE(replica_.exists("empty"));
  EXPECT_EQ(replica_.look("empty").kind, hasPlaceholders() ? DocumentClass::present : DocumentClass::plain);
  replica_.expectTidy();
}

TEST_P(Publishing, ofContentsNeedsNoPlaceholder) {
  auto prepared = replica_.preparedContents(kBytes);
  ASSERT_TRUE(replica_.storage().publishNew(prepared, replica_.folder(), "a").isDone());
  EXPECT_EQ(replica_.read("a"), kBytes);
  EXPECT_EQ(replica_.count("parts"), 0U);
}

TEST_P(Publishing, givesAnUnpublishedPartBack) {
  auto prepared = replica_.preparedContents(kBytes);
  EXPECT_EQ(replica_.count("parts"), 0U);
  prepared = PreparedFile();
  replica_.expectTidy();
  EXPECT_TRUE(replica_.finishedPart(kBytes)->isFinished());
  EXPECT_EQ(replica_.count("parts"), 1U);
}

TEST_P(Materialising, putsTheWholeDocumentWhereThePlaceholderWas) {
  ASSERT_TRUE(replica_.publishPlaceholder("a", kBytes).isDone());
  const auto result = replica_.fill("a", kBytes, 0604);
  ASSERT_EQ(result.outcome, ContentsOutcome::done);
  EXPECT_EQ(replica_.read("a"), kBytes);
  const auto look = replica_.look("a");
  EXPECT_EQ(look.kind, hasPlaceholders() ? DocumentClass::present : DocumentClass::plain);
  EXPECT_EQ(look.facts.mode & 07777, 0604U);
  EXPECT_EQ(look.facts.modified, ContentsReplica::kDate);
  EXPECT_EQ(look.facts.inode, result.facts.inode);
  EXPECT_EQ(look.facts.changed, result.facts.changed);
  EXPECT_FALSE(look.isPromised);
  EXPECT_EQ(replica_.count("parts"), 0U);
  replica_.expectTidy();
}

TEST_P(Materialising, worksWithTheLongestNames) {
  const std::string name(255, 'n');
  ASSERT_EQ(replica_.publishPlaceholder(name, kBytes).outcome, ContentsOutcome::done);
  EXPECT_EQ(replica_.look(name).kind, DocumentClass::dataless);
  ASSERT_EQ(replica_.fill(name, kBytes).outcome, ContentsOutcome::done);
  EXPECT_EQ(replica_.read(name), kBytes);
  ASSERT_EQ(replica_.storage()
                .evict(replica_.folder(), name, replica_.look(name).facts, replica_.markerOf(kBytes))
                .outcome,
            ContentsOutcome::done);
  EXPECT_EQ(replica_.look(name).kind, DocumentClass::dataless);
}

TEST_P(Materialising, keepsThePartForOtherDocumentsOfTheSameContents) {
  for (const char *name : {"a", "b"}) ASSERT_TRUE(replica_.publishPlaceholder(name, kBytes).isDone());
  const auto part = replica_.finishedPart(kBytes);
  const auto fill = [&](const char *name, PartUse use) {
    return replica_.storage().materialise(replica_.folder(), name, *part, use, replica_.markerOf(kBytes),
                                          0640, replica_.look(name).facts);
  };
  EXPECT_TRUE(fill("a", PartUse::keep).isDone());
  EXPECT_EQ(replica_.count("parts"), 1U);
  EXPECT_TRUE(fill("b", PartUse::consume).isDone());
  EXPECT_EQ(replica_.count("parts"), 0U);
  EXPECT_EQ(replica_.read("a"), kBytes);
  EXPECT_EQ(replica_.read("b"), kBytes);
}

TEST_P(Materialising, keepsThePartOfADocumentThatIsGone) {
  ASSERT_TRUE(replica_.publishPlaceholder("a", kBytes).isDone());
  const auto look = replica_.look("a");
  const auto part = replica_.finishedPart(kBytes);
  const auto fill = [&](const std::string &name) {
    return replica_.storage().materialise(replica_.folder(), name, *part, PartUse::consume,
                                          replica_.markerOf(kBytes), 0640, look.facts);
  };
  EXPECT_EQ(fill("b").outcome, ContentsOutcome::gone);
  const std::string onDisk = hasPlaceholders() ? "a" : PromiseNameFor("a");
  replica_.hooks.beforeExchange = [&] { ASSERT_EQ(::unlink(replica_.path(onDisk).c_str()), 0); };
  EXPECT_EQ(fill("a").outcome, ContentsOutcome::gone);
  EXPECT_TRUE(part->isFinished());
  EXPECT_EQ(replica_.count("parts"), 1U);
  replica_.expectTidy();
  ASSERT_TRUE(replica_.publishPlaceholder("c", kBytes).isDone());
  EXPECT_EQ(replica_.storage()
                .materialise(replica_.folder(), "c", *part, PartUse::consume, replica_.markerOf(kBytes), 0640,
                             replica_.look("c").facts)
                .outcome,
            ContentsOutcome::done);
  EXPECT_EQ(replica_.read("c"), kBytes);
}

TEST_P(Materialising, leavesAnotherDocumentThatTookTheName) {
  ASSERT_TRUE(replica_.publishPlaceholder("a", kBytes).isDone());
  replica_.hooks.beforeExchange = [&] {
    replica_.write("new", "mine");
    ASSERT_EQ(::rename(replica_.path("new").c_str(), replica_.path("a").c_str()), 0);
  };
  EXPECT_EQ(replica_.fill("a", kBytes).outcome, ContentsOutcome::changedMeanwhile);
  EXPECT_EQ(replica_.read("a"), "mine");
  replica_.expectTidy();
  EXPECT_EQ(replica_.fill("a", kBytes).outcome, ContentsOutcome::changedMeanwhile);
}

TEST_P(Materialising, refusesContentsThatArentTheMarkers) {
  ASSERT_TRUE(replica_.publishPlaceholder("a", kBytes).isDone());
  const auto part = replica_.finishedPart(kNewer);
  EXPECT_EQ(replica_.storage()
                .materialise(replica_.folder(), "a", *part, PartUse::consume, replica_.markerOf(kBytes), 0640,
                             replica_.look("a").facts)
                .outcome,
            ContentsOutcome::error);
  EXPECT_EQ(replica_.look("a").kind, DocumentClass::dataless);
}

TEST_P(Replacing, putsNewerContentsInThePlaceOfUnchangedOnes) {
  replica_.publishPresent("a", kBytes);
  auto prepared = replica_.preparedContents(kNewer);
  const auto result =
      replica_.storage().replaceContents(replica_.folder(), "a", prepared, replica_.look("a").facts);
  ASSERT_EQ(result.outcome, ContentsOutcome::done);
  EXPECT_EQ(replica_.read("a"), kNewer);
  EXPECT_EQ(replica_.look("a").facts.inode, result.facts.inode);
  const auto marker = replica_.look("a").marker;
  EXPECT_EQ(marker ? marker->contentVersion : "", hasPlaceholders() ? "2" : "");
  replica_.expectTidy();
}

TEST_P(Replacing, putsAPlaceholderInThePlaceOfContents) {
  replica_.publishPresent("a", kBytes);
  auto prepared = replica_.storage().preparePlaceholder(replica_.markerOf(kNewer, "2"), 0640, {0, 7});
  ASSERT_EQ(replica_.storage()
                .replaceContents(replica_.folder(), "a", prepared.file, replica_.look("a").facts)
                .outcome,
            ContentsOutcome::done);
  EXPECT_EQ(replica_.look("a").kind, DocumentClass::dataless);
  EXPECT_EQ(replica_.look("a").marker->digest, ContentsDigest::of(kNewer));
  EXPECT_EQ(replica_.exists("a"), hasPlaceholders());
  replica_.expectTidy();
}

TEST_P(Replacing, putsANewerPlaceholderInThePlaceOfAPlaceholder) {
  ASSERT_TRUE(replica_.publishPlaceholder("a", kBytes).isDone());
  auto prepared = replica_.storage().preparePlaceholder(replica_.markerOf(kNewer, "2"), 0640, {0, 7});
  ASSERT_EQ(replica_.storage()
                .replaceContents(replica_.folder(), "a", prepared.file, replica_.look("a").facts)
                .outcome,
            ContentsOutcome::done);
  EXPECT_EQ(replica_.look("a").facts.size, kNewer.size());
  replica_.expectTidy();
}

TEST_P(Replacing, leavesWhatWasChangedBefore) {
  replica_.publishPresent("a", kBytes);
  const auto known = replica_.look("a").facts;
  replica_.write("a", "mine");
  auto prepared = replica_.preparedContents(kNewer);
  EXPECT_EQ(replica_.storage().replaceContents(replica_.folder(), "a", prepared, known).outcome,
            ContentsOutcome::changedMeanwhile);
  EXPECT_EQ(replica_.read("a"), "mine");
  EXPECT_EQ(replica_.storage().replaceContents(replica_.folder(), "b", prepared, known).outcome,
            ContentsOutcome::gone);
  EXPECT_TRUE(prepared);
}

TEST_P(Replacing, leavesAnotherFileThatTookTheNameMeanwhile) {
  replica_.publishPresent("a", kBytes);
  auto prepared = replica_.preparedContents(kNewer);
  replica_.hooks.beforeExchange = [&] {
    replica_.write("new", "mine");
    ASSERT_EQ(::rename(replica_.path("new").c_str(), replica_.path("a").c_str()), 0);
  };
  EXPECT_EQ(
      replica_.storage().replaceContents(replica_.folder(), "a", prepared, replica_.look("a").facts).outcome,
      ContentsOutcome::changedMeanwhile);
  EXPECT_EQ(replica_.read("a"), "mine");
  prepared = PreparedFile();
  replica_.expectTidy();
}

TEST_P(Replacing, leavesAFolderThatTookTheNameMeanwhile) {
  replica_.publishPresent("a", kBytes);
  auto prepared = replica_.preparedContents(kNewer);
  replica_.hooks.beforeExchange = [&] {
    ASSERT_EQ(::unlink(replica_.path("a").c_str()), 0);
    ASSERT_EQ(::mkdir(replica_.path("a").c_str(), 0755), 0);
  };
  EXPECT_EQ(
      replica_.storage().replaceContents(replica_.folder(), "a", prepared, replica_.look("a").facts).outcome,
      ContentsOutcome::changedMeanwhile);
  EXPECT_EQ(replica_.look("a").kind, DocumentClass::notADocument);
}

TEST(ReplacingPlaceholders, keepsTheUsersOwnAttributes) {
  const ContentsReplica replica;
  ASSERT_TRUE(replica.publishPlaceholder("a", kBytes).isDone());
  ASSERT_EQ(::setxattr(replica.path("a").c_str(), "user.tag", "blue", 4, 0), 0);
  ASSERT_TRUE(replica.fill("a", kBytes).isDone());
  char value[8] = {};
  EXPECT_EQ(::getxattr(replica.path("a").c_str(), "user.tag", value, sizeof value), 4);
  EXPECT_STREQ(value, "blue");
}

TEST(ReplacingPlaceholders, keepsTheUsersOwnAttributesOnANewerPlaceholder) {
  const ContentsReplica replica;
  ASSERT_TRUE(replica.publishPlaceholder("a", kBytes).isDone());
  ASSERT_EQ(::setxattr(replica.path("a").c_str(), "user.xdg.tags", "blue", 4, 0), 0);
  auto newer = replica.storage().preparePlaceholder(replica.markerOf("newer", "2"), 0640, {0, 5});
  ASSERT_TRUE(newer.result.isDone());
  ASSERT_TRUE(
      replica.storage().replaceContents(replica.folder(), "a", newer.file, replica.look("a").facts).isDone());
  char value[8] = {};
  EXPECT_EQ(::getxattr(replica.path("a").c_str(), "user.xdg.tags", value, sizeof value), 4);
  EXPECT_STREQ(value, "blue");
  EXPECT_EQ(replica.look("a").kind, DocumentClass::dataless);
  EXPECT_EQ(replica.look("a").facts.modified, 5);
}

TEST(ReplacingPlaceholders, refusesAPlaceholderThatSomebodyHasOpenForWriting) {
  const ContentsReplica replica;
  ASSERT_TRUE(replica.publishPlaceholder("a", kBytes).isDone());
  OwnedDescriptor writer(::open(replica.path("a").c_str(), O_WRONLY | O_CLOEXEC));
  EXPECT_EQ(replica.fill("a", kBytes).outcome, ContentsOutcome::inUse);
  EXPECT_EQ(replica.look("a").kind, DocumentClass::dataless);
  writer = OwnedDescriptor(::open(replica.path("a").c_str(), O_RDONLY | O_CLOEXEC));
  EXPECT_EQ(replica.fill("a", kBytes).outcome, ContentsOutcome::done);  // who reads, goes on with the old one
}

}  // namespace
}  // namespace droxa::keld
