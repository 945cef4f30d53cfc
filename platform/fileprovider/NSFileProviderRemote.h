#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/fileprovider/FPDActionRequest.h"
#include "platform/fileprovider/NSFileProviderItem.h"
#include "platform/foundation/CGSize.h"
#include "platform/foundation/NSData.h"
#include "platform/foundation/NSError.h"
#include "platform/foundation/NSURL.h"
#include "platform/xpc/NSXPCListener.h"

// The protocols between the framework's daemon, the extension and the framework's clients, as they cross a
// connection. Every completion is called exactly once, on any thread, unless the call fails in transport:
// then the error handler of the proxy is called instead.

namespace droxa {

using NSFileProviderItemCompletion =
    std::function<void(const std::shared_ptr<const NSFileProviderItem> &item, const NSError &error)>;
using NSFileProviderURLCompletion = std::function<void(const NSURL &url)>;
using NSFileProviderIdentifierCompletion = std::function<void(const std::optional<std::string> &identifier)>;
using NSFileProviderPageCompletion =
    std::function<void(const NSFileProviderItems &items, const NSData &nextPage, const NSError &error)>;
using NSFileProviderChangesCompletion =
    std::function<void(const NSFileProviderItems &updated, const std::vector<std::string> &deleted,
                       const NSData &anchor, bool moreComing, const NSError &error)>;
using NSFileProviderAnchorCompletion = std::function<void(const NSData &anchor)>;
using NSFileProviderErrorCompletion = std::function<void(const NSError &error)>;
using NSFileProviderMovingCompletion = std::function<void(bool requiresProviding, const NSError &error)>;

// An enumerator of another process. Releasing the last reference to a received one releases the real one.
// A received one has no proxy and no error handler of its own: a failure of the transport is given to the
// completion itself, without items and with the transport's error (NSCocoaErrorDomain); currentSyncAnchor
// then gives nil.
class NSFileProviderRemoteEnumerator {
 public:
  virtual ~NSFileProviderRemoteEnumerator() = default;
  virtual void enumerateItems(const NSData &page, NSFileProviderPageCompletion completion) = 0;
  virtual void enumerateChanges(const NSData &anchor, NSFileProviderChangesCompletion completion) = 0;
  virtual void currentSyncAnchor(NSFileProviderAnchorCompletion completion) = 0;  // nil: no change tracking
  virtual void invalidate() = 0;
};

using NSFileProviderEnumeratorCompletion = std::function<void(
    const std::shared_ptr<NSFileProviderRemoteEnumerator> &enumerator, const NSError &error)>;

// Units of the work's own choice, bytes where contents are moved; a total of -1: not known yet.
using FPDProgressCompletion = std::function<void(std::int64_t completed, std::int64_t total)>;

// Contents that are being made available to a reader. Cancelling it, or releasing the last reference before
// it has ended, ends the download when nobody else waits for it; what is here already stays. A received one
// makes proxies (NSXPCProxyWithErrorHandler).
class FPDProviding {
 public:
  virtual ~FPDProviding() = default;
  // Replies when it has ended: nil when the contents are here.
  virtual void waitWithReply(NSFileProviderErrorCompletion completion) = 0;
  // 0 of -1 while nothing is known.
  virtual void getProgress(FPDProgressCompletion completion) { completion(0, -1); }
  virtual void cancel() = 0;
};

using FPDProvidingCompletion =
    std::function<void(const std::shared_ptr<FPDProviding> &providing, const NSError &error)>;
using FPDItemProvidingCompletion = std::function<void(const std::shared_ptr<FPDProviding> &providing,
                                                      const NSURL &url, const NSError &error)>;

// A change that somebody wants made to an item. It begins when it is first waited for, so that one which
// nobody received was never made. Cancelling it, or releasing the last reference before it has ended, stops
// what can be stopped; whether it was too late, only the reply tells. A received one makes proxies
// (NSXPCProxyWithErrorHandler).
class FPDAction {
 public:
  virtual ~FPDAction() = default;
  // Replies when it has ended, with the item as it is now. Neither item nor error: it was done, and nobody
  // can tell what the item is (an import), or there is none any more (a deletion).
  virtual void waitWithReply(NSFileProviderItemCompletion completion) = 0;
  // 0 of -1 while nothing is known.
  virtual void getProgress(FPDProgressCompletion completion) = 0;
  // Ends it with NSUserCancelledError (NSCocoaErrorDomain), unless it was too late.
  virtual void cancel() = 0;
};

// Without an action there is an error: what FPDActionRequestError says of the request, or why the extension
// can't be reached.
using FPDActionCompletion =
    std::function<void(const std::shared_ptr<FPDAction> &action, const NSError &error)>;

// A service on an item, as whoever asked for it holds it: clients connect to its endpoint, straight to the
// process that offers it. Its listener takes connections for as long as this is held, here or by whoever it
// was passed on to: hold it until the first reply over the connection has come. Accepted connections don't
// need it any more.
class FPDService {
 public:
  virtual ~FPDService() = default;
  virtual NSXPCListenerEndpoint endpoint() const = 0;
};

// Without a service there is an error: NSCocoaErrorDomain NSFeatureUnsupportedError when the item has no
// service of that name.
using FPDServiceCompletion =
    std::function<void(const std::shared_ptr<FPDService> &service, const NSError &error)>;

// What one item was answered: its picture, or none; what kind of picture it is, where that isn't a plain one;
// and why there is none, which is nil also where there just isn't one.
struct FPDThumbnail {
  std::string identifier;
  NSData imageData;
  std::optional<std::string> contentType;
  NSError error;
};

// Those that came since the last reply; at least one, unless they are the last ones, which come with the
// outcome of the whole.
using FPDThumbnailsReply =
    std::function<void(const std::vector<FPDThumbnail> &thumbnails, bool isLast, const NSError &error)>;

// Thumbnails that are being fetched. It begins when the next ones are first asked for. Each item is told at
// most once; to clients of the host exactly once. Cancelling it, or releasing the last reference, ends what
// can be ended. A received one makes proxies (NSXPCProxyWithErrorHandler).
class FPDThumbnails {
 public:
  virtual ~FPDThumbnails() = default;
  // Asked for again when it has replied, and no more after the last ones.
  virtual void nextWithReply(FPDThumbnailsReply reply) = 0;
  virtual void getProgress(FPDProgressCompletion completion) = 0;  // items
  // Ends it with NSUserCancelledError (NSCocoaErrorDomain), unless it was too late.
  virtual void cancel() = 0;
};

using FPDThumbnailsCompletion =
    std::function<void(const std::shared_ptr<FPDThumbnails> &thumbnails, const NSError &error)>;

// What the extension's process exports to the host.
class NSFileProviderExtensionProtocol {
 public:
  virtual ~NSFileProviderExtensionProtocol() = default;
  virtual void itemForIdentifier(const std::string &identifier, NSFileProviderItemCompletion completion) = 0;
  virtual void URLForItemIdentifier(const std::string &identifier,
                                    NSFileProviderURLCompletion completion) = 0;
  virtual void identifierForItemAtURL(const NSURL &url, NSFileProviderIdentifierCompletion completion) = 0;
  virtual void enumeratorForContainer(const std::string &identifier,
                                      NSFileProviderEnumeratorCompletion completion) = 0;

