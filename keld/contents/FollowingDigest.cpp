#include "keld/contents/FollowingDigest.h"

#include <algorithm>
#include <cerrno>
#include <condition_variable>
#include <string_view>
#include <unistd.h>
#include <vector>

#include "keld/contents/ContentsDigest.h"
#include "platform/dispatch/dispatch.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa::keld {

namespace {

constexpr std::uint64_t kPieceBytes = 256 * 1024;  // stays in a core's cache between reading and computing
// So much has to be there before a thread is asked for.
constexpr std::uint64_t kWorthAThread = 1 << 20;

}  // namespace

struct FollowingDigest::State {
  explicit State(int openFile) : file(openFile) {}

  const int file;
  ContentsDigest digest;     // of whoever has set isReading
  std::vector<char> buffer;  // the same
  Mutex mutex;
  std::condition_variable_any idle;
  std::uint64_t written GUARDED_BY(mutex) = 0;
  std::uint64_t done GUARDED_BY(mutex) = 0;
  int error GUARDED_BY(mutex) = 0;
  bool isReading GUARDED_BY(mutex) = false;
  bool isStopped GUARDED_BY(mutex) = false;

  // Reads on from `at`, one piece at most; an errno value.
  int readPiece(std::uint64_t *at, std::uint64_t end) {
    const auto wanted = static_cast<std::size_t>(std::min(kPieceBytes, end - *at));
    if (buffer.size() < wanted) buffer.resize(wanted);
    const ssize_t count = ::pread(file, buffer.data(), wanted, static_cast<off_t>(*at));
    if (count < 0) return errno == EINTR ? 0 : errno;
    if (count == 0) return EIO;  // it was cut
    digest.add(std::string_view(buffer.data(), static_cast<std::size_t>(count)));
    *at += static_cast<std::uint64_t>(count);
    return 0;
  }

  // Until all that is written is read, or it is told to stop.
  void read() {
    std::uint64_t at = 0, end = 0;
    {
      const Lock lock(mutex);
      at = done;
      end = written;
    }
    for (int failure = 0;;) {
      if (at < end) failure = readPiece(&at, end);
      const Lock lock(mutex);
      done = at;
      end = written;
      error = failure;
      if (at < end && failure == 0 && !isStopped) continue;
      isReading = false;
      idle.notify_all();
      return;
    }
  }
};

FollowingDigest::FollowingDigest(int file) : state_(std::make_shared<State>(file)) {}

FollowingDigest::~FollowingDigest() {
  Lock lock(state_->mutex);
  state_->isStopped = true;
  while (state_->isReading) state_->idle.wait(state_->mutex);
}

void FollowingDigest::grewTo(std::uint64_t length) {
  {
    const Lock lock(state_->mutex);
    state_->written = length;
    if (state_->isReading || state_->error != 0 || length - state_->done < kWorthAThread) return;
    state_->isReading = true;
  }
  dispatch_async_global([state = state_] { state->read(); });
}

int FollowingDigest::finish(std::string *digest) {
  {
    Lock lock(state_->mutex);
    while (state_->isReading) state_->idle.wait(state_->mutex);
    if (state_->error != 0) return state_->error;
    state_->isReading = true;
  }
  state_->read();
  const Lock lock(state_->mutex);
  if (state_->error == 0) *digest = state_->digest.finish();
  return state_->error;
}

}  // namespace droxa::keld
