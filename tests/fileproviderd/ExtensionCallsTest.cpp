#include <gtest/gtest.h>

#include "fileproviderd/ExtensionCalls.h"
#include "tests/fileproviderd/ScriptedExtension.h"

namespace droxa::testing {
namespace {

class ExtensionCallsTest : public ::testing::Test {
 protected:
  // What itemForIdentifier("d1") ends with: the identifier, or the error's text.
  std::string ask() {
    std::string answer = "no answer";
    calls.itemForIdentifier("d1", [&](const auto &item, const NSError &error) {
      EXPECT_EQ(answer, "no answer");
      answer = item ? item->itemIdentifier() : error.localizedDescription();
    });
    return answer;
  }

  std::shared_ptr<ScriptedExtension> extension = [] {
    auto made = std::make_shared<ScriptedExtension>();
    made->add("d1", "/r/a.txt", {});
    return made;
  }();
  std::shared_ptr<ScriptedConnecting> connecting = std::make_shared<ScriptedConnecting>(extension);
  ExtensionCalls calls{connecting};
};

TEST_F(ExtensionCallsTest, anAnswerIsPassedOnAndNoted) {
  EXPECT_EQ(ask(), "d1");
  EXPECT_EQ(connecting->answers, 1);
}

TEST_F(ExtensionCallsTest, aCallThatTheExtensionsEndCutOffIsMadeOnceMore) {
  connecting->transportFailures = 1;
  EXPECT_EQ(ask(), "d1");
  EXPECT_EQ(connecting->asked, 2);
}

TEST_F(ExtensionCallsTest, aSecondEndIsToldWithItsReason) {
  connecting->transportFailures = 2;
  EXPECT_EQ(ask(), "the extension ended before it answered: exit status 1");
  EXPECT_EQ(connecting->asked, 2);
  EXPECT_EQ(connecting->answers, 0);
}

TEST_F(ExtensionCallsTest, anExtensionThatCantBeStartedIsTold) {
  connecting->startFailure = NSError::errorWithPOSIXCode(2, "can't start it");
  EXPECT_EQ(ask(), "can't start it");
  EXPECT_EQ(connecting->asked, 1);
}

TEST_F(ExtensionCallsTest, anErrorOfTheExtensionIsntRetried) {
  extension->failure = NSError(NSFileProviderErrorDomain, NSFileProviderErrorNotAuthenticated);
  ask();
  EXPECT_EQ(connecting->asked, 1);
}

TEST_F(ExtensionCallsTest, everyOtherCallIsRetriedToo) {
  connecting->transportFailures = 1;
  calls.URLForItemIdentifier("d1", [](const NSURL &url, const NSError &error) {
    EXPECT_EQ(url.path(), "/r/a.txt");
    EXPECT_FALSE(error);
  });
  connecting->transportFailures = 1;
  calls.identifierForItemAtURL(NSURL::fileURLWithPath("/r/a.txt"),
                               [](const auto &identifier, const NSError &) { EXPECT_EQ(identifier, "d1"); });
  connecting->transportFailures = 1;
  calls.enumeratorForContainer("i1",
                               [](const auto &enumerator, const NSError &) { EXPECT_TRUE(enumerator); });
  EXPECT_EQ(connecting->asked, 6);
}

TEST_F(ExtensionCallsTest, theCallsAboutContentsAreRetriedToo) {
  const NSURL url = NSURL::fileURLWithPath("/r/a.txt");
  int answers = 0;
  const auto succeeded = [&](const NSError &error) {
    EXPECT_FALSE(error);
    ++answers;
  };
  for (const auto call : {&ExtensionCalls::stopProvidingItemAtURL, &ExtensionCalls::itemChangedAtURL,
                          &ExtensionCalls::providePlaceholderAtURL}) {
    connecting->transportFailures = 1;
    (calls.*call)(url, succeeded);
  }
  connecting->transportFailures = 1;
  calls.startProvidingItemAtURL(url, 3, [&](const auto &providing, const NSError &error) {
    EXPECT_TRUE(providing);
    succeeded(error);
  });
  connecting->transportFailures = 1;
  calls.movingItemAtURL(url, NSURL::fileURLWithPath("/r/b"),
                        [&](bool requiresProviding, const NSError &error) {
                          EXPECT_TRUE(requiresProviding);
                          succeeded(error);
                        });
  EXPECT_EQ(answers, 5);
  EXPECT_EQ(connecting->asked, 10);
  for (const char *asked : {"stop /r/a.txt", "changed /r/a.txt", "placeholder /r/a.txt", "start /r/a.txt, 3",
                            "move /r/a.txt to /r/b"})
    EXPECT_EQ(extension->asked.take(), asked);
}

}  // namespace
}  // namespace droxa::testing