  // The reading options are those of the reader's file coordination.
  virtual void startProvidingItemAtURL(const NSURL &url, std::uint64_t readingOptions,
                                       FPDProvidingCompletion completion) = 0;
  // Ends what is being provided at `url`, whoever asked for it; where nothing is, lets go of the contents.
  virtual void stopProvidingItemAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) = 0;
  virtual void itemChangedAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) = 0;
  virtual void providePlaceholderAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) = 0;
  virtual void movingItemAtURL(const NSURL &url, const NSURL &destination,
                               NSFileProviderMovingCompletion completion) = 0;

  virtual void performAction(const FPDActionRequest &request, FPDActionCompletion completion) = 0;

  virtual void listenerEndpointForServiceName(const std::string &name, const std::string &itemIdentifier,
                                              FPDServiceCompletion completion) = 0;

  // The size is in points.
  virtual void fetchThumbnailsForItemIdentifiers(const std::vector<std::string> &identifiers, CGSize size,
                                                 FPDThumbnailsCompletion completion) = 0;
  virtual void defaultContainerForBundleIdentifier(const std::optional<std::string> &bundleIdentifier,
                                                   NSFileProviderItemCompletion completion) = 0;
};

// What the host exports to the extension's process.
class NSFileProviderHostProtocol {
 public:
  virtual ~NSFileProviderHostProtocol() = default;
  virtual void signalEnumerator(const std::string &containerIdentifier,
                                NSFileProviderErrorCompletion completion) = 0;
};

// One change of a watched container, as the host saw it against what it knew before.
struct FPDChange {
  enum class Kind : std::uint8_t { added, changed, renamed, removed, relisted };
  Kind kind = Kind::changed;
  std::string identifier;
  std::optional<NSFileProviderItemFields> item;  // as it is now; nullopt for a removed one and for relisted
  std::string oldName;                           // renamed: before; removed: the last known one, may be empty
};

class FPDWatchObserver {
 public:
  virtual ~FPDWatchObserver() = default;
  // The next batch comes after the reply; when the transport fails it is not called, and no more batches
  // come.
  virtual void receiveChanges(const std::vector<FPDChange> &changes, std::function<void()> reply) = 0;
};

// A watch lives until it is released or stopped; the end of a client's connection releases it.
class FPDWatch {
 public:
  virtual ~FPDWatch() = default;
  virtual void stop() = 0;
};

