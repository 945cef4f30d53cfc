#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "platform/fileprovider/NSFileProviderExtension.h"
#include "tests/extension/ScriptedEnumerator.h"

namespace droxa {

// A principal that answers with what the test put there.
class ScriptedPrincipal final : public NSFileProviderExtension {
 public:
  NSURL URLForItemWithPersistentIdentifier(const std::string &identifier) override {
    return identifier == "d1" ? url : NSURL();
  }
  std::optional<std::string> persistentIdentifierForItemAtURL(const NSURL &asked) override {
    return asked == url ? std::optional<std::string>("d1") : std::nullopt;
  }
  std::shared_ptr<const NSFileProviderItem> itemForIdentifier(const std::string &identifier,
                                                              NSError *error) override {
    if (hook) hook(identifier);
    *error = failure;
    return item;
  }
  std::shared_ptr<NSFileProviderEnumerator> enumeratorForContainerItemIdentifier(const std::string &,
                                                                                 NSError *error) override {
    *error = failure;
    return enumerator;
  }

  const NSURL url = NSURL::fileURLWithPath("/replica/a");
  std::shared_ptr<const NSFileProviderItem> item;
  std::shared_ptr<NSFileProviderEnumerator> enumerator;
  NSError failure;
  std::function<void(const std::string &identifier)> hook;
};

}  // namespace droxa
