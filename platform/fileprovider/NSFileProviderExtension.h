#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/fileprovider/NSFileProviderEnumerating.h"
#include "platform/fileprovider/NSFileProviderServiceSource.h"
#include "platform/foundation/CGSize.h"
#include "platform/foundation/NSData.h"
#include "platform/foundation/NSDate.h"
#include "platform/foundation/NSError.h"
#include "platform/foundation/NSObject.h"
#include "platform/foundation/NSProgress.h"
#include "platform/foundation/NSURL.h"

namespace droxa {

using NSFileProviderItemCompletion =
    std::function<void(const std::shared_ptr<const NSFileProviderItem> &item, const NSError &error)>;
using NSFileProviderErrorCompletion = std::function<void(const NSError &error)>;
using NSFileProviderServiceSources = std::vector<std::shared_ptr<NSFileProviderServiceSource>>;
// Told of one item's thumbnail: its bytes, or none; what kind of picture it is, where that isn't a plain one;
// and why there is none, which is nil also where there just isn't one.
using NSFileProviderThumbnailHandler =
    std::function<void(const std::string &identifier, const NSData &imageData,
                       const std::optional<std::string> &contentType, const NSError &error)>;
using NSFileProviderMovingCompletion = std::function<void(bool requiresProviding, const NSError &error)>;

// The extension protocol: what the framework asks a file provider.
// Thread contract: the framework calls every operation on threads of its own, several at a time; each may
// block.
class NSFileProviderExtension : public NSObject,
                                public std::enable_shared_from_this<NSFileProviderExtension> {
 public:
  // The URL at which the item's contents are; nil when there is no such item.
  virtual NSURL URLForItemWithPersistentIdentifier(const std::string &identifier) = 0;
  // The identifier of the item at `url`; nullopt when there is none.
  virtual std::optional<std::string> persistentIdentifierForItemAtURL(const NSURL &url) = 0;
  // The item, or null with `error` (may be null) set.
  virtual std::shared_ptr<const NSFileProviderItem> itemForIdentifier(const std::string &identifier,
                                                                      NSError *error) = 0;
  // The enumerator, or null with `error` (may be null) set.
  virtual std::shared_ptr<NSFileProviderEnumerator> enumeratorForContainerItemIdentifier(
      const std::string &identifier, NSError *error) = 0;

  // The services that are offered on the item; none with `error` (may be null) set.
  virtual NSFileProviderServiceSources supportedServiceSourcesForItemIdentifier(const std::string &identifier,
                                                                                NSError *error) = 0;

  // Each completion below is called exactly once, on any thread, also before the call returns.
  //
  // Makes the contents at `url` available to a reader: nil when they are. The reading options are those of
  // the reader's file coordination; without any, the second form.
  virtual void startProvidingItemAtURL(const NSURL &url, std::uint64_t readingOptions,
                                       NSFileProviderErrorCompletion completion) = 0;
  virtual void startProvidingItemAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) = 0;
  // Nobody needs the contents any more: ends the providing under way, which then completes with an error;
  // where none is, lets go of the contents.
  virtual void stopProvidingItemAtURL(const NSURL &url) = 0;
  // The first half of that alone: whoever waited no longer does, which is no reason to let go of contents
  // that have come in between.
  virtual void cancelProvidingItemAtURL(const NSURL &url) = 0;
  // How many bytes of what is being provided at `url` are here, and how many it has; 0 of -1 where nothing is
  // known. May wait for whoever knows.
  virtual std::pair<std::int64_t, std::int64_t> progressOfProvidingItemAtURL(const NSURL & /*url*/) {
    return {0, -1};
  }
  virtual void itemChangedAtURL(const NSURL &url) = 0;
  virtual void providePlaceholderAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) = 0;
  // Whether the move needs the contents first.
  virtual void movingItemAtURL_requiresProvidingWithDestinationURL(
      const NSURL &url, const NSURL &destination, NSFileProviderMovingCompletion completion) = 0;

  // Changes. Each completes with the item as it is now, or with an error. What can take long reports to the
  // progress that is current on the calling thread, and stops when that is cancelled.
  //
  // Copies a document that is elsewhere into a folder.
  virtual void importDocumentAtURL(const NSURL &url, const std::string &parentItemIdentifier,
                                   NSFileProviderItemCompletion completion) = 0;
  virtual void createDirectoryWithName(const std::string &name, const std::string &parentItemIdentifier,
                                       NSFileProviderItemCompletion completion) = 0;
  virtual void renameItemWithIdentifier(const std::string &identifier, const std::string &name,
                                        NSFileProviderItemCompletion completion) = 0;
  // Without a new name it keeps its own.
  virtual void reparentItemWithIdentifier(const std::string &identifier, const std::string &parentIdentifier,
                                          const std::optional<std::string> &newName,
                                          NSFileProviderItemCompletion completion) = 0;
  virtual void trashItemWithIdentifier(const std::string &identifier,
                                       NSFileProviderItemCompletion completion) = 0;
  // Without a parent: to where it was before it was trashed.
  virtual void untrashItemWithIdentifier(const std::string &identifier,
                                         const std::optional<std::string> &parentIdentifier,
                                         NSFileProviderItemCompletion completion) = 0;
  virtual void deleteItemWithIdentifier(const std::string &identifier,
                                        NSFileProviderErrorCompletion completion) = 0;
  // nil, or no rank, removes what was set.
  virtual void setLastUsedDate(const NSDate &date, const std::string &identifier,
                               NSFileProviderItemCompletion completion) = 0;
  virtual void setTagData(const NSData &tagData, const std::string &identifier,
                          NSFileProviderItemCompletion completion) = 0;
  virtual void setFavoriteRank(const std::optional<std::uint64_t> &rank, const std::string &identifier,
                               NSFileProviderItemCompletion completion) = 0;

  // Thumbnails of about that size, in points. The handler is called once for each item, one call at a time,
  // on any thread; not for those that were lost with the error that the completion then gets. The progress is
  // cancellable once anything is left to be cancelled.
  virtual std::shared_ptr<NSProgress> fetchThumbnailsForItemIdentifiers(
      const std::vector<std::string> &identifiers, CGSize requestedSize,
      NSFileProviderThumbnailHandler perThumbnailCompletionHandlerWithType,
      NSFileProviderErrorCompletion completionHandler) = 0;

  // The folder in which an application's documents go unless a person says otherwise; made where it is
  // missing. Without an application: the one of everybody's documents.
  virtual void _defaultApplicationContainerForBundleIdentifier(
      const std::optional<std::string> &bundleIdentifier, NSFileProviderItemCompletion completionHandler) = 0;
};

}  // namespace droxa