struct FPDStatus {
  std::uint32_t processIdentifier = 0;
  std::int64_t startedNanoseconds = 0;           // since 1970
  std::uint32_t extensionProcessIdentifier = 0;  // 0: not running
  std::int64_t extensionStartedNanoseconds = 0;
  std::uint64_t extensionLaunches = 0;  // since the host started
  std::uint64_t cachedItems = 0;
  std::uint64_t followedContainers = 0;  // with an enumerator kept open for their changes
  std::uint64_t watchers = 0;
  std::uint64_t signals = 0;     // received since the host started
  std::string lastExtensionEnd;  // why the extension last ended, "" if it never did
  std::string mountPoint;        // where the drive is mounted, "" if it isn't
  std::string mountProblem;      // why it isn't though it is to be, "" otherwise
};

using FPDStatusCompletion = std::function<void(const FPDStatus &status)>;
using FPDMountCompletion = std::function<void(const std::string &mountPoint, const NSError &error)>;
using FPDWatchCompletion = std::function<void(const std::shared_ptr<FPDWatch> &watch, const NSError &error)>;

inline constexpr std::size_t FPDMostThumbnailsAtOnce = 10000;

// What the host exports to its clients (the droxa command).
class FPDControlProtocol {
 public:
  virtual ~FPDControlProtocol() = default;
  virtual void getStatus(FPDStatusCompletion completion) = 0;
  virtual void itemForIdentifier(const std::string &identifier, NSFileProviderItemCompletion completion) = 0;
  // `path` is of the drive ("Documents/a.txt", "/" is the root) or an absolute path inside the replica.
  // NSFileProviderErrorNoSuchItem when there is nothing.
  virtual void itemAtPath(const std::string &path, NSFileProviderItemCompletion completion) = 0;
  virtual void URLForItemIdentifier(const std::string &identifier,
                                    NSFileProviderURLCompletion completion) = 0;
  virtual void identifierForItemAtURL(const NSURL &url, NSFileProviderIdentifierCompletion completion) = 0;
  virtual void enumeratorForContainer(const std::string &identifier,
                                      NSFileProviderEnumeratorCompletion completion) = 0;
  virtual void watchContainer(const std::string &identifier, std::shared_ptr<FPDWatchObserver> observer,
                              FPDWatchCompletion completion) = 0;

  // Brings the contents of an item here for a reader, who then reads them at the URL. Readers of one document
  // share a download; it ends with the last of them, a client that goes away included.
  virtual void startProvidingItemWithIdentifier(const std::string &identifier, std::uint64_t readingOptions,
                                                FPDItemProvidingCompletion completion) = 0;
  virtual void startProvidingItemAtPath(const std::string &path, std::uint64_t readingOptions,
                                        FPDItemProvidingCompletion completion) = 0;
  // As the extension's.
  virtual void stopProvidingItemAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) = 0;
  virtual void movingItemAtURL(const NSURL &url, const NSURL &destination,
                               NSFileProviderMovingCompletion completion) = 0;

  // The host has the extension do it, once. When the extension ends in the middle, so does the action, with
  // NSFileProviderErrorServerUnreachable: nobody knows then whether it was done.
  virtual void performAction(const FPDActionRequest &request, FPDActionCompletion completion) = 0;

  // NSPOSIXErrorDomain EMFILE for a client that holds too many.
  virtual void listenerEndpointForServiceName(const std::string &name, const std::string &itemIdentifier,
                                              FPDServiceCompletion completion) = 0;

  // Every item is answered, and once, however often it is named and whatever becomes of the extension: those
  // that were lost with the error of the whole. NSPOSIXErrorDomain E2BIG for more than
  // FPDMostThumbnailsAtOnce.
  virtual void fetchThumbnailsForItemIdentifiers(const std::vector<std::string> &identifiers, CGSize size,
                                                 FPDThumbnailsCompletion completion) = 0;
  // The folder in which an application's documents go, made where it is missing; nullopt: the top-level
  // documents folder, the one that is there already where there is one.
  virtual void defaultContainerForBundleIdentifier(const std::optional<std::string> &bundleIdentifier,
                                                   NSFileProviderItemCompletion completion) = 0;
  // Puts the thumbnails of the documents in the container that aren't here into the cache that the desktop's
  // programs share, where they aren't yet; completes when it is done, however long that takes.
  virtual void fillDesktopThumbnailsForContainer(const std::string &identifier,
                                                 NSFileProviderErrorCompletion completion) = 0;

  // Shows the drive as a folder: `path` is absolute, "" where it is mounted by default. One that is mounted
  // elsewhere moves. NSPOSIXErrorDomain ENODEV, with words, when it can't be.
  virtual void mountAtPath(const std::string &path, FPDMountCompletion completion) = 0;
  // Not mounted isn't an error.
  virtual void unmount(NSFileProviderErrorCompletion completion) = 0;
};

}  // namespace droxa
