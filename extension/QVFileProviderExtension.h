#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/dispatch/dispatch.h"
#include "platform/fileprovider/FPURLOperations.h"
#include "platform/fileprovider/NSFileProviderExtension.h"
#include "platform/foundation/NSFileHandle.h"
#include "platform/foundation/NSOperationQueue.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

class QVQueryItem;

// The extension's principal class: one instance in a process, made by the framework. It answers identity
// questions (which URL, identifier, properties or enumerator belong together) and carries what the document
// operations share: queues, the downloads under way, and the persona under which it serves. It owns no
// documents and keeps nothing on disk, so that the process may be ended at any time.
//
// Failures are told by a nil result; those with an `error` (which may be null) also store an error there that
// the framework understands (NSFileProviderErrorDomain where there is a translation). Thread contract: every
// operation may be called on any thread, several at a time; those that ask the daemon block until it replies.
// Account changes arrive on the thread that posts them.
class QVFileProviderExtension final : public NSFileProviderExtension {
 private:
  struct Passkey {};

 public:
  // Class set-up: installs the persona hooks where the provider is managed, and ends the process with status
  // 1 where the replacement of this extension is enabled. The first init() runs it, once in a process.
  static void initialize();

  static std::shared_ptr<QVFileProviderExtension> init();
  explicit QVFileProviderExtension(Passkey);
  ~QVFileProviderExtension() override;
  QVFileProviderExtension(const QVFileProviderExtension &) = delete;
  QVFileProviderExtension &operator=(const QVFileProviderExtension &) = delete;

  // Whether somebody is signed in; otherwise `error` is set. Needs no daemon.
  bool _isLoggedInOrError(NSError *error) const;

  // An error of a coordinated file operation as the framework wants it: a collision names the item that is in
  // the way; every other error is given back as it is.
  NSError fileProviderErrorFromFSError(const NSError &error) const;

  // Identifier to URL. Failures are only logged: there is no URL then. `resolvingQVAliases` gives the target
  // of an alias instead of the alias; `attachPhysical` marks the URL for operations on the physical file.
  NSURL URLForItemWithPersistentIdentifier(const std::string &identifier) override;
  NSURL _URLForItemWithPersistentIdentifier(const std::string &identifier, bool resolvingQVAliases) const;
  NSURL _URLForItemWithPersistentIdentifier(const std::string &identifier, bool resolvingQVAliases,
                                            bool attachPhysical) const;

  // URL to identifier.
  std::optional<std::string> persistentIdentifierForItemAtURL(const NSURL &url) override;

  // Identifier to item.
  std::shared_ptr<const NSFileProviderItem> itemForIdentifier(const std::string &identifier,
                                                              NSError *error) override;

  // URL to item. With `forceScan`, which a just-made item needs, the daemon looks at the file first.
  std::shared_ptr<const QVQueryItem> _propertiesForNewItemAtURL(const NSURL &url, NSError *error) const;
  std::shared_ptr<const QVQueryItem> _propertiesForItemAtURL(const NSURL &url, NSError *error) const;
  std::shared_ptr<const QVQueryItem> _propertiesForItemAtURL(const NSURL &url, bool forceScan,
                                                             NSError *error) const;

  // Identifier to the enumerator of the container.
  std::shared_ptr<NSFileProviderEnumerator> enumeratorForContainerItemIdentifier(
      const std::string &identifier, NSError *error) override;

  // The services on an item, never none: the sharing operations are offered on every identifier, whatever it
  // names. `error` isn't written. May wait for the daemon.
  NSFileProviderServiceSources supportedServiceSourcesForItemIdentifier(const std::string &identifier,
                                                                        NSError *error) override;

