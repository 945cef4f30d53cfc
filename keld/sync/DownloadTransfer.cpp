#include "keld/sync/DownloadTransfer.h"

#include "platform/dispatch/dispatch.h"

namespace droxa::keld {

std::shared_ptr<DownloadTransfer> DownloadTransfer::of(
    std::vector<std::unique_ptr<Downloads::Interest>> interests) {
  auto transfer = std::make_shared<DownloadTransfer>();
  transfer->interests_ = std::move(interests);
  const auto state = transfer->state_;
  {
    const Lock lock(state->mutex);
    state->left = transfer->interests_.size();
  }
  for (const auto &interest : transfer->interests_)
    interest->whenEnded([state](const NSError &error) { ended(state, error); });
  return transfer;
}

void DownloadTransfer::ended(const std::shared_ptr<State> &state, const NSError &error) {
  std::vector<QVContentsErrorReply> waiters;
  NSError outcome;
  {
    const Lock lock(state->mutex);
    if (error && !state->error) state->error = error;
    if (--state->left > 0) return;
    waiters.swap(state->waiters);
    outcome = state->error;
  }
  for (const QVContentsErrorReply &reply : waiters) reply(outcome);
}

void DownloadTransfer::waitWithReply(QVContentsErrorReply reply) {
  NSError outcome;
  {
    const Lock lock(state_->mutex);
    if (state_->left > 0) {
      state_->waiters.push_back(std::move(reply));
      return;
    }
    outcome = state_->error;
  }
  reply(outcome);
}

void DownloadTransfer::getProgress(QVProgressReply reply) {
  std::uint64_t done = 0, total = 0;
  for (const auto &interest : interests_) {
    std::uint64_t own = 0, all = 0;
    interest->progress(&own, &all);
    done += own;
    total += all;
  }
  reply(done, total);
}

void DownloadTransfer::cancel() {
  for (const auto &interest : interests_) interest->cancel();
}

std::shared_ptr<QVTransferring> DownloadTransfer::remoteObjectProxyWithErrorHandler(NSXPCErrorHandler) {
  return shared_from_this();
}

}  // namespace droxa::keld
