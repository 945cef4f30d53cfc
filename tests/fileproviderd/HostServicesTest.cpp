#include <gtest/gtest.h>
#include <thread>

#include "fileproviderd/HostServices.h"
#include "tests/fileproviderd/ScriptedExtension.h"

namespace droxa::testing {
namespace {

class HostServicesTest : public ::testing::Test {
 protected:
  std::shared_ptr<ScriptedExtension> extension = std::make_shared<ScriptedExtension>();
  std::shared_ptr<ExtensionCalls> calls =
      std::make_shared<ExtensionCalls>(std::make_shared<ScriptedConnecting>(extension));
  std::shared_ptr<FollowedContainers> followed = std::make_shared<FollowedContainers>(calls);
  std::shared_ptr<OpenListings> listings = std::make_shared<OpenListings>();
  std::shared_ptr<ControlService> control =
      std::make_shared<ControlService>(calls, followed, listings, "/r", [] {
        FPDStatus status;
        status.processIdentifier = 7;
        return status;
      });
};

TEST_F(HostServicesTest, aSignalIsCountedAndAnswered) {
  HostSignalReceiver receiver(followed, listings);
  int answers = 0;
  receiver.signalEnumerator("i1", [&](const NSError &error) {
    EXPECT_FALSE(error);
    ++answers;
  });
  EXPECT_EQ(answers, 1);
  EXPECT_EQ(receiver.signals(), 1U);
}

TEST_F(HostServicesTest, aSignalReachesTheListingsOfItsContainer) {
  HostSignalReceiver receiver(followed, listings);
  std::shared_ptr<NSFileProviderRemoteEnumerator> listing;
  control->enumeratorForContainer("i1",
                                  [&](const auto &enumerator, const NSError &) { listing = enumerator; });
  const auto asked = extension->enumerators.take();
  ASSERT_TRUE(listing && asked);
  std::vector<std::string> pages;
  const auto ask = [&](const std::string &page) {
    listing->enumerateItems(NSData::dataWithString(page),
                            [&](const auto &items, const NSData &, const NSError &) {
                              pages.push_back(std::to_string(items.size()));
                            });
  };
  ask("p");
  asked->answerPage("p", {}, "q");
  asked->answerPage("q", {document(1, "old")});
  receiver.signalEnumerator("another", [](const NSError &) {});
  ask("q");
  ask("p");
  asked->answerPage("p", {}, "q");
  asked->answerPage("q", {document(1, "old")});
  receiver.signalEnumerator("i1", [](const NSError &) {});
  ask("q");
  asked->answerPage("q", {document(1, "new"), document(2, "newer")});
  EXPECT_EQ(pages, (std::vector<std::string>{"0", "1", "0", "2"}));
}

TEST_F(HostServicesTest, theStatusHasTheProcessAndTheCounts) {
  control->getStatus([](const FPDStatus &status) {
    EXPECT_EQ(status.processIdentifier, 7U);
    EXPECT_EQ(status.followedContainers, 0U);
  });
}

TEST_F(HostServicesTest, aRootThatTheExtensionDoesntFindIsToldAsUnreachable) {
  const std::string root = NSFileProviderRootContainerItemIdentifier;
  const NSError missing(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem);
  control->itemForIdentifier(root, [](const auto &item, const NSError &error) {
    EXPECT_FALSE(item);
    EXPECT_EQ(error.code(), NSFileProviderErrorServerUnreachable);
  });
  extension->failure = missing;
  control->enumeratorForContainer(root, [](const auto &, const NSError &error) {
    EXPECT_EQ(error.code(), NSFileProviderErrorServerUnreachable);
  });
  control->enumeratorForContainer("i5",
                                  [&](const auto &, const NSError &error) { EXPECT_EQ(error, missing); });
}

TEST_F(HostServicesTest, itemsAreAlwaysAskedOfTheExtension) {
  extension->add("d1", "/r/a.txt", {});
  for (int time = 0; time < 2; ++time)
    control->itemForIdentifier("d1", [](const auto &item, const NSError &) { EXPECT_TRUE(item); });
  EXPECT_EQ(extension->asked.size(), 2U);
}

TEST_F(HostServicesTest, pathsAreLookedUpOffTheCallingThread) {
  const auto caller = std::this_thread::get_id();
  Arrivals<std::string> results;
  control->itemAtPath("a.txt", [&](const auto &, const NSError &error) {
    results.put(std::this_thread::get_id() == caller ? "same thread" : std::to_string(error.code()));
  });
  EXPECT_EQ(results.take(), std::to_string(NSFileProviderErrorServerUnreachable));
}

TEST_F(HostServicesTest, urlsAndIdentifiersAreRelayed) {
  extension->add("d1", "/r/a.txt", {});
  control->URLForItemIdentifier("d1", [](const NSURL &url) { EXPECT_EQ(url.path(), "/r/a.txt"); });
  control->identifierForItemAtURL(NSURL::fileURLWithPath("/r/a.txt"),
                                  [](const auto &identifier) { EXPECT_EQ(identifier, "d1"); });
  control->URLForItemIdentifier("d2", [](const NSURL &url) { EXPECT_FALSE(url); });
}

}  // namespace
}  // namespace droxa::testing
