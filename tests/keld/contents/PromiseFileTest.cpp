#include <set>

#include "ContentsFixture.h"
#include "keld/Placement.h"
#include "keld/contents/PromiseFile.h"

namespace droxa::keld {
namespace {

PromiseFile somePromise(const std::string &name) {
  PromiseFile promise;
  promise.name = name;
  promise.marker.state = MarkerState::dataless;
  promise.marker.recordName = "record";
  promise.marker.digest = std::string(64, 'b');
  promise.marker.size = 5;
  promise.mode = 0604;
  promise.modified = 77;
  return promise;
}

TEST(PromiseFile, itsNameLeadsBackToTheDocuments) {
  for (const std::string &name : {std::string("a"), std::string("notes.txt"), std::string(".hidden"),
                                  std::string(243, 'x'), std::string("x.droxafault")}) {
    const std::string promise = PromiseNameFor(name);
    EXPECT_TRUE(IsPromiseName(promise));
    EXPECT_EQ(NameOfPromise(promise), name);
  }
  for (const char *name : {"a", ".droxafault", "..droxafault", "a.droxafault", ".a.droxafaul", ""})
    EXPECT_FALSE(NameOfPromise(name)) << name;
}

TEST(PromiseFile, aLongNameIsShortenedToOneOfItsOwn) {
  std::set<std::string> promises;
  std::string umlauts;
  while (umlauts.size() < 254) umlauts += "\xc3\xa4";
  const std::set<std::string> names = {std::string(255, 'x'),         std::string(254, 'x'),
                                       std::string(254, 'x') + "y",   umlauts,
                                       umlauts.substr(0, 252) + "ab", std::string(244, 'x')};
  for (const auto &name : names) {
    const std::string promise = PromiseNameFor(name);
    EXPECT_LE(promise.size(), 255U);
    EXPECT_TRUE(IsPromiseName(promise));
    EXPECT_FALSE(NameOfPromise(promise));
    promises.insert(promise);
  }
  EXPECT_EQ(promises.size(), names.size());
  // One that is called as if it had been shortened is told apart from what was.
  const std::string shortened = PromiseNameFor(std::string(255, 'x'));
  const std::string posing = shortened.substr(1, shortened.size() - 12);
  EXPECT_NE(PromiseNameFor(posing), shortened);
}

TEST(PromiseFile, readsBackAsItWasWritten) {
  for (const std::string &name : {std::string("a"), std::string("two\nlines"), std::string(255, 'x')})
    EXPECT_EQ(ParsePromise(EncodePromise(somePromise(name))), somePromise(name));
}

TEST(PromiseFile, hostileBytesAreNoPromise) {
  const std::string good = EncodePromise(somePromise("name"));
  for (std::size_t length = 0; length + 4 <= good.size(); ++length)
    EXPECT_FALSE(ParsePromise(good.substr(0, length))) << length;
  EXPECT_FALSE(ParsePromise(good + "/x"));
  EXPECT_FALSE(ParsePromise(good + '\0'));
  EXPECT_FALSE(ParsePromise(EncodePromise(somePromise(".."))));
  EXPECT_FALSE(ParsePromise(EncodePromise(somePromise(""))));
  PromiseFile present = somePromise("name");
  present.marker.state = MarkerState::present;
  EXPECT_FALSE(ParsePromise(EncodePromise(present)));
}

TEST(PromiseFile, oneThatWasRenamedIsThatOfItsNewName) {
  const ContentsReplica replica(kPromises);
  const std::string longName(255, 'x');
  replica.write(PromiseNameFor("a"), EncodePromise(somePromise("a")));
  replica.write(PromiseNameFor("b"), EncodePromise(somePromise("a")));
  EXPECT_TRUE(ReadPromise(replica.folder(), PromiseNameFor("a")));
  const auto renamed = ReadPromise(replica.folder(), PromiseNameFor("b"));
  ASSERT_TRUE(renamed);
  EXPECT_EQ(*renamed, somePromise("b"));
  replica.write(PromiseNameFor(longName), EncodePromise(somePromise("a")));
  EXPECT_FALSE(ReadPromise(replica.folder(), PromiseNameFor(longName)));
  replica.write(PromiseNameFor(longName), EncodePromise(somePromise(longName)));
  EXPECT_EQ(ReadPromise(replica.folder(), PromiseNameFor(longName)), somePromise(longName));
  EXPECT_FALSE(ReadPromise(replica.folder(), PromiseNameFor("c")));
}

TEST(ContentsStorage, itsFolderIsNoContainer) {
  EXPECT_FALSE(IsContainerName(kContentsStorageName));
}

}  // namespace
}  // namespace droxa::keld
