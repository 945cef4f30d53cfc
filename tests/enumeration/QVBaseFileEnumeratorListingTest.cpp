#include <gtest/gtest.h>

#include "tests/enumeration/EnumerationFixture.h"
#include "tests/enumeration/ScriptedDaemon.h"

namespace droxa {
namespace {

using Words = std::vector<std::string>;

class BaseFileEnumeratorListing : public EnumerationTest {
 protected:
  void addDocuments(int count) {
    for (int i = 0; i < count; ++i) daemon.addDocument("Folder/" + std::to_string(i));
  }
  // What listing from `page` asks the daemon.
  Words callsForPage(const NSData &page) {
    listPage(*enumerator, page);
    return daemon.calls();
  }
  Words call(const std::string &arguments) const {
    return {"enumerateItemsInFolder(" + folder.asString() + ", " + arguments + ", limit 200)"};
  }

  const std::shared_ptr<OpenBaseEnumerator> enumerator = OpenBaseEnumerator::make(folder, folder.asString());
};

TEST_F(BaseFileEnumeratorListing, asksByNameFromTheStartWithoutAPage) {
  EXPECT_EQ(callsForPage(NSData()), call("sort 0, offset 0"));
}

TEST_F(BaseFileEnumeratorListing, asksByNameFromTheStartForTheInitialPageByName) {
  EXPECT_EQ(callsForPage(NSFileProviderInitialPageSortedByName()), call("sort 0, offset 0"));
}

TEST_F(BaseFileEnumeratorListing, asksByDateFromTheStartForTheInitialPageByDate) {
  EXPECT_EQ(callsForPage(NSFileProviderInitialPageSortedByDate()), call("sort 1, offset 0"));
}

TEST_F(BaseFileEnumeratorListing, asksFromTheOffsetOfThePage) {
  EXPECT_EQ(callsForPage(qv_pageTokenFromSortOrder(1, 400)), call("sort 1, offset 400"));
}

TEST_F(BaseFileEnumeratorListing, passesSortOrdersOnThatItDoesNotKnow) {
  EXPECT_EQ(callsForPage(qv_pageTokenFromSortOrder(77, 200)), call("sort 77, offset 200"));
}

TEST_F(BaseFileEnumeratorListing, readsATruncatedPageAsFarAsItGoes) {
  const std::uint8_t bytes[] = {5, 1};
  EXPECT_EQ(callsForPage(NSData::dataWithBytes(bytes)), call("sort 0, offset 261"));
}

TEST_F(BaseFileEnumeratorListing, asksForTheRootWithoutAnIdentifier) {
  const auto root = OpenBaseEnumerator::make(std::nullopt, NSFileProviderRootContainerItemIdentifier);
  EXPECT_EQ(listPage(*root, NSData())->error(), NSError());
  EXPECT_EQ(daemon.calls(), Words{"enumerateItemsInFolder(root, sort 0, offset 0, limit 200)"});
}

TEST_F(BaseFileEnumeratorListing, reportsTheItemsThenTheEnd) {
  addDocuments(3);
  const auto observer = listPage(*enumerator, NSData());
  EXPECT_EQ(observer->story(), (Words{"didEnumerateItems(3)", "finished"}));
  EXPECT_EQ(observer->token(), NSData());
}

TEST_F(BaseFileEnumeratorListing, reportsAnEmptyFolderAsNoItems) {
  EXPECT_EQ(listPage(*enumerator, NSData())->story(), (Words{"didEnumerateItems(0)", "finished"}));
}

TEST_F(BaseFileEnumeratorListing, goesOnFromPageToPageInTheSameOrder) {
  addDocuments(401);
  const auto first = listPage(*enumerator, NSFileProviderInitialPageSortedByDate());
  EXPECT_EQ(first->items().size(), 200u);
  EXPECT_EQ(first->token(), qv_pageTokenFromSortOrder(1, 200));
  const auto second = listPage(*enumerator, first->token());
  EXPECT_EQ(second->items().size(), 200u);
  const auto third = listPage(*enumerator, second->token());
  EXPECT_EQ(third->items().size(), 1u);
  EXPECT_EQ(third->token(), NSData());
}

TEST_F(BaseFileEnumeratorListing, endsAfterExactlyOneFullPage) {
  addDocuments(200);
  const auto observer = listPage(*enumerator, NSData());
  EXPECT_EQ(observer->items().size(), 200u);
  EXPECT_EQ(observer->token(), NSData());
}

TEST_F(BaseFileEnumeratorListing, goesOnAfterAPageWithoutItems) {
  const auto scripted = ScriptedDaemon::install();
  scripted->answerListingsWith({{}, 600, NSError()});
  const auto observer = listPage(*enumerator, NSData());
  EXPECT_EQ(observer->story(), (Words{"didEnumerateItems(0)", "finished"}));
  EXPECT_EQ(observer->token(), qv_pageTokenFromSortOrder(0, 600));
}

TEST_F(BaseFileEnumeratorListing, handsOverTheItemsAsReceived) {
  const auto scripted = ScriptedDaemon::install();
  const auto item = live(7);
  const auto gone = dead(8);
  scripted->answerListingsWith({{item, gone, item}, 0, NSError()});
  EXPECT_EQ(listPage(*enumerator, NSData())->items(), (NSFileProviderItems{item, gone, item}));
}

TEST_F(BaseFileEnumeratorListing, logsItsSections) {
  const QVFileObjectID document = daemon.addDocument("Folder/a", 3);
  const std::string item = LogDescription(daemon.item("Folder/a"));
  const std::uint64_t before = QVLogSectionCreate(false);
  listPage(*enumerator, NSFileProviderInitialPageSortedByName());
  const std::string outer = hexTag(before + 2);
  const std::string inner = hexTag(before + 4);
  EXPECT_EQ(logLines(), (Words{
                            "debug: [DEBUG] ┏" + outer + " listing items for " + folder.asString(),
                            "debug: [DEBUG] from page 0",
                            "debug: [DEBUG] ┣" + inner + " calling keld",
                            "debug: [DEBUG] ┳" + inner + " received next page 0 items=(" + item + ")",
                            "debug: [DEBUG] ┗" + inner + " ",
                            "debug: [DEBUG] ┗" + outer + " ",
                        }));
  EXPECT_NE(item.find(document.asString()), std::string::npos);
}

TEST_F(BaseFileEnumeratorListing, logsTheOffsetOfAPageButNoneWithoutAPage) {
  listPage(*enumerator, NSData());
  for (const std::string &line : logLines()) EXPECT_EQ(line.find("from page"), std::string::npos) << line;
  log.clear();
  listPage(*enumerator, qv_pageTokenFromSortOrder(1, 12345678901));
  EXPECT_TRUE(logged("debug: [DEBUG] from page 12345678901"));
}

TEST_F(BaseFileEnumeratorListing, logsTheRootAsNull) {
  const std::uint64_t before = QVLogSectionCreate(false);
  const auto root = OpenBaseEnumerator::make(std::nullopt, NSFileProviderRootContainerItemIdentifier);
  listPage(*root, NSData());
  EXPECT_TRUE(logged("debug: [DEBUG] ┏" + hexTag(before + 2) + " listing items for (null)"));
}

TEST_F(BaseFileEnumeratorListing, translatesAnErrorOfTheReply) {
  const NSError error = qvc_errorNoSuchItem(folder.asString());
  daemon.replies().failNext("enumerateItemsInFolder", error);
  const std::uint64_t before = QVLogSectionCreate(false);
  const auto observer = listPage(*enumerator, NSData());
  EXPECT_EQ(observer->story(), Words{"failed"});
  EXPECT_TRUE(observer->error().is(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem));
  EXPECT_TRUE(observer->error().underlyingError().isSameObject(error));
  const std::string inner = hexTag(before + 4);
  const Words lines = logLines();
  ASSERT_EQ(lines.size(), 6u);
  EXPECT_EQ(lines[2], "debug: [DEBUG] ┳" + inner + " received next page 0 items=()");
  EXPECT_EQ(lines[3], "error: [ERROR] there was an error when listing items: " + error.description());
  EXPECT_EQ(lines[4], "debug: [DEBUG] ┗" + inner + " ");
}

TEST_F(BaseFileEnumeratorListing, reportsNoItemsOfAReplyWithAnError) {
  const auto scripted = ScriptedDaemon::install();
  const NSError error("SomeDomain", 9);
  scripted->answerListingsWith({{live(1)}, 200, error});
  const auto observer = listPage(*enumerator, NSData());
  EXPECT_EQ(observer->story(), Words{"failed"});
  EXPECT_TRUE(observer->error().isSameObject(error));
}

TEST_F(BaseFileEnumeratorListing, translatesAConnectionErrorAndLeavesTheDaemonsSectionOpen) {
  const NSError error(QVTessalyErrorDomain, QVErrorLoggedOut);
  daemon.replies().failNextInTransport("enumerateItemsInFolder", error);
  const std::uint64_t before = QVLogSectionCreate(false);
  const auto observer = listPage(*enumerator, NSData());
  EXPECT_EQ(observer->story(), Words{"failed"});
  EXPECT_TRUE(observer->error().is(NSFileProviderErrorDomain, NSFileProviderErrorNotAuthenticated));
  EXPECT_TRUE(observer->error().underlyingError().isSameObject(error));
  EXPECT_TRUE(logged("debug: [DEBUG] ┗" + hexTag(before + 2) + " "));
  EXPECT_FALSE(logged("debug: [DEBUG] ┗" + hexTag(before + 4) + " "));
}

TEST_F(BaseFileEnumeratorListing, passesAConnectionErrorOnThatHasNoTranslation) {
  const NSError error(NSCocoaErrorDomain, NSXPCConnectionInterrupted);
  daemon.replies().failNextInTransport("enumerateItemsInFolder", error);
  EXPECT_TRUE(listPage(*enumerator, NSData())->error().isSameObject(error));
}

TEST_F(BaseFileEnumeratorListing, isAnsweredOnceWhenTheDaemonDiesInTheMiddle) {
  daemon.replies().hold("enumerateItemsInFolder");
  const auto observer = std::make_shared<RecordingEnumerationObserver>();
  enumerator->enumerateItemsForObserver(observer, NSData());
  EXPECT_FALSE(observer->answered());
  fake.connection->breakOff(NSError(NSCocoaErrorDomain, NSXPCConnectionInterrupted));
  daemon.replies().release("enumerateItemsInFolder");
  EXPECT_EQ(observer->story(), Words{"failed"});
}

TEST_F(BaseFileEnumeratorListing, failsWithoutACallWhenTheSetupFails) {
  const NSError error(QVTessalyErrorDomain, QVErrorNoSuchItem);
  enumerator->setup = [&](const auto &completion) { completion(error); };
  const std::uint64_t before = QVLogSectionCreate(false);
  const auto observer = listPage(*enumerator, NSData());
  EXPECT_EQ(observer->story(), Words{"failed"});
  EXPECT_TRUE(observer->error().is(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem));
  EXPECT_TRUE(observer->error().underlyingError().isSameObject(error));
  EXPECT_EQ(daemon.calls(), Words{});
  EXPECT_EQ(fake.connection->proxiesMade(), 0u);
  EXPECT_FALSE(logged("debug: [DEBUG] ┗" + hexTag(before + 4) + " "));
}

TEST_F(BaseFileEnumeratorListing, waitsForTheSetupButReturns) {
  QVBaseFileEnumerator::SetupCompletion completion;
  enumerator->setup = [&](auto given) { completion = std::move(given); };
  const std::uint64_t before = QVLogSectionCreate(false);
  const auto observer = std::make_shared<RecordingEnumerationObserver>();
  enumerator->enumerateItemsForObserver(observer, NSData());
  EXPECT_EQ(daemon.calls(), Words{});
  EXPECT_TRUE(logged("debug: [DEBUG] ┗" + hexTag(before + 2) + " "));
  completion(NSError());
  EXPECT_EQ(observer->story(), (Words{"didEnumerateItems(0)", "finished"}));
}

TEST_F(BaseFileEnumeratorListing, keepsTheEnumeratorAliveUntilTheDaemonIsAsked) {
  std::shared_ptr<OpenBaseEnumerator> other = OpenBaseEnumerator::make(folder, folder.asString());
  QVBaseFileEnumerator::SetupCompletion completion;
  other->setup = [&](auto given) { completion = std::move(given); };
  const auto observer = std::make_shared<RecordingEnumerationObserver>();
  other->enumerateItemsForObserver(observer, NSData());
  const std::weak_ptr<OpenBaseEnumerator> weak = other;
  other.reset();
  EXPECT_FALSE(weak.expired());
  completion(NSError());
  completion = nullptr;
  EXPECT_TRUE(weak.expired());
  EXPECT_EQ(observer->error(), NSError());
}

TEST_F(BaseFileEnumeratorListing, leavesTheChangesAlone) {
  const NSData anchor = currentAnchor(*enumerator);
  enumerator->addDeath("d1");
  listPage(*enumerator, NSData());
  EXPECT_EQ(enumerator->pendingCount(), 1u);
  EXPECT_EQ(currentAnchor(*enumerator), anchor);
}

TEST_F(BaseFileEnumeratorListing, isAnsweredAfterInvalidation) {
  enumerator->invalidate();
  dispatch_sync(enumerator->_queue, [] {});
  EXPECT_EQ(listPage(*enumerator, NSData())->error(), NSError());
}

TEST_F(BaseFileEnumeratorListing, setsNothingUpByItself) {
  const auto plain = QVBaseFileEnumerator::initWithFileObjectID(folder, folder.asString(), true);
  Once<NSError> completion("setup");
  plain->setupNotificationReceivingIfNeededWithCompletion(completion.completion());
  EXPECT_TRUE(completion.called());  // before it returned
  EXPECT_EQ(completion.value<0>(), NSError());
  EXPECT_EQ(listPage(*plain, NSData())->error(), NSError());
}

}  // namespace
}  // namespace droxa
