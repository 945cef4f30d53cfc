#include "tests/fileproviderd/ScriptedExtension.h"

#include <gtest/gtest.h>

#include "platform/xpc/NSXPCConnection.h"

namespace droxa::testing {

namespace {

std::string text(const NSData &data) {
  if (!data) return "nil";
  if (data == NSFileProviderInitialPageSortedByName()) return "first";
  return {reinterpret_cast<const char *>(data.bytes().data()), data.length()};
}

NSData data(const std::string &text) {
  return text.empty() ? NSData() : NSData::dataWithString(text);
}

// A proxy whose transport fails at every call.
class FailingProxy final : public NSFileProviderExtensionProtocol {
 public:
  explicit FailingProxy(NSXPCErrorHandler handler) : handler_(std::move(handler)) {}
  void itemForIdentifier(const std::string &, NSFileProviderItemCompletion) override { fail(); }
  void URLForItemIdentifier(const std::string &, NSFileProviderURLCompletion) override { fail(); }
  void identifierForItemAtURL(const NSURL &, NSFileProviderIdentifierCompletion) override { fail(); }
  void enumeratorForContainer(const std::string &, NSFileProviderEnumeratorCompletion) override { fail(); }
  void startProvidingItemAtURL(const NSURL &, std::uint64_t, FPDProvidingCompletion) override { fail(); }
  void stopProvidingItemAtURL(const NSURL &, NSFileProviderErrorCompletion) override { fail(); }
  void itemChangedAtURL(const NSURL &, NSFileProviderErrorCompletion) override { fail(); }
  void providePlaceholderAtURL(const NSURL &, NSFileProviderErrorCompletion) override { fail(); }
  void movingItemAtURL(const NSURL &, const NSURL &, NSFileProviderMovingCompletion) override { fail(); }
  void performAction(const FPDActionRequest &, FPDActionCompletion) override { fail(); }
  void listenerEndpointForServiceName(const std::string &, const std::string &,
                                      FPDServiceCompletion) override {
    fail();
  }
  void fetchThumbnailsForItemIdentifiers(const std::vector<std::string> &, CGSize,
                                         FPDThumbnailsCompletion) override {
    fail();
  }
  void defaultContainerForBundleIdentifier(const std::optional<std::string> &,
                                           NSFileProviderItemCompletion) override {
    fail();
  }

 private:
  void fail() { handler_(connectionInterrupted()); }
  const NSXPCErrorHandler handler_;
};

}  // namespace

NSError connectionInterrupted() {
  return NSError(NSCocoaErrorDomain, NSXPCConnectionInterrupted);
}

void ScriptedEnumerator::enumerateItems(const NSData &page, NSFileProviderPageCompletion completion) {
  calls.put({"items " + text(page), {}, std::move(completion), {}});
}

void ScriptedEnumerator::enumerateChanges(const NSData &anchor, NSFileProviderChangesCompletion completion) {
  calls.put({"changes " + text(anchor), {}, {}, std::move(completion)});
}

void ScriptedEnumerator::currentSyncAnchor(NSFileProviderAnchorCompletion completion) {
  calls.put({"anchor", std::move(completion), {}, {}});
}

EnumeratorCall ScriptedEnumerator::expect(const std::string &what) {
  EnumeratorCall call = calls.take();
  EXPECT_EQ(call.what, what);
  return call;
}

void ScriptedEnumerator::answerAnchor(const std::string &anchor) {
  if (const EnumeratorCall call = expect("anchor"); call.anchor) call.anchor(data(anchor));
}

void ScriptedEnumerator::answerPage(const std::string &page, const NSFileProviderItems &items,
                                    const std::string &next) {
  if (const EnumeratorCall call = expect("items " + page); call.page) call.page(items, data(next), NSError());
}

void ScriptedEnumerator::answerChanges(const std::string &anchor, const NSFileProviderItems &updated,
                                       const std::vector<std::string> &deleted, const std::string &next,
                                       bool moreComing) {
  if (const EnumeratorCall call = expect("changes " + anchor); call.changes)
    call.changes(updated, deleted, data(next), moreComing, NSError());
}

void ScriptedEnumerator::failChanges(const std::string &anchor, const NSError &error) {
  if (const EnumeratorCall call = expect("changes " + anchor); call.changes)
    call.changes({}, {}, NSData(), false, error);
}

void ScriptedEnumerator::failPage(const std::string &page, const NSError &error) {
  if (const EnumeratorCall call = expect("items " + page); call.page) call.page({}, NSData(), error);
}

void ScriptedEnumerator::answerFirstListing(const NSFileProviderItems &items) {
  answerAnchor("A");
  answerPage("first", items);
  answerChanges("A", {}, {}, "A");
}

void ScriptedExtension::itemForIdentifier(const std::string &identifier,
                                          NSFileProviderItemCompletion completion) {
  asked.put("item " + identifier);
  const auto found = items.find(identifier);
  if (failure) {
    completion(nullptr, failure);
  } else if (found == items.end()) {
    completion(nullptr, fileProviderErrorForNonExistentItemWithIdentifier(identifier));
  } else {
    completion(std::make_shared<NSFileProviderPlainItem>(found->second), NSError());
  }
}

void ScriptedExtension::URLForItemIdentifier(const std::string &identifier,
                                             NSFileProviderURLCompletion completion) {
  asked.put("url " + identifier);
  completion(paths.contains(identifier) ? NSURL::fileURLWithPath(paths[identifier]) : NSURL());
}

void ScriptedExtension::identifierForItemAtURL(const NSURL &url,
                                               NSFileProviderIdentifierCompletion completion) {
  asked.put("identifier " + url.path());
  const auto found = identifiers.find(url.path());
  completion(found == identifiers.end() ? std::nullopt : std::optional(found->second));
}

void ScriptedExtension::enumeratorForContainer(const std::string &identifier,
                                               NSFileProviderEnumeratorCompletion completion) {
  NSError error = failure;
  if (!openFailures.empty()) {
    error = openFailures.front();
    openFailures.pop_front();
  }
  if (error) {
    opened.put(identifier + " failed");
    completion(nullptr, error);
    return;
  }
  auto enumerator = std::make_shared<ScriptedEnumerator>();
  enumerators.put(enumerator);
  opened.put(identifier);
  completion(enumerator, NSError());
}

void ScriptedExtension::startProvidingItemAtURL(const NSURL &url, std::uint64_t readingOptions,
                                                FPDProvidingCompletion completion) {
  asked.put("start " + url.path() + ", " + std::to_string(readingOptions));
  if (failure) return completion(nullptr, failure);
  auto providing = std::make_shared<ScriptedProviding>();
  providings.push_back(providing);
  completion(providing, NSError());
}

void ScriptedExtension::stopProvidingItemAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) {
  asked.put("stop " + url.path());
  completion(failure);
}

