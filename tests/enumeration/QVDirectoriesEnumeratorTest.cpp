#include <gtest/gtest.h>

#include "enumeration/QVDirectoriesEnumerator.h"
#include "tests/enumeration/EnumerationFixture.h"
#include "tests/enumeration/ScriptedDaemon.h"

namespace droxa {
namespace {

using Words = std::vector<std::string>;

class DirectoriesEnumerator : public EnumerationTest {
 protected:
  Words callsForPage(const NSData &page) {
    listPage(*enumerator, page);
    return daemon.calls();
  }
  static Words call(const std::string &arguments) {
    return {"enumerateAllFoldersWithSortOrder(" + arguments + ", limit 200)"};
  }

  const std::shared_ptr<QVDirectoriesEnumerator> enumerator = std::make_shared<QVDirectoriesEnumerator>();
};

TEST_F(DirectoriesEnumerator, asksByNameFromTheStartWithoutAPage) {
  EXPECT_EQ(callsForPage(NSData()), call("sort 0, offset 0"));
}

TEST_F(DirectoriesEnumerator, asksFromTheStartForTheInitialPageByName) {
  EXPECT_EQ(callsForPage(NSFileProviderInitialPageSortedByName()), call("sort 0, offset 0"));
}

TEST_F(DirectoriesEnumerator, asksByDateForTheInitialPageByDate) {
  EXPECT_EQ(callsForPage(NSFileProviderInitialPageSortedByDate()), call("sort 1, offset 0"));
}

TEST_F(DirectoriesEnumerator, asksFromTheOffsetOfThePage) {
  EXPECT_EQ(callsForPage(qv_pageTokenFromSortOrder(1, 600)), call("sort 1, offset 600"));
}

TEST_F(DirectoriesEnumerator, reportsTheFoldersThenTheEnd) {
  daemon.addDocument("Folder/document");
  daemon.addFolder("Folder/Below");
  const auto observer = listPage(*enumerator, NSData());
  ASSERT_EQ(observer->calls().size(), 2u);
  const Words identifiers = observer->itemIdentifiers();
  EXPECT_EQ(std::count(identifiers.begin(), identifiers.end(), folder.asString()), 1);
  EXPECT_EQ(std::count(identifiers.begin(), identifiers.end(), daemon.identifier("Folder/Below").asString()),
            1);
  EXPECT_EQ(observer->token(), NSData());
  EXPECT_EQ(logLines(), Words{});
}

TEST_F(DirectoriesEnumerator, goesOnFromPageToPageInTheSameOrder) {
  for (int i = 0; i < 200; ++i) daemon.addFolder("Folder/" + std::to_string(i));
  const auto first = listPage(*enumerator, NSFileProviderInitialPageSortedByDate());
  EXPECT_EQ(first->items().size(), 200u);
  EXPECT_EQ(first->token(), qv_pageTokenFromSortOrder(1, 200));
  const auto second = listPage(*enumerator, first->token());
  EXPECT_GE(second->items().size(), 1u);
  EXPECT_EQ(second->token(), NSData());
}

TEST_F(DirectoriesEnumerator, handsOverTheItemsAsReceived) {
  const auto scripted = ScriptedDaemon::install();
  const auto item = live(3);
  scripted->answerListingsWith({{item, item}, 400, NSError()});
  const auto observer = listPage(*enumerator, NSData());
  EXPECT_EQ(observer->items(), (NSFileProviderItems{item, item}));
  EXPECT_EQ(observer->token(), qv_pageTokenFromSortOrder(0, 400));
}

TEST_F(DirectoriesEnumerator, logsAndTranslatesAnErrorOfTheReply) {
  const NSError error = qvc_errorLoggedOut();
  daemon.replies().failNext("enumerateAllFoldersWithSortOrder", error);
  const auto observer = listPage(*enumerator, NSData());
  EXPECT_EQ(observer->story(), Words{"failed"});
  EXPECT_TRUE(observer->error().is(NSFileProviderErrorDomain, NSFileProviderErrorNotAuthenticated));
  EXPECT_TRUE(observer->error().underlyingError().isSameObject(error));
  EXPECT_EQ(logLines(),
            Words{"error: [ERROR] there was an error when listing items: " + error.description()});
}

TEST_F(DirectoriesEnumerator, passesAConnectionErrorOnAsItIs) {
  const NSError error = qvc_errorLoggedOut();  // one that would be translated
  daemon.replies().failNextInTransport("enumerateAllFoldersWithSortOrder", error);
  const auto observer = listPage(*enumerator, NSData());
  EXPECT_EQ(observer->story(), Words{"failed"});
  EXPECT_TRUE(observer->error().isSameObject(error));
  EXPECT_EQ(logLines(), Words{});
}

TEST_F(DirectoriesEnumerator, hasNoChangeTracking) {
  EXPECT_FALSE(enumerator->supportsChanges());
  EXPECT_EQ(currentAnchor(*enumerator), NSData());
  EXPECT_TRUE(isExpired(changesSince(*enumerator, NSData::dataWithString("any"))->error()));
}

TEST_F(DirectoriesEnumerator, answersAReplyThatComesAfterInvalidation) {
  daemon.replies().hold("enumerateAllFoldersWithSortOrder");
  const auto observer = std::make_shared<RecordingEnumerationObserver>();
  enumerator->enumerateItemsForObserver(observer, NSData());
  enumerator->invalidate();
  EXPECT_FALSE(observer->answered());
  daemon.replies().release("enumerateAllFoldersWithSortOrder");
  EXPECT_EQ(observer->error(), NSError());
  EXPECT_EQ(listPage(*enumerator, NSData())->error(), NSError());
}

TEST_F(DirectoriesEnumerator, isAnsweredOnceWhenTheDaemonDiesInTheMiddle) {
  daemon.replies().hold("enumerateAllFoldersWithSortOrder");
  const auto observer = std::make_shared<RecordingEnumerationObserver>();
  enumerator->enumerateItemsForObserver(observer, NSData());
  fake.connection->breakOff(NSError(NSCocoaErrorDomain, NSXPCConnectionInterrupted));
  daemon.replies().release("enumerateAllFoldersWithSortOrder");
  EXPECT_EQ(observer->story(), Words{"failed"});
}

}  // namespace
}  // namespace droxa
