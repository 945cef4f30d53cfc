#include <condition_variable>
#include <gtest/gtest.h>
#include <mutex>
#include <thread>

#include "extension/HostedExtension.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "tests/extension/ScriptedPrincipal.h"
#include "tests/support/Once.h"

namespace droxa {
namespace {

using Item = Once<std::shared_ptr<const NSFileProviderItem>, NSError>;
using Enumerator = Once<std::shared_ptr<NSFileProviderRemoteEnumerator>, NSError>;

const NSError kFailure(NSFileProviderErrorDomain, NSFileProviderErrorServerUnreachable);

class HostedExtensionTest : public testing::Test {
 protected:
  const std::shared_ptr<ScriptedPrincipal> principal = std::make_shared<ScriptedPrincipal>();
  HostedExtension hosted{principal};
};

TEST_F(HostedExtensionTest, givesItems) {
  principal->item = plainItem("d1");
  const Item item("item");
  hosted.itemForIdentifier("d1", item.completion());
  EXPECT_EQ(item.value<0>(), principal->item);
  EXPECT_FALSE(item.value<1>());
}

TEST_F(HostedExtensionTest, anErrorBesideAnItemIsNone) {
  principal->item = plainItem("d1");
  principal->failure = kFailure;
  const Item item("item");
  hosted.itemForIdentifier("d1", item.completion());
  EXPECT_TRUE(item.value<0>());
  EXPECT_FALSE(item.value<1>());
}

TEST_F(HostedExtensionTest, passesErrorsOn) {
  principal->failure = kFailure;
  const Item item("item");
  hosted.itemForIdentifier("d1", item.completion());
  EXPECT_FALSE(item.value<0>());
  EXPECT_TRUE(item.value<1>().isSameObject(kFailure));
}

TEST_F(HostedExtensionTest, neitherItemNorErrorMeansNoSuchItem) {
  const Item item("item");
  hosted.itemForIdentifier("d1", item.completion());
  EXPECT_EQ(item.value<1>(), fileProviderErrorForNonExistentItemWithIdentifier("d1"));
}

TEST_F(HostedExtensionTest, givesURLsAndIdentifiers) {
  const Once<NSURL> url("url"), noURL("no url");
  hosted.URLForItemIdentifier("d1", url.completion());
  hosted.URLForItemIdentifier("d2", noURL.completion());
  EXPECT_EQ(url.value<0>(), principal->url);
  EXPECT_FALSE(noURL.value<0>());

  const Once<std::optional<std::string>> identifier("identifier"), none("no identifier");
  hosted.identifierForItemAtURL(principal->url, identifier.completion());
  hosted.identifierForItemAtURL(NSURL(), none.completion());
  EXPECT_EQ(identifier.value<0>(), "d1");
  EXPECT_EQ(none.value<0>(), std::nullopt);
}

TEST_F(HostedExtensionTest, givesEnumeratorsThatAreInvalidatedWhenTheyAreReleased) {
  const auto inner = std::make_shared<ScriptedEnumerator>();
  principal->enumerator = inner;
  {
    const Enumerator enumerator("enumerator");
    hosted.enumeratorForContainer("i1", enumerator.completion());
    EXPECT_TRUE(enumerator.value<0>());
    EXPECT_FALSE(enumerator.value<1>());
    EXPECT_EQ(inner->invalidations, 0);
  }
  EXPECT_TRUE(eventually([&] { return inner->invalidations == 1; }));
}

TEST_F(HostedExtensionTest, withoutAnEnumeratorThereIsAnError) {
  const Enumerator missing("enumerator");
  hosted.enumeratorForContainer("i1", missing.completion());
  EXPECT_FALSE(missing.value<0>());
  EXPECT_EQ(missing.value<1>(), fileProviderErrorForNonExistentItemWithIdentifier("i1"));

  principal->failure = kFailure;
  const Enumerator failed("enumerator");
  hosted.enumeratorForContainer("i1", failed.completion());
  EXPECT_TRUE(failed.value<1>().isSameObject(kFailure));
}

TEST_F(HostedExtensionTest, aRequestThatWaitsHoldsUpNoOther) {
  std::mutex mutex;
  std::condition_variable condition;
  bool released = false;
  principal->item = plainItem("d1");
  principal->hook = [&](const std::string &identifier) {
    if (identifier != "slow") return;
    std::unique_lock<std::mutex> lock(mutex);
    condition.wait(lock, [&] { return released; });
  };
  const Item slow("slow"), quick("quick");
  std::thread waiting([&] { hosted.itemForIdentifier("slow", slow.completion()); });
  hosted.itemForIdentifier("quick", quick.completion());
  EXPECT_TRUE(quick.called());
  EXPECT_FALSE(slow.called());
  {
    const std::lock_guard<std::mutex> lock(mutex);
    released = true;
  }
  condition.notify_all();
  waiting.join();
  EXPECT_TRUE(slow.called());
}

}  // namespace
}  // namespace droxa
