#include <gtest/gtest.h>

#include "fileproviderd/RelayedEnumerator.h"
#include "tests/fileproviderd/ScriptedExtension.h"

namespace droxa::testing {
namespace {

class RelayedEnumeratorTest : public ::testing::Test {
 protected:
  std::string pageResult = "no answer";
  void askForPage(const std::string &page) {
    relayed->enumerateItems(
        NSData::dataWithString(page), [this](const auto &items, const NSData &, const NSError &error) {
          pageResult = error ? error.localizedDescription() : std::to_string(items.size()) + " items";
        });
  }

  std::shared_ptr<ScriptedExtension> extension = std::make_shared<ScriptedExtension>();
  std::shared_ptr<ScriptedEnumerator> first = std::make_shared<ScriptedEnumerator>();
  std::shared_ptr<RelayedEnumerator> relayed = std::make_shared<RelayedEnumerator>(
      std::make_shared<ExtensionCalls>(std::make_shared<ScriptedConnecting>(extension)), "i1", first);
};

TEST_F(RelayedEnumeratorTest, aPageIsPassedOn) {
  askForPage("p");
  first->answerPage("p", {document(1, "a")});
  EXPECT_EQ(pageResult, "1 items");
}

TEST_F(RelayedEnumeratorTest, aListingGoesOnInANewExtension) {
  askForPage("p");
  first->failPage("p", connectionInterrupted());
  auto second = extension->enumerators.take();
  ASSERT_TRUE(second);
  second->answerPage("p", {document(1, "a"), document(2, "b")});
  EXPECT_EQ(pageResult, "2 items");
  askForPage("q");
  second->answerPage("q", {});
  EXPECT_EQ(pageResult, "0 items");
}

// The page ahead: asked for when the one before is given, answered when the client asks for it.

TEST_F(RelayedEnumeratorTest, theNextPageIsAskedForWhileTheClientWorks) {
  askForPage("p");
  first->answerPage("p", {document(1, "a")}, "q");
  first->answerPage("q", {document(2, "b"), document(3, "c")}, "r");
  EXPECT_EQ(pageResult, "1 items");
  EXPECT_EQ(first->calls.size(), 0U);  // one page ahead, not two
  askForPage("q");
  EXPECT_EQ(pageResult, "2 items");
  first->answerPage("r", {});
  askForPage("r");
  EXPECT_EQ(pageResult, "0 items");
  EXPECT_EQ(first->calls.size(), 0U);
}

TEST_F(RelayedEnumeratorTest, aPageOnItsWayIsAwaited) {
  askForPage("p");
  first->answerPage("p", {}, "q");
  askForPage("q");
  EXPECT_EQ(pageResult, "0 items");
  first->answerPage("q", {document(1, "a")});
  EXPECT_EQ(pageResult, "1 items");
  EXPECT_EQ(first->calls.size(), 0U);
}

TEST_F(RelayedEnumeratorTest, aSignalDropsThePageAhead) {
  askForPage("p");
  first->answerPage("p", {}, "q");
  first->answerPage("q", {document(1, "old")});
  relayed->containerWasSignalled();
  askForPage("q");
  first->answerPage("q", {document(1, "new"), document(2, "newer")});
  EXPECT_EQ(pageResult, "2 items");
}

TEST_F(RelayedEnumeratorTest, aPageThatIsAwaitedDuringASignalIsAskedForAnew) {
  askForPage("p");
  first->answerPage("p", {}, "q");
  askForPage("q");
  relayed->containerWasSignalled();
  first->answerPage("q", {document(1, "old")});
  EXPECT_EQ(pageResult, "0 items");
  first->answerPage("q", {document(1, "new"), document(2, "newer")});
  EXPECT_EQ(pageResult, "2 items");
}

TEST_F(RelayedEnumeratorTest, aPageAheadThatFailsIsAskedForAnew) {
  askForPage("p");
  first->answerPage("p", {}, "q");
  first->failPage("q", NSError::errorWithPOSIXCode(5, "broken"));
  askForPage("q");
  first->answerPage("q", {document(1, "a")});
  EXPECT_EQ(pageResult, "1 items");
}

TEST_F(RelayedEnumeratorTest, anAwaitedPageGoesOnInANewExtension) {
  askForPage("p");
  first->answerPage("p", {}, "q");
  askForPage("q");
  first->failPage("q", connectionInterrupted());
  first->failPage("q", connectionInterrupted());
  auto second = extension->enumerators.take();
  ASSERT_TRUE(second);
  second->answerPage("q", {document(1, "a")});
  EXPECT_EQ(pageResult, "1 items");
}

TEST_F(RelayedEnumeratorTest, anotherPageThanTheNextIsAskedFor) {
  askForPage("p");
  first->answerPage("p", {}, "q");
  first->answerPage("q", {document(1, "a")});
  askForPage("p");
  first->answerPage("p", {document(1, "a"), document(2, "b")});
  EXPECT_EQ(pageResult, "2 items");
}

TEST_F(RelayedEnumeratorTest, aClientThatGoesLeavesThePageAheadBehind) {
  askForPage("p");
  first->answerPage("p", {}, "q");
  const std::weak_ptr<RelayedEnumerator> weak = relayed;
  relayed.reset();
  EXPECT_TRUE(weak.expired());
  first->answerPage("q", {document(1, "a")});
  EXPECT_EQ(pageResult, "0 items");
}

TEST_F(RelayedEnumeratorTest, aClientThatGoesIsStillAnswered) {
  askForPage("p");
  first->answerPage("p", {}, "q");
  askForPage("q");
  const std::weak_ptr<RelayedEnumerator> weak = relayed;
  relayed.reset();
  first->answerPage("q", {document(1, "a")});
  EXPECT_EQ(pageResult, "1 items");
  EXPECT_TRUE(weak.expired());
}

TEST_F(RelayedEnumeratorTest, anotherErrorIsPassedOn) {
  askForPage("p");
  first->failPage("p", NSError::errorWithPOSIXCode(5, "broken"));
  EXPECT_EQ(pageResult, "broken");
  EXPECT_EQ(extension->opened.size(), 0U);
}

TEST_F(RelayedEnumeratorTest, aNewExtensionThatRefusesEndsTheListing) {
  extension->failure = NSError::errorWithPOSIXCode(13, "refused");
  askForPage("p");
  first->failPage("p", connectionInterrupted());
  EXPECT_EQ(pageResult, "refused");
}

TEST_F(RelayedEnumeratorTest, anAnchorOfTheOldExtensionIsTakenToTheNewOne) {
  std::string result;
  relayed->enumerateChanges(NSData::dataWithString("A"),
                            [&](const auto &, const auto &, const NSData &, bool, const NSError &error) {
                              result = std::to_string(error.code());
                            });
  first->failChanges("A", connectionInterrupted());
  auto second = extension->enumerators.take();
  ASSERT_TRUE(second);
  second->failChanges("A", NSError(NSFileProviderErrorDomain, NSFileProviderErrorSyncAnchorExpired));
  EXPECT_EQ(result, "-1002");
}

}  // namespace
}  // namespace droxa::testing
