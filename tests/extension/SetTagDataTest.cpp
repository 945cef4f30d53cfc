#include "additions/NSError+QVFPAdditions.h"
#include "platform/fileprovider/FPTags.h"
#include "tessaly/QVErrors.h"
#include "tests/extension/ActionFixture.h"

namespace droxa {
namespace {

class SetTagData : public ActionTest {
 protected:
  void set(const NSData &data, const std::string &identifier, const ItemAnswer &answer) {
    extension->setTagData(data, identifier, answer.completion());
    EXPECT_EQ(answer.calls(), 1) << "before the call returns";
  }
  static std::string setting(const NSData &data, const std::string &identifier) {
    return opened(1) + "set tag data (" + std::to_string(data.length()) + " bytes) for " + identifier;
  }
  std::string failed(const NSURL &url, const NSError &error) const {
    return "error: [ERROR] can't set tags for " + url.description() + "; " + error.description();
  }
  const NSData kTwo = FPGetTagsDataFromTags({{"work", 6}, {"later", 0}});
};

TEST_F(SetTagData, replacesTheLabelsInTheirOrder) {
  const ItemAnswer answer("tags");
  set(kTwo, document, answer);
  expectItem(answer, "a.txt");
  EXPECT_EQ(actions.calls(), Lines{"setTagNames(" + at("a.txt").path() + ", [work][later])"});
  EXPECT_TRUE(actions.urls()[0].hasPhysicalProperty());
  EXPECT_EQ(asked().back(), lookedAt("a.txt"));
  EXPECT_EQ(logged(), joined({{setting(kTwo, document)},
                              urlLines(2, document, at("a.txt")),
                              itemLines(3, at("a.txt"), daemon.item("a.txt")),
                              {closed(1)}}));
}

TEST_F(SetTagData, emptyDataClearsTheTags) {
  for (const NSData &data : {NSData(), NSData::dataWithString("")}) {
    clear();
    const ItemAnswer answer("tags");
    set(data, document, answer);
    expectItem(answer, "a.txt");
    EXPECT_EQ(actions.calls().back(), "setTagNames(" + at("a.txt").path() + ", )");
    EXPECT_EQ(logged()[0], setting(data, document));
  }
}

TEST_F(SetTagData, ofAnAliasAreItsTargets) {
  const std::string alias = daemon.addAlias("alias").asString();
  std::filesystem::create_directories(daemon.url("").path());
  std::ofstream(at("target").path()) << "contents";
  std::filesystem::create_symlink("target", at("alias").path());
  const ItemAnswer answer("tags");
  set(kTwo, alias, answer);
  EXPECT_EQ(actions.urls()[0], at("target"));
}

TEST_F(SetTagData, aFailureIsToldTranslated) {
  const NSError failure(QVTessalyErrorDomain, 14);
  actions.areTagsSet() = false;
  actions.tagError() = failure;
  const ItemAnswer answer("tags");
  set(kTwo, document, answer);
  expectError(answer, qv_fileProviderError(failure));
  EXPECT_EQ(daemon.log().count("getQueryItemForURL"), 0U);
  EXPECT_EQ(logged(), joined({{setting(kTwo, document)},
                              urlLines(2, document, at("a.txt")),
                              {failed(at("a.txt"), failure), closed(1)}}));
}

TEST_F(SetTagData, aFailureWithNobodyToTellIsOnlyLogged) {
  actions.areTagsSet() = false;
  actions.tagError() = NSError::errorWithPOSIXCode(5);
  extension->setTagData(kTwo, document, nullptr);
  EXPECT_EQ(logged().back(), closed(1));
  EXPECT_TRUE(capture.contains("[ERROR] can't set tags for " + at("a.txt").description() + "; " +
                               actions.tagError().description()));
}

// There is no URL to set them on, which is no error of its own.
TEST_F(SetTagData, ofAnUnknownItemIsTheTagCallsError) {
  const ItemAnswer answer("tags");
  set(kTwo, kUnknown, answer);
  expectError(answer, NSError());
  EXPECT_EQ(actions.calls(), Lines{});
  EXPECT_EQ(logged(), joined({{setting(kTwo, kUnknown)},
                              unknownLines(2, kUnknown),
                              {failed(NSURL(), NSError()), closed(1)}}));
}

TEST_F(SetTagData, aLookupThatFailsIsTold) {
  daemon.replies().failNext("getQueryItemForURL", NSError::errorWithPOSIXCode(5));
  const ItemAnswer answer("tags");
  set(kTwo, document, answer);
  expectError(answer, NSError::errorWithPOSIXCode(5));
}

}  // namespace
}  // namespace droxa
