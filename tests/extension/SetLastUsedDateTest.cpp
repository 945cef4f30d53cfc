#include "tests/extension/ActionFixture.h"

namespace droxa {
namespace {

class SetLastUsedDate : public ActionTest {
 protected:
  void set(const NSDate &date, const std::string &identifier, const ItemAnswer &answer) {
    extension->setLastUsedDate(date, identifier, answer.completion());
    EXPECT_EQ(answer.calls(), 1) << "before the call returns";
  }
  const NSDate kDate = NSDate::dateWithNanosecondsSince1970(1'700'000'000'000'000'000);
};

TEST_F(SetLastUsedDate, isRecordedAndTheItemReadAnew) {
  const ItemAnswer answer("date");
  set(kDate, document, answer);
  expectItem(answer, "a.txt");
  EXPECT_EQ(actions.calls(),
            Lines{"setLastOpenDate(" + kDate.description() + ", " + at("a.txt").description() + ")"});
  EXPECT_FALSE(actions.urls()[0].hasPhysicalProperty());
  EXPECT_EQ(asked().back(), lookedAt("a.txt"));
  EXPECT_EQ(logged(), joined({{opened(1) + "set last used date " + kDate.description() + " for " + document},
                              urlLines(2, document, at("a.txt")),
                              itemLines(3, at("a.txt"), daemon.item("a.txt")),
                              {closed(1)}}));
}

TEST_F(SetLastUsedDate, aNilDateIsHandedOnUnchanged) {
  const ItemAnswer answer("date");
  set(NSDate(), document, answer);
  expectItem(answer, "a.txt");
  EXPECT_EQ(actions.calls(), Lines{"setLastOpenDate(nil, " + at("a.txt").description() + ")"});
  EXPECT_EQ(logged()[0], opened(1) + "set last used date (null) for " + document);
}

TEST_F(SetLastUsedDate, ofAnAliasIsTheAliasesOwn) {
  const std::string alias = daemon.addAlias("alias").asString();
  std::filesystem::create_directories(daemon.url("").path());
  std::ofstream(at("target").path()) << "contents";
  std::filesystem::create_symlink("target", at("alias").path());
  const ItemAnswer answer("date");
  set(kDate, alias, answer);
  EXPECT_EQ(actions.urls()[0], at("alias"));
}

// It isn't looked at before: the lookup at the end is what fails.
TEST_F(SetLastUsedDate, ofAnUnknownItemIsTheLookupsError) {
  const ItemAnswer answer("date");
  set(kDate, kUnknown, answer);
  expectError(answer, NSError(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem));
  EXPECT_EQ(actions.calls(), Lines{"setLastOpenDate(" + kDate.description() + ", (null))"});
  EXPECT_EQ(logged(), joined({{opened(1) + "set last used date " + kDate.description() + " for " + kUnknown},
                              unknownLines(2, kUnknown),
                              {closed(1)}}));
}

TEST_F(SetLastUsedDate, aLookupThatFailsIsTold) {
  daemon.replies().failNext("getQueryItemForURL", NSError::errorWithPOSIXCode(5));
  const ItemAnswer answer("date");
  set(kDate, document, answer);
  expectError(answer, NSError::errorWithPOSIXCode(5));
}

}  // namespace
}  // namespace droxa
