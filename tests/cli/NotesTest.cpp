#include <nlohmann/json.hpp>

#include "platform/fileprovider/FPTags.h"
#include "tests/cli/ActionsFixture.h"

namespace droxa::testing {
namespace {

using Json = nlohmann::json;

class NotesCommand : public ActionsTest {
 protected:
  NotesCommand() {
    NSFileProviderItemFields tagged = item("d5", "tagged");
    tagged.tagData = FPGetTagsDataFromTags({{"work", 6}, {"later", 0}});
    name("tagged", tagged);
  }
  int tag(const std::string &argument, const Words &names, bool json = false) {
    return run([&](CommandContext &made) { return runTag(made, argument, names, json); });
  }
  int untag(const std::string &argument, const Words &names) {
    return run([&](CommandContext &made) { return runUntag(made, argument, names, false); });
  }
  int used(const UsedOptions &options) {
    return run([&](CommandContext &made) { return runUsed(made, options); });
  }
};

TEST_F(NotesCommand, withoutNamesTagShowsThoseThereAre) {
  EXPECT_EQ(tag("tagged", {}), 0);
  EXPECT_EQ(out.str(), "work (red)\nlater\n");
  EXPECT_EQ(tag("a.txt", {}), 0);
  EXPECT_EQ(out.str(), "");
  EXPECT_EQ(tag("tagged", {}, true), 0);
  EXPECT_EQ(Json::parse(out.str())["tagNames"], (Json{"work", "later"}));
  EXPECT_TRUE(host->requests.empty());
}

TEST_F(NotesCommand, tagAddsWhatIsNew) {
  EXPECT_EQ(tag("tagged", {"later", "new", "new"}), 0) << err.str();
  EXPECT_EQ(request().kind, Kind::setTagData);
  EXPECT_EQ(FPGetTagsFromTagsData(request().tagData),
            (std::vector<FPTag>{{"work", 6}, {"later", 0}, {"new", 0}}));
  EXPECT_TRUE(printed(*result));
}

TEST_F(NotesCommand, untagRemovesThoseOrAll) {
  EXPECT_EQ(untag("tagged", {"work"}), 0) << err.str();
  EXPECT_EQ(FPGetTagsFromTagsData(request().tagData), (std::vector<FPTag>{{"later", 0}}));
  EXPECT_EQ(untag("tagged", {}), 0);
  EXPECT_FALSE(request(1).tagData);
  EXPECT_EQ(untag("tagged", {"other"}), 1);
  EXPECT_TRUE(said("tagged: it has no tag \"other\"")) << err.str();
  EXPECT_EQ(host->requests.size(), 2U);
}

TEST_F(NotesCommand, whatCantBeATagSaysSo) {
  for (const std::string name : {"", "line\nbreak", "\xff"}) {
    EXPECT_EQ(tag("a.txt", {name}), 1);
    EXPECT_TRUE(said("it can't be a tag")) << err.str();
  }
  EXPECT_TRUE(host->requests.empty());
}

TEST_F(NotesCommand, anItemThatHasGoneMeanwhileIsNoSuchItem) {
  result.reset();
  EXPECT_EQ(tag("a.txt", {"new"}), 66);
}

TEST_F(NotesCommand, favoriteSetsAndRemovesTheRank) {
  const auto favorite = [&](std::optional<std::uint64_t> rank) {
    return run([&](CommandContext &made) { return runFavorite(made, "a.txt", rank, false); });
  };
  EXPECT_EQ(favorite(7), 0);
  EXPECT_EQ(request().kind, Kind::setFavoriteRank);
  EXPECT_EQ(request().favoriteRank, 7U);
  EXPECT_EQ(favorite(std::nullopt), 0);
  EXPECT_EQ(request(1).favoriteRank, std::nullopt);
}

TEST_F(NotesCommand, usedTakesADateOrNowOrNever) {
  EXPECT_EQ(used({"a.txt", "2026-01-31T12:00:00Z", false, false}), 0) << err.str();
  EXPECT_EQ(request().kind, Kind::setLastUsedDate);
  EXPECT_EQ(request().date, NSDate::dateWithNanosecondsSince1970(1'769'860'800'000'000'000));
  const NSDate before = NSDate::now();
  EXPECT_EQ(used({"a.txt", "", false, false}), 0);
  EXPECT_GE(request(1).date, before);
  EXPECT_EQ(used({"a.txt", "", true, false}), 0);
  EXPECT_FALSE(request(2).date);
  EXPECT_EQ(used({"a.txt", "yesterday", false, false}), 2);
  EXPECT_TRUE(said("yesterday: it is no date such as")) << err.str();
  EXPECT_EQ(host->requests.size(), 3U);
}

TEST_F(NotesCommand, aHostThatIsntThereIsSaid) {
  connecting->failure = NSError(NSFileProviderErrorDomain, NSFileProviderErrorServerUnreachable);
  EXPECT_EQ(tag("a.txt", {"new"}), 69);
}

TEST_F(NotesCommand, anAnswerThatNeverComesEndsTheCommandInTime) {
  const auto action = std::make_shared<ScriptedAction>();
  host->act = [&](const FPDActionRequest &) { return action; };
  EXPECT_EQ(run([&](CommandContext &made) {
              made.timeout = std::chrono::milliseconds(20);
              return runFavorite(made, "a.txt", 1, false);
            }),
            75);
}

}  // namespace
}  // namespace droxa::testing
