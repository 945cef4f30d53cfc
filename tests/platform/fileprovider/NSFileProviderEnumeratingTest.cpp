#include <gtest/gtest.h>

#include "platform/fileprovider/NSFileProviderEnumerating.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "tests/support/Once.h"

namespace droxa {
namespace {

class WithoutChanges final : public NSFileProviderEnumerator {
 public:
  void enumerateItemsForObserver(std::shared_ptr<NSFileProviderEnumerationObserver>,
                                 const NSData &) override {}
  void invalidate() override {}
};

class Observer final : public NSFileProviderChangeObserver {
 public:
  explicit Observer(std::function<void(const NSError &)> failed) : failed_(std::move(failed)) {}
  void didUpdateItems(const NSFileProviderItems &) override { ADD_FAILURE(); }
  void didDeleteItemsWithIdentifiers(const std::vector<std::string> &) override { ADD_FAILURE(); }
  void finishEnumeratingChangesUpToSyncAnchor(const NSData &, bool) override { ADD_FAILURE(); }
  void finishEnumeratingWithError(const NSError &error) override { failed_(error); }

 private:
  const std::function<void(const NSError &)> failed_;
};

TEST(NSFileProviderEnumerator, withoutChangeTrackingHasNoAnchor) {
  WithoutChanges enumerator;
  EXPECT_FALSE(enumerator.supportsChanges());
  const Once<NSData> anchor("anchor");
  enumerator.currentSyncAnchorWithCompletionHandler(anchor.completion());
  EXPECT_FALSE(anchor.value<0>());
}

TEST(NSFileProviderEnumerator, withoutChangeTrackingEveryAnchorIsExpired) {
  WithoutChanges enumerator;
  const Once<NSError> failed("failed");
  enumerator.enumerateChangesForObserver(std::make_shared<Observer>(failed.completion()),
                                         NSData::dataWithString("anchor"));
  EXPECT_TRUE(failed.value<0>().is(NSFileProviderErrorDomain, NSFileProviderErrorSyncAnchorExpired));
}

}  // namespace
}  // namespace droxa
