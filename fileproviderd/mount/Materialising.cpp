#include "fileproviderd/mount/Materialising.h"

#include <algorithm>
#include <cerrno>
#include <signal.h>
#include <utility>
#include <vector>

#include "fileproviderd/mount/ErrnoForError.h"
#include "platform/dispatch/dispatch.h"

namespace droxa {

namespace {

constexpr std::chrono::milliseconds kLook{500};

bool hasGone(pid_t process) {
  return process > 0 && ::kill(process, 0) != 0 && errno == ESRCH;
}

}  // namespace

Materialising::Materialising(std::shared_ptr<Providings> providings, std::chrono::milliseconds patience)
    : providings_(std::move(providings)), patience_(patience) {}

Materialising::Ticket Materialising::newTicket() {
  const Lock held(lock_);
  early_[++lastTicket_] = false;
  return lastTicket_;
}

void Materialising::wait(Ticket ticket, const std::string &path, pid_t process, Continuation continuation) {
  std::uint64_t begun = 0;
  {
    const Lock held(lock_);
    const auto early = early_.extract(ticket);
    int refused = !early.empty() && early.mapped() ? EINTR : 0;
    if (stopped_ != 0) refused = stopped_;
    if (refused != 0) {
      dispatch_async_global([continuation = std::move(continuation), refused] { continuation(refused); });
      return;
    }
    Download &download = downloads_[path];
    if (download.waiters++ == 0) begun = download.number = ++lastDownload_;
    waiters_[ticket] = {path, download.number, process, Clock::now() + patience_, std::move(continuation)};
  }
  if (begun != 0) begin(path, begun);
  lookLater();
}

void Materialising::begin(const std::string &path, std::uint64_t number) {
  const auto providing = providings_->start(NSURL::fileURLWithPath(path), 0);
  bool isWanted = false;
  {
    const Lock held(lock_);
    const auto found = downloads_.find(path);
    isWanted = found != downloads_.end() && found->second.number == number;
    if (isWanted) found->second.providing = providing;
  }
  if (!isWanted) return providing->cancel();
  providing->waitWithReply([weak = weak_from_this(), number](const NSError &error) {
    if (const auto self = weak.lock()) self->ended(number, error);
  });
}

void Materialising::ended(std::uint64_t number, const NSError &error) {
  std::vector<Ticket> tickets;
  {
    const Lock held(lock_);
    for (const auto &[ticket, waiter] : waiters_)
      if (waiter.download == number) tickets.push_back(ticket);
  }
  for (const Ticket ticket : tickets) endWait(ticket, error ? errnoForError(error) : 0);
}

void Materialising::endWait(Ticket ticket, int error) {
  Continuation continuation;
  std::shared_ptr<FPDProviding> unwanted;
  {
    const Lock held(lock_);
    const auto found = waiters_.find(ticket);
    if (found == waiters_.end()) return;
    continuation = std::move(found->second.continuation);
    const auto download = downloads_.find(found->second.path);
    if (--download->second.waiters == 0) {
      unwanted = std::move(download->second.providing);
      downloads_.erase(download);
    }
    waiters_.erase(found);
  }
  if (unwanted) unwanted->cancel();
  dispatch_async_global([continuation = std::move(continuation), error] { continuation(error); });
}

void Materialising::interrupt(Ticket ticket) {
  {
    const Lock held(lock_);
    const auto early = early_.find(ticket);
    if (early != early_.end()) early->second = true;
    if (!waiters_.contains(ticket)) return;
  }
  // The caller may hold the request's lock, so nothing is answered here.
  dispatch_async_global([self = shared_from_this(), ticket] { self->endWait(ticket, EINTR); });
}

void Materialising::lookLater() {
  {
    const Lock held(lock_);
    if (isLooking_ || waiters_.empty()) return;
    isLooking_ = true;
  }
  dispatch_after_global(std::min(kLook, patience_ / 4), [weak = weak_from_this()] {
    if (const auto self = weak.lock()) self->look();
  });
}

void Materialising::look() {
  std::vector<std::pair<Ticket, int>> ended;
  {
    const Lock held(lock_);
    isLooking_ = false;
    const auto now = Clock::now();
    for (const auto &[ticket, waiter] : waiters_) {
      if (now >= waiter.until)
        ended.emplace_back(ticket, ETIMEDOUT);
      else if (hasGone(waiter.process))
        ended.emplace_back(ticket, EINTR);
    }
  }
  for (const auto &[ticket, error] : ended) endWait(ticket, error);
  askForProgress();
  lookLater();
}

void Materialising::askForProgress() {
  std::vector<std::pair<std::uint64_t, std::shared_ptr<FPDProviding>>> asked;
  {
    const Lock held(lock_);
    for (auto &[path, download] : downloads_)
      if (download.providing && !std::exchange(download.isAsked, true))
        asked.emplace_back(download.number, download.providing);
  }
  for (const auto &[number, providing] : asked)
    providing->getProgress(
        [weak = weak_from_this(), download = number](std::int64_t completed, std::int64_t) {
          if (const auto self = weak.lock()) self->progressed(download, completed);
        });
}

void Materialising::progressed(std::uint64_t number, std::int64_t completed) {
  const Lock held(lock_);
  for (auto &[path, download] : downloads_) {
    if (download.number != number) continue;
    download.isAsked = false;
    if (completed == std::exchange(download.completed, completed)) return;
    for (auto &[ticket, waiter] : waiters_)
      if (waiter.download == number) waiter.until = Clock::now() + patience_;
  }
}

void Materialising::stop(int error) {
  std::vector<Ticket> tickets;
  {
    const Lock held(lock_);
    stopped_ = error;
    for (const auto &[ticket, waiter] : waiters_) tickets.push_back(ticket);
  }
  for (const Ticket ticket : tickets) endWait(ticket, error);
}

std::size_t Materialising::waiting() const {
  const Lock held(lock_);
  return waiters_.size();
}

}  // namespace droxa
