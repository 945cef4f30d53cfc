#pragma once

#include <memory>
#include <string>
#include <vector>

#include "keld/sync/Downloads.h"
#include "tessaly/QVContents.h"

namespace droxa::keld {

// A client's interest in one document, or in all below a folder, as it is handed to the client: released with
// it. Thread contract: any thread.
class DownloadTransfer final : public QVTransfer, public std::enable_shared_from_this<DownloadTransfer> {
 public:
  // Begins to listen for the ends of `interests`; with none, it has ended well.
  static std::shared_ptr<DownloadTransfer> of(std::vector<std::unique_ptr<Downloads::Interest>> interests);

  void waitWithReply(QVContentsErrorReply reply) override;
  void getProgress(QVProgressReply reply) override;
  void cancel() override;
  std::shared_ptr<QVTransferring> remoteObjectProxyWithErrorHandler(NSXPCErrorHandler handler) override;

 private:
  struct State {
    Mutex mutex;
    std::size_t left GUARDED_BY(mutex) = 0;
    NSError error GUARDED_BY(mutex);  // the first
    std::vector<QVContentsErrorReply> waiters GUARDED_BY(mutex);
  };
  static void ended(const std::shared_ptr<State> &state, const NSError &error);

  const std::shared_ptr<State> state_ = std::make_shared<State>();
  std::vector<std::unique_ptr<Downloads::Interest>> interests_;  // constant after construction
};

}  // namespace droxa::keld
