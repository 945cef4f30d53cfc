#include "keld/thumbnails/maker/Serving.h"

#include <array>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstring>
#include <fcntl.h>
#include <new>
#include <optional>
#include <poll.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

#include "keld/thumbnails/maker/Sandbox.h"

namespace droxa::keld {

namespace {

constexpr int kNiceness = 10;
constexpr int kContentsOfCommand = 3;  // the descriptor that a command reads from

struct Received {
  MakerRequest request;
  std::string words;
  int contents = -1, output = -1;
};

void closeAll(const Received &received) {
  if (received.contents >= 0) ::close(received.contents);
  if (received.output >= 0) ::close(received.output);
}

// nullopt: keld has gone, or sent what no keld of this build sends.
std::optional<Received> receive(int socket) {
  std::vector<char> packet(kLongestRequest);
  alignas(cmsghdr) std::array<char, CMSG_SPACE(2 * sizeof(int))> control{};
  iovec bytes{packet.data(), packet.size()};
  msghdr message{};
  message.msg_iov = &bytes;
  message.msg_iovlen = 1;
  message.msg_control = control.data();
  message.msg_controllen = control.size();
  ssize_t count = 0;
  do count = ::recvmsg(socket, &message, MSG_CMSG_CLOEXEC);
  while (count < 0 && errno == EINTR);
  const cmsghdr *header = CMSG_FIRSTHDR(&message);
  if (count < static_cast<ssize_t>(sizeof(MakerRequest)) || !header || header->cmsg_type != SCM_RIGHTS ||
      header->cmsg_len != CMSG_LEN(2 * sizeof(int)))
    return std::nullopt;
  Received received;
  std::memcpy(&received.request, packet.data(), sizeof received.request);
  received.words.assign(packet.data() + sizeof received.request,
                        static_cast<std::size_t>(count) - sizeof received.request);
  std::array<int, 2> descriptors{};
  std::memcpy(descriptors.data(), CMSG_DATA(header), sizeof descriptors);
  received.contents = descriptors[0];
  received.output = descriptors[1];
  if (received.request.version == kMakerVersion) return received;
  closeAll(received);
  return std::nullopt;
}

bool writeAll(int descriptor, const char *bytes, std::size_t size) {
  while (size > 0) {
    const ssize_t count = ::write(descriptor, bytes, size);
    if (count < 0 && errno == EINTR) continue;
    if (count <= 0) return false;
    bytes += count;
    size -= static_cast<std::size_t>(count);
  }
  return true;
}

int answer(int output, char mark, const std::string &text) {
  return writeAll(output, &mark, 1) && writeAll(output, text.data(), text.size()) ? 0 : 1;
}

// Whatever a program that it becomes prints is the thumbnail.
[[noreturn]] void becomeCommand(const Received &job) {
  std::vector<char *> words;
  std::string all = job.words;
  for (std::size_t begin = 0; begin < all.size();) {
    words.push_back(&all[begin]);
    begin = all.find('\0', begin);
    if (begin == std::string::npos) break;
    ++begin;
  }
  words.push_back(nullptr);
  ::dup2(job.output, STDOUT_FILENO);
  ::dup2(job.contents, kContentsOfCommand);
  ::syscall(SYS_close_range, kContentsOfCommand + 1, ~0U, 0);
  if (words[0]) ::execv(words[0], words.data());
  _exit(126);
}

[[noreturn]] void runJob(const Received &job, const Sandbox &sandbox, const Maker &maker, pid_t parent) {
  ::prctl(PR_SET_PDEATHSIG, SIGKILL);
  if (::getppid() != parent) _exit(1);  // it died before that
  const int nothing = ::open("/dev/null", O_RDWR | O_CLOEXEC);
  for (const int standard : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) ::dup2(nothing, standard);
  if (!Sandbox::applyLimits(job.request.limits)) _exit(1);
  if (job.request.kind == MakerKind::external) becomeCommand(job);
  if (!sandbox.confine()) _exit(1);
  int status = 1;
  try {
    const MakerJob made{job.request.kind, job.request.limits, job.contents, job.output};
    status = answer(job.output, kMadeMark, maker(made));
  } catch (const std::bad_alloc &) {
    status = answer(job.output, kRefusedMark, "it needs more memory than a thumbnail may");
  } catch (const std::exception &error) {
    status = answer(job.output, kRefusedMark, error.what());
  }
  _exit(status);
}

// Until the process ends, its time is over, or keld goes, which ends it, too.
MakerReply waitForJob(pid_t process, int socket, std::uint32_t wallMilliseconds) {
  using Clock = std::chrono::steady_clock;
  const auto until = Clock::now() + std::chrono::milliseconds(wallMilliseconds);
  const int ended = static_cast<int>(::syscall(SYS_pidfd_open, process, 0));
  MakerReply reply;
  for (;;) {
    const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(until - Clock::now()).count();
    std::array<pollfd, 2> waits{{{ended, POLLIN, 0}, {socket, POLLIN, 0}}};
    if (left > 0 && ended >= 0 && ::poll(waits.data(), waits.size(), static_cast<int>(left)) < 0 &&
        errno == EINTR)
      continue;
    if (waits[0].revents != 0) break;
    reply.ranOutOfTime = left <= 0 ? 1 : 0;
    if (left > 0 && waits[1].revents == 0) continue;
    ::kill(process, SIGKILL);
    break;
  }
  if (ended >= 0) ::close(ended);
  while (::waitpid(process, &reply.waitStatus, 0) < 0 && errno == EINTR) {
  }
  return reply;
}

}  // namespace

int ServeThumbnails(int socket, const Maker &maker) {
  ::signal(SIGPIPE, SIG_IGN);
  ::setpriority(PRIO_PROCESS, 0, kNiceness);  // whoever uses the drive comes first
  ::fcntl(socket, F_SETFD, FD_CLOEXEC);
  const Sandbox sandbox;
  const MakerHello hello{kMakerVersion, sandbox.protections()};
  if (::send(socket, &hello, sizeof hello, MSG_NOSIGNAL) != sizeof hello) return 1;
  const pid_t self = ::getpid();
  while (const auto job = receive(socket)) {
    const pid_t process = ::fork();
    if (process == 0) {
      ::close(socket);
      runJob(*job, sandbox, maker, self);
    }
    closeAll(*job);
    MakerReply reply;
    if (process < 0)
      reply.waitStatus = 1 << 8;
    else
      reply = waitForJob(process, socket, job->request.limits.wallMilliseconds);
    if (::send(socket, &reply, sizeof reply, MSG_NOSIGNAL) != sizeof reply) break;
  }
  return 0;
}

}  // namespace droxa::keld
