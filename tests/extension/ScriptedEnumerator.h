#pragma once

#include <atomic>
#include <functional>
#include <memory>
#include <string>
#include <utility>

#include "platform/fileprovider/NSFileProviderEnumerating.h"

namespace droxa {

// An enumerator that does with its observers what the test says, and counts its invalidations.
class ScriptedEnumerator final : public NSFileProviderEnumerator {
 public:
  using Listing = std::function<void(std::shared_ptr<NSFileProviderEnumerationObserver>, const NSData &page)>;
  using Changes = std::function<void(std::shared_ptr<NSFileProviderChangeObserver>, const NSData &anchor)>;
  using Anchor = std::function<void(NSFileProviderSyncAnchorCompletion)>;

  void enumerateItemsForObserver(std::shared_ptr<NSFileProviderEnumerationObserver> observer,
                                 const NSData &page) override {
    listing(std::move(observer), page);
  }
  bool supportsChanges() const override { return true; }
  void enumerateChangesForObserver(std::shared_ptr<NSFileProviderChangeObserver> observer,
                                   const NSData &anchor) override {
    changes(std::move(observer), anchor);
  }
  void currentSyncAnchorWithCompletionHandler(NSFileProviderSyncAnchorCompletion completion) override {
    syncAnchor(std::move(completion));
  }
  void invalidate() override { ++invalidations; }

  Listing listing;
  Changes changes;
  Anchor syncAnchor;
  std::atomic<int> invalidations{0};
};

inline std::shared_ptr<const NSFileProviderItem> plainItem(const std::string &identifier) {
  NSFileProviderItemFields fields;
  fields.itemIdentifier = identifier;
  return std::make_shared<NSFileProviderPlainItem>(fields);
}

inline std::vector<std::string> identifiersOf(const NSFileProviderItems &items) {
  std::vector<std::string> identifiers;
  for (const auto &item : items) identifiers.push_back(item->itemIdentifier());
  return identifiers;
}

}  // namespace droxa
