#include "tests/extension/ActionFixture.h"

namespace droxa {
namespace {

class SetFavoriteRank : public ActionTest {
 protected:
  void set(std::optional<std::uint64_t> rank, const std::string &identifier, const ItemAnswer &answer) {
    extension->setFavoriteRank(rank, identifier, answer.completion());
    EXPECT_EQ(answer.calls(), 1) << "before the call returns";
  }
};

TEST_F(SetFavoriteRank, isRecordedAndTheItemReadAnew) {
  const ItemAnswer answer("rank");
  set(7, document, answer);
  expectItem(answer, "a.txt");
  EXPECT_EQ(actions.calls(), Lines{"setFavoriteRank(7, " + at("a.txt").description() + ")"});
  EXPECT_TRUE(actions.urls()[0].hasPhysicalProperty());
  EXPECT_EQ(asked().back(), lookedAt("a.txt"));
  EXPECT_EQ(logged(), joined({{opened(1) + "set favorite rank 7 for " + document},
                              urlLines(2, document, at("a.txt")),
                              itemLines(3, at("a.txt"), daemon.item("a.txt")),
                              {closed(1)}}));
}

TEST_F(SetFavoriteRank, noRankIsHandedOnUnchangedAndZeroIsARank) {
  const ItemAnswer none("rank"), zero("rank"), largest("rank");
  set(std::nullopt, document, none);
  EXPECT_EQ(logged()[0], opened(1) + "set favorite rank (null) for " + document);
  set(0, document, zero);
  set(~std::uint64_t{0}, document, largest);
  const std::string url = at("a.txt").description();
  EXPECT_EQ(actions.calls(), (Lines{"setFavoriteRank(nil, " + url + ")", "setFavoriteRank(0, " + url + ")",
                                    "setFavoriteRank(18446744073709551615, " + url + ")"}));
}

TEST_F(SetFavoriteRank, ofAnAliasIsTheAliasesOwn) {
  const std::string alias = daemon.addAlias("alias").asString();
  std::filesystem::create_directories(daemon.url("").path());
  std::ofstream(at("target").path()) << "contents";
  std::filesystem::create_symlink("target", at("alias").path());
  const ItemAnswer answer("rank");
  set(7, alias, answer);
  EXPECT_EQ(actions.urls()[0], at("alias"));
}

TEST_F(SetFavoriteRank, ofAnUnknownItemIsTheLookupsError) {
  const ItemAnswer answer("rank");
  set(7, kUnknown, answer);
  expectError(answer, NSError(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem));
  EXPECT_EQ(actions.calls(), Lines{"setFavoriteRank(7, (null))"});
  EXPECT_EQ(
      logged(),
      joined({{opened(1) + "set favorite rank 7 for " + kUnknown}, unknownLines(2, kUnknown), {closed(1)}}));
}

TEST_F(SetFavoriteRank, aLookupThatFailsIsTold) {
  daemon.replies().failNext("getQueryItemForURL", NSError::errorWithPOSIXCode(5));
  const ItemAnswer answer("rank");
  set(7, document, answer);
  expectError(answer, NSError::errorWithPOSIXCode(5));
}

}  // namespace
}  // namespace droxa