void ScriptedExtension::itemChangedAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) {
  asked.put("changed " + url.path());
  completion(failure);
}

void ScriptedExtension::providePlaceholderAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) {
  asked.put("placeholder " + url.path());
  completion(failure);
}

void ScriptedExtension::movingItemAtURL(const NSURL &url, const NSURL &destination,
                                        NSFileProviderMovingCompletion completion) {
  asked.put("move " + url.path() + " to " + destination.path());
  completion(!failure, failure);
}

void ScriptedExtension::performAction(const FPDActionRequest &request, FPDActionCompletion completion) {
  asked.put(FPDActionName(request.kind) + " " + request.identifier);
  requests.push_back(request);
  if (failure) return completion(nullptr, failure);
  auto action = std::make_shared<ScriptedAction>();
  actions.push_back(action);
  completion(action, NSError());
}

void ScriptedExtension::listenerEndpointForServiceName(const std::string &name,
                                                       const std::string &itemIdentifier,
                                                       FPDServiceCompletion completion) {
  asked.put("service " + name + " " + itemIdentifier);
  const auto found = services.find(name + " " + itemIdentifier);
  if (found == services.end()) return completion(nullptr, failure);
  completion(found->second, NSError());
}

void ScriptedExtension::fetchThumbnailsForItemIdentifiers(const std::vector<std::string> &asFor, CGSize size,
                                                          FPDThumbnailsCompletion completion) {
  std::string text;
  for (const std::string &identifier : asFor) text += " " + identifier;
  asked.put("thumbnails of" + text + ", " + std::to_string(static_cast<int>(size.width)) + " x " +
            std::to_string(static_cast<int>(size.height)));
  completion(thumbnails, thumbnails ? NSError() : failure);
}

void ScriptedExtension::defaultContainerForBundleIdentifier(
    const std::optional<std::string> &bundleIdentifier, NSFileProviderItemCompletion completion) {
  asked.put("default container of " + bundleIdentifier.value_or("nil"));
  if (!defaultContainer) return completion(nullptr, failure);
  completion(std::make_shared<NSFileProviderPlainItem>(*defaultContainer), NSError());
}

void ScriptedExtension::add(const std::string &identifier, const std::string &path,
                            const NSFileProviderItemFields &fields) {
  items[identifier] = fields;
  items[identifier].itemIdentifier = identifier;
  if (items[identifier].filename.empty()) items[identifier].filename = path.substr(path.rfind('/') + 1);
  paths[identifier] = path;
  identifiers[path] = identifier;
}

std::shared_ptr<NSFileProviderExtensionProtocol> ScriptedConnecting::extension(NSXPCErrorHandler handler,
                                                                               NSError *error) {
  ++asked;
  if (startFailure) {
    *error = startFailure;
    return nullptr;
  }
  if (transportFailures > 0) {
    --transportFailures;
    return std::make_shared<FailingProxy>(std::move(handler));
  }
  return extension_;
}

void RecordingObserver::receiveChanges(const std::vector<FPDChange> &received, std::function<void()> reply) {
  for (const FPDChange &change : received) changes.put(std::make_shared<FPDChange>(change));
  if (answersItself) {
    replies.put(std::move(reply));
  } else {
    reply();
  }
}

std::string RecordingObserver::next() {
  const auto change = changes.take();
  return change ? changeText(*change) : "nothing";
}

std::string changeText(const FPDChange &change) {
  const std::string name = change.item ? change.item->filename : std::string();
  switch (change.kind) {
    case FPDChange::Kind::added:
      return "added " + name;
    case FPDChange::Kind::changed:
      return "changed " + name;
    case FPDChange::Kind::renamed:
      return "renamed " + change.oldName + " -> " + name;
    case FPDChange::Kind::removed:
      return "removed " + change.oldName;
    case FPDChange::Kind::relisted:
      return "relisted";
  }
  return {};
}

std::shared_ptr<const NSFileProviderItem> document(int number, const std::string &name, std::uint64_t rank,
                                                   const std::string &parent) {
  NSFileProviderItemFields fields;
  fields.itemIdentifier = "d" + std::to_string(number);
  fields.parentItemIdentifier = parent;
  fields.filename = name;
  fields.changeRank = rank;
  return std::make_shared<NSFileProviderPlainItem>(fields);
}

}  // namespace droxa::testing
