#include <gtest/gtest.h>
#include <thread>

#include "platform/fileprovider/NSFileProviderManager.h"
#include "tests/support/Once.h"

namespace droxa {
namespace {

class Link final : public NSFileProviderHostLink {
 public:
  void signalEnumeratorForContainerItemIdentifier(const std::string &identifier,
                                                  NSFileProviderSignalCompletion completion) override {
    signalled.push_back(identifier);
    completion(NSError("Link", 1));
  }
  std::vector<std::string> signalled;
};

TEST(NSFileProviderManager, signalsThroughTheHostsLink) {
  NSFileProviderManager manager;
  const auto link = std::make_shared<Link>();
  manager.setHostLink(link);
  const Once<NSError> done("done");
  manager.signalEnumeratorForContainerItemIdentifier("i5", done.completion());
  EXPECT_EQ(done.value<0>(), NSError("Link", 1));
  EXPECT_EQ(link->signalled, (std::vector<std::string>{"i5"}));
}

TEST(NSFileProviderManager, completesWithAnErrorWhenNoHostIsConnected) {
  NSFileProviderManager manager;
  const Once<NSError> never("before any link");
  manager.signalEnumeratorForContainerItemIdentifier("i5", never.completion());
  EXPECT_TRUE(never.value<0>().is(NSCocoaErrorDomain, NSXPCConnectionInvalid));
  const auto link = std::make_shared<Link>();
  manager.setHostLink(link);
  manager.setHostLink(nullptr);
  EXPECT_EQ(link.use_count(), 1);
  const Once<NSError> gone("after the link has gone");
  manager.signalEnumeratorForContainerItemIdentifier("i5", gone.completion());
  EXPECT_TRUE(gone.value<0>().is(NSCocoaErrorDomain, NSXPCConnectionInvalid));
  EXPECT_TRUE(link->signalled.empty());
}

TEST(NSFileProviderManager, completesWithoutAHostOnAnotherThread) {
  NSFileProviderManager manager;
  const Once<bool> isCallers("thread");
  manager.signalEnumeratorForContainerItemIdentifier(
      "i5", [completed = isCallers.completion(), caller = std::this_thread::get_id()](const NSError &) {
        completed(std::this_thread::get_id() == caller);
      });
  EXPECT_FALSE(isCallers.value<0>());
}

TEST(NSFileProviderManager, aSignalMayGoWithoutCompletion) {
  NSFileProviderManager manager;
  manager.signalEnumeratorForContainerItemIdentifier("i5", nullptr);
}

TEST(NSFileProviderManager, theDefaultManagerIsOne) {
  EXPECT_EQ(&NSFileProviderManager::defaultManager(), &NSFileProviderManager::defaultManager());
}

}  // namespace
}  // namespace droxa
