#include "tessaly/QVStartDownload.h"

#include <memory>

#include "tessaly/QVContents.h"
#include "tessaly/QVDaemonConnection.h"
#include "tessaly/QVLog.h"

namespace droxa {
namespace {

// A transfer is cancelled when it is released: this one is kept by the reply to its end.
void KeepUntilEnd(const std::shared_ptr<QVTransfer> &transfer) {
  const auto ended = [transfer](const NSError &error) {
    if (error) os_log_debug(qvc_default_log(), "[DEBUG] a download that was started failed: %@", error);
  };
  transfer->remoteObjectProxyWithErrorHandler(ended)->waitWithReply(ended);
}

}  // namespace

void QVStartDownloadForItemsWithOptions(const std::vector<NSURL> &urls, std::uint64_t options,
                                        const QVDownloadStarted &started) {
  const auto connection = QVDaemonConnection::defaultConnection();
  for (const NSURL &url : urls) {
    connection
        ->remoteObjectProxyWithErrorHandler([url, started](const NSError &error) { started(url, error); })
        ->startDownloadAtURL(
            url, options, [url, started](const std::shared_ptr<QVTransfer> &transfer, const NSError &error) {
              if (!error && transfer) KeepUntilEnd(transfer);
              const bool isAnswered = error || transfer;
              started(url, isAnswered ? error : NSError(NSCocoaErrorDomain, NSXPCConnectionReplyInvalid));
            });
  }
}

}  // namespace droxa
