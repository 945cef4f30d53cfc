#include "keld/sync/ReplicaBarrier.h"

#include <atomic>
#include <cerrno>
#include <chrono>
#include <fcntl.h>
#include <filesystem>
#include <thread>
#include <unistd.h>
#include <vector>

#include "tessaly/QVContainer.h"
#include "tessaly/QVErrors.h"

namespace droxa::keld {

namespace {
constexpr std::chrono::seconds kLongestWait{30};
constexpr std::chrono::milliseconds kBetween{2};
}  // namespace

NSError WaitUntilReplicaIsSeen(const std::string &replicaPath, const ReplicaFiles::Read &read,
                               const std::function<bool()> &isGivenUp) {
  static std::atomic<std::uint64_t> last{0};
  const std::string mark = std::string(QVUbiquitousDefaultContainerID) + "/.mark-" +
                           std::to_string(::getpid()) + "-" + std::to_string(++last);
  const std::string path = replicaPath + "/" + mark;
  const int file = ::open(path.c_str(), O_CREAT | O_EXCL | O_WRONLY | O_CLOEXEC | O_NOFOLLOW, 0600);
  // On a disk that takes no file nothing else was written either.
  if (file < 0) return errno == EROFS ? NSError() : NSError::errorWithPOSIXCode(errno, path);
  ::close(file);
  const auto end = std::chrono::steady_clock::now() + kLongestWait;
  bool isSeen = false;
  NSError problem;
  while (!isSeen && !problem && std::chrono::steady_clock::now() < end) {
    problem = read([&](ItemQueries &queries) { isSeen = queries.byPathBelowReplica(mark).has_value(); });
    if (!isSeen && isGivenUp && isGivenUp())
      problem = qvc_error(QVErrorCancelled, "nobody waits for it any more");
    if (!isSeen && !problem) std::this_thread::sleep_for(kBetween);
  }
  ::unlink(path.c_str());
  if (problem || isSeen) return problem;
  return NSError::errorWithPOSIXCode(ETIMEDOUT, replicaPath + ": the changes there aren't noticed");
}

void RemoveOldMarks(const std::string &replicaPath) {
  std::error_code problem;
  const std::string folder = replicaPath + "/" + QVUbiquitousDefaultContainerID;
  std::vector<std::filesystem::path> marks;
  for (std::filesystem::directory_iterator entry(folder, problem), end; !problem && entry != end;
       entry.increment(problem))
    if (entry->path().filename().string().compare(0, 6, ".mark-") == 0) marks.push_back(entry->path());
  for (const auto &mark : marks) ::unlink(mark.c_str());
}

}  // namespace droxa::keld
