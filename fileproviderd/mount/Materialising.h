#pragma once

#include <chrono>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <sys/types.h>
#include <unordered_map>

#include "fileproviderd/Providings.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// The requests of programs that wait for a document's contents. They hold no thread: each leaves what is to
// be done when the contents are here. A request ends early when it is interrupted, when its process has gone,
// or when nothing of the document came for as long as the person has patience; the download ends with the
// last that waits for it.
// Thread contract: any thread; continuations run on the pool. lock_ guards what waits, and is never held
// during a call.
class Materialising final : public std::enable_shared_from_this<Materialising> {
 public:
  using Ticket = std::uint64_t;
  // 0: the contents are here; else an errno.
  using Continuation = std::function<void(int error)>;

  Materialising(std::shared_ptr<Providings> providings, std::chrono::milliseconds patience);

  Ticket newTicket();  // wait() follows
  // `continuation` is called exactly once. `process`: whose death ends the wait; 0: nobody's.
  void wait(Ticket ticket, const std::string &path, pid_t process, Continuation continuation);
  // May come before wait(). Nothing is called in here.
  void interrupt(Ticket ticket);
  // Ends all waits, these and later ones, with `error`.
  void stop(int error);

  std::size_t waiting() const;
  std::chrono::milliseconds patience() const { return patience_; }

 private:
  using Clock = std::chrono::steady_clock;
  struct Waiter {
    std::string path;
    std::uint64_t download = 0;
    pid_t process = 0;
    Clock::time_point until;
    Continuation continuation;
  };
  struct Download {
    std::uint64_t number = 0;
    std::shared_ptr<FPDProviding> providing;  // null until it was asked for
    std::size_t waiters = 0;
    std::int64_t completed = 0;  // bytes, when it was last asked
    bool isAsked = false;        // and hasn't answered yet
  };

  void begin(const std::string &path, std::uint64_t number);
  void ended(std::uint64_t number, const NSError &error);
  void endWait(Ticket ticket, int error);
  void look();
  void askForProgress();
  void progressed(std::uint64_t number, std::int64_t completed);
  void lookLater();

  const std::shared_ptr<Providings> providings_;
  const std::chrono::milliseconds patience_;
  mutable Mutex lock_;
  std::unordered_map<Ticket, bool> early_ GUARDED_BY(lock_);  // not waiting yet; whether it was interrupted
  std::unordered_map<Ticket, Waiter> waiters_ GUARDED_BY(lock_);
  std::map<std::string, Download> downloads_ GUARDED_BY(lock_);  // those that somebody waits for
  std::uint64_t lastDownload_ GUARDED_BY(lock_) = 0;
  Ticket lastTicket_ GUARDED_BY(lock_) = 0;
  bool isLooking_ GUARDED_BY(lock_) = false;
  int stopped_ GUARDED_BY(lock_) = 0;
};

}  // namespace droxa