  // Contents. A read of what is outside the synced locations, and of a file or package that is here, is
  // granted at once; else the completion tells the end of the download, of which each path has one. Stopping
  // cancels the download under way, else evicts; it does neither where a move needs the contents.
  void startProvidingItemAtURL(const NSURL &url, std::uint64_t readingOptions,
                               NSFileProviderErrorCompletion completion) override;
  void startProvidingItemAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) override;
  void stopProvidingItemAtURL(const NSURL &url) override;
  void cancelProvidingItemAtURL(const NSURL &url) override;
  std::pair<std::int64_t, std::int64_t> progressOfProvidingItemAtURL(const NSURL &url) override;
  void itemChangedAtURL(const NSURL &url) override;
  void providePlaceholderAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) override;
  void movingItemAtURL_requiresProvidingWithDestinationURL(
      const NSURL &url, const NSURL &destination, NSFileProviderMovingCompletion completion) override;

  // Something new. An import completes with neither item nor error when it was done and the new item can't be
  // described.
  void importDocumentAtURL(const NSURL &url, const std::string &parentItemIdentifier,
                           NSFileProviderItemCompletion completion) override;
  void createDirectoryWithName(const std::string &name, const std::string &parentItemIdentifier,
                               NSFileProviderItemCompletion completion) override;

  // Another name or place. The contents that a move needs are brought here first; a failure of that is told
  // as it stands.
  void renameItemWithIdentifier(const std::string &identifier, const std::string &name,
                                NSFileProviderItemCompletion completion) override;
  void reparentItemWithIdentifier(const std::string &identifier, const std::string &parentIdentifier,
                                  const std::optional<std::string> &newName,
                                  NSFileProviderItemCompletion completion) override;

  // Into the trash, out of it (to the parent; to where it was; to its container's documents folder: the first
  // that there is), and away for good. What trashing meets is told as it stands.
  void trashItemWithIdentifier(const std::string &identifier,
                               NSFileProviderItemCompletion completion) override;
  void untrashItemWithIdentifier(const std::string &identifier,
                                 const std::optional<std::string> &parentIdentifier,
                                 NSFileProviderItemCompletion completion) override;
  void deleteItemWithIdentifier(const std::string &identifier,
                                NSFileProviderErrorCompletion completion) override;
  void _trashItemAtURLWithoutCoordination(const NSURL &url, FPURLCompletion completion) const;

  // What a user notes about an item. Each completes before it returns.
  void setLastUsedDate(const NSDate &date, const std::string &identifier,
                       NSFileProviderItemCompletion completion) override;
  void setTagData(const NSData &tagData, const std::string &identifier,
                  NSFileProviderItemCompletion completion) override;
  void setFavoriteRank(const std::optional<std::uint64_t> &rank, const std::string &identifier,
                       NSFileProviderItemCompletion completion) override;

  // Thumbnails: containers' icons, and documents' as the cloud has them.
  std::shared_ptr<NSProgress> fetchThumbnailsForItemIdentifiers(
      const std::vector<std::string> &identifiers, CGSize requestedSize,
      NSFileProviderThumbnailHandler perThumbnailCompletionHandlerWithType,
      NSFileProviderErrorCompletion completionHandler) override;

  // Where an application's documents go: the folder of the first container that it is entitled to. Of no
  // application, and of the documents browser: the top-level documents folder.
  void _defaultApplicationContainerForBundleIdentifier(
      const std::optional<std::string> &bundleIdentifier,
      NSFileProviderItemCompletion completionHandler) override;

  // From the beginning to the end, a move needs the contents of the item, or of what is below it.
  void _beginForcedDownload(const std::string &identifier);
  void _endForcedDownload(const std::string &identifier);

  // What was remembered when the instance was made; nil where the provider isn't managed.
  const std::optional<std::string> &personaID() const { return _personaID; }
  const std::shared_ptr<NSFileHandle> &witness() const { return _witness; }

 private:
  void _accountDidChange();
  std::shared_ptr<NSFileProviderEnumerator> fileEnumeratorForContainer(const std::string &identifier,
                                                                       NSError *error);
  void downloadItemAtURL(const NSURL &url, std::uint64_t readingOptions, std::uint64_t section,
                         NSFileProviderErrorCompletion completion);
  void downloadEnded(const std::string &path, std::uint64_t section, const NSError &error,
                     const NSFileProviderErrorCompletion &completion);
  bool isDownloadForced(const NSURL &url);
  std::shared_ptr<NSOperation> downloadAtPath(const std::string &path);

  struct Move;
  std::shared_ptr<QVFileProviderExtension> self();
  void completeWithNewItem(const NSURL &url, const NSFileProviderItemCompletion &completion) const;
  void documentWasImported(const NSURL &newURL, const NSError &error,
                           const NSFileProviderItemCompletion &completion) const;
  void itemWasUntrashed(const NSURL &folder, const NSURL &newURL, const NSError &error,
                        const NSFileProviderItemCompletion &completion) const;
  void performMove(const std::shared_ptr<Move> &move);
  void moveAfterDownload(const std::shared_ptr<Move> &move);

  RecursiveMutex _lock;                    // the instance's own monitor
  mutable Mutex _itemsForcedDownloadLock;  // never held together with the monitor

  // The one download under way for a path: from before it is added to the queue until its completion runs.
  std::map<std::string, std::shared_ptr<NSOperation>> _downloadOperationByPath GUARDED_BY(_lock);

  // Constant after construction.
  const std::unique_ptr<NSOperationQueue> _operationQueue;
  const dispatch_queue_t _queue;

  // The items whose download a move has forced.
  std::vector<std::string> _itemsForcedDownload GUARDED_BY(_itemsForcedDownloadLock);

  // Constant after construction.
  const std::optional<std::string> _personaID;
  const std::shared_ptr<NSFileHandle> _witness;  // holds the home directory open
};

}  // namespace droxa
