#pragma once

#include <functional>
#include <memory>
#include <utility>

#include "platform/fileprovider/NSFileProviderRemote.h"

namespace droxa {

// Another enumerator, of whose listing somebody else is told as well. Thread contract: the other one's; the
// observer is called before the page is given, on the same thread, and has to return at once.
class ObservedEnumerator final : public NSFileProviderRemoteEnumerator {
 public:
  using Observer = std::function<void(const NSFileProviderItems &items)>;
  ObservedEnumerator(std::shared_ptr<NSFileProviderRemoteEnumerator> enumerator, Observer observer)
      : enumerator_(std::move(enumerator)), observer_(std::move(observer)) {}

  void enumerateItems(const NSData &page, NSFileProviderPageCompletion completion) override {
    enumerator_->enumerateItems(
        page, [observer = observer_, completion = std::move(completion)](
                  const NSFileProviderItems &items, const NSData &next, const NSError &error) {
          if (!error) observer(items);
          completion(items, next, error);
        });
  }
  void enumerateChanges(const NSData &anchor, NSFileProviderChangesCompletion completion) override {
    enumerator_->enumerateChanges(anchor, std::move(completion));
  }
  void currentSyncAnchor(NSFileProviderAnchorCompletion completion) override {
    enumerator_->currentSyncAnchor(std::move(completion));
  }
  void invalidate() override { enumerator_->invalidate(); }

 private:
  const std::shared_ptr<NSFileProviderRemoteEnumerator> enumerator_;
  const Observer observer_;
};

}  // namespace droxa
