#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "platform/foundation/NSDate.h"
#include "platform/foundation/NSError.h"
#include "platform/foundation/NSProgress.h"
#include "platform/foundation/NSURL.h"

namespace droxa {

inline constexpr char QVPlendaCollaborationServiceName[] = "com.quorva.PlendaCollaboration";

using QVCollaborationVersionHandler =
    std::function<void(std::int64_t version, std::int64_t capabilities, const NSError &error)>;
using QVCollaborationTokenHandler = std::function<void(
    const std::optional<std::string> &providerIdentifier, const std::optional<std::string> &first,
    const std::optional<std::string> &second, const NSDate &expiry, const NSError &error)>;
using QVCollaborationErrorHandler = std::function<void(const NSError &error)>;
using QVCollaborationStringHandler =
    std::function<void(const std::optional<std::string> &text, const NSError &error)>;
using QVCollaborationURLHandler = std::function<void(const NSURL &url, const NSError &error)>;
using QVCollaborationStateHandler = std::function<void(bool isShared, const NSError &error)>;
using QVCollaborationFolderHandler =
    std::function<void(bool isShared, const std::optional<std::string> &folder, const NSError &error)>;

// What an application that works on one document together with others asks of it: the service
// QVPlendaCollaborationServiceName of the document. Any application may.
//
// A completion handler is called exactly once, on any thread and also before the call returns, unless the
// connection fails first: then the error handler of the proxy is called instead. It must not be null, but for
// fetchCollaborationTokenWithCompletionHandler. Progress: as QVSharingService's, in no units. Work goes on
// when its client has gone.
class QVFileProviderPlendaCollaboration {
 public:
  using Progress = std::shared_ptr<NSProgress>;

  virtual ~QVFileProviderPlendaCollaboration() = default;

  // Of the protocol: 1, and the bits 2, 16, 64 and 128.
  virtual void fetchVersionAndCapabilitiesWithCompletionHandler(QVCollaborationVersionHandler handler) = 0;
  // The tokens by which a collaboration service verifies that its user has the document: the document's, then
  // the share's; they expire with the last date that there is.
  virtual Progress fetchCollaborationTokenWithCompletionHandler(QVCollaborationTokenHandler handler) = 0;
  // Brings the newest contents that the cloud has here.
  virtual Progress fetchLatestRevisionWithCompletionHandler(QVCollaborationErrorHandler handler) = 0;
  // Asks the cloud anew who shares the document. Can't be cancelled.
  virtual Progress refreshSharingStateWithCompletionHandler(QVCollaborationErrorHandler handler) = 0;
  virtual void fetchFileProviderIdentifierWithCompletionHandler(QVCollaborationStringHandler handler) = 0;
  // Neither a URL nor an error: there is no other URL to share by.
  virtual void fetchURLForSharingFileWithCompletionHandler(QVCollaborationURLHandler handler) = 0;
  // Whether the document is shared by way of a folder above it. No progress.
  virtual Progress fetchFolderSharingStateWithCompletionHandler(QVCollaborationStateHandler handler) = 0;
  // The same, with what names the shared folder.
  virtual Progress fetchSharedFolderInfoWithCompletionHandler(QVCollaborationFolderHandler handler) = 0;
  // Who is signed in; QVErrorLoggedOut when nobody is.
  virtual void fetchAccountIdentifierWithCompletionHandler(QVCollaborationStringHandler handler) = 0;
};

}  // namespace droxa
