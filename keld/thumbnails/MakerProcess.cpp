#include "keld/thumbnails/MakerProcess.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <cstring>
#include <fcntl.h>
#include <poll.h>
#include <spawn.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

namespace droxa::keld {

namespace {

constexpr std::chrono::seconds kStartTimeout{20};
constexpr std::chrono::seconds kGrace{5};        // beyond the job's own time
constexpr std::chrono::milliseconds kLook{100};  // for a cancellation
constexpr std::size_t kLongestReason = 200;

// The program gets nothing of keld's but its socket, and a group of its own, so that a terminal's interrupt
// is keld's alone.
int spawn(const std::string &program, int socket, pid_t *process) {
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_adddup2(&actions, socket, kMakerSocket);
  posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
  posix_spawn_file_actions_addopen(&actions, STDOUT_FILENO, "/dev/null", O_WRONLY, 0);
  posix_spawn_file_actions_addclosefrom_np(&actions, kMakerSocket + 1);
  posix_spawnattr_t attributes;
  posix_spawnattr_init(&attributes);
  sigset_t none, all;
  sigemptyset(&none);
  sigfillset(&all);
  posix_spawnattr_setsigmask(&attributes, &none);
  posix_spawnattr_setsigdefault(&attributes, &all);
  posix_spawnattr_setpgroup(&attributes, 0);
  posix_spawnattr_setflags(&attributes,
                           POSIX_SPAWN_SETSIGMASK | POSIX_SPAWN_SETSIGDEF | POSIX_SPAWN_SETPGROUP);
  // What is bound at once is bound before the program forks.
  std::array<std::string, 4> settings{"LD_BIND_NOW=1", "LANG=C.UTF-8", "PATH=/usr/bin:/bin",
                                      "HOME=/nonexistent"};
  std::array<char *, 5> environment{settings[0].data(), settings[1].data(), settings[2].data(),
                                    settings[3].data(), nullptr};
  std::string name = program;
  std::array<char *, 2> arguments{name.data(), nullptr};
  const int error =
      ::posix_spawn(process, program.c_str(), &actions, &attributes, arguments.data(), environment.data());
  posix_spawn_file_actions_destroy(&actions);
  posix_spawnattr_destroy(&attributes);
  return error;
}

// What a stranger says, in one short line.
std::string reasonOf(std::string text) {
  if (text.size() > kLongestReason) text.resize(kLongestReason);
  for (char &character : text)
    if (static_cast<unsigned char>(character) < ' ' || static_cast<unsigned char>(character) > '~')
      character = '?';
  return text;
}

// Why its process has ended, when it said nothing itself.
std::string reasonOf(const MakerReply &reply, const MakerLimits &limits) {
  if (reply.ranOutOfTime != 0)
    return "its thumbnail wasn't made within " + std::to_string(limits.wallMilliseconds) + " ms";
  if (WIFSIGNALED(reply.waitStatus)) {
    const int signal = WTERMSIG(reply.waitStatus);
    if (signal == SIGKILL) return "its thumbnail's maker was killed, perhaps for want of memory";
    if (signal == SIGXCPU)
      return "its thumbnail took more than " + std::to_string(limits.cpuSeconds) + " s of the processor";
    return std::string("its thumbnail's maker crashed (") + ::strsignal(signal) + ")";
  }
  return "its thumbnail's maker failed (status " + std::to_string(WEXITSTATUS(reply.waitStatus)) + ")";
}

}  // namespace

std::unique_ptr<MakerProcess> MakerProcess::start(const std::string &program, std::string *problem) {
  std::array<int, 2> ends{};
  if (::access(program.c_str(), X_OK) != 0 ||
      ::socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0, ends.data()) != 0) {
    *problem = program + ": " + std::strerror(errno);
    return nullptr;
  }
  OwnedDescriptor ours(ends[0]);
  OwnedDescriptor theirs(ends[1]);
  pid_t process = 0;
  if (const int error = spawn(program, theirs.get(), &process); error != 0) {
    *problem = program + ": " + std::strerror(error);
    return nullptr;
  }
  std::unique_ptr<MakerProcess> made(new MakerProcess(process, std::move(ours)));
  theirs = OwnedDescriptor();  // so that its end is noticed
  if (!made->hear(problem)) return nullptr;
  return made;
}

MakerProcess::~MakerProcess() {
  ::kill(process_, SIGKILL);  // what it has forked goes with it
  while (::waitpid(process_, nullptr, 0) < 0 && errno == EINTR) {
  }
}

bool MakerProcess::hear(std::string *problem) {
  MakerHello hello;
  const CKCancellation never{};
  const bool isThere = waitFor(socket_.get(), Clock::now() + kStartTimeout, never) == Wait::ready &&
                       ::recv(socket_.get(), &hello, sizeof hello, MSG_DONTWAIT) == sizeof hello &&
                       hello.version == kMakerVersion;
  if (!isThere) *problem = "droxa-thumbnailer doesn't start, or is of another version than keld";
  protections_ = hello.protections;
  return isThere;
}

MakerProcess::Wait MakerProcess::waitFor(int descriptor, Clock::time_point until,
                                         const CKCancellation &cancellation) {
  for (;;) {
    if (cancellation.isCancelled()) return Wait::cancelled;
    const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(until - Clock::now());
    if (left.count() <= 0) return Wait::tooLate;
    pollfd wait{descriptor, POLLIN, 0};
    if (::poll(&wait, 1, static_cast<int>(std::min(left, kLook).count())) > 0) return Wait::ready;
  }
}

bool MakerProcess::send(const Job &job, int contents, OwnedDescriptor output) {
  MakerRequest request;
  request.kind = job.kind;
  request.limits = job.limits;
  std::string packet(reinterpret_cast<const char *>(&request), sizeof request);
  for (const std::string &word : job.command) packet.append(word).push_back('\0');
  if (packet.size() > kLongestRequest) return false;
  iovec bytes{packet.data(), packet.size()};
  const std::array<int, 2> descriptors{contents, output.get()};
  alignas(cmsghdr) std::array<char, CMSG_SPACE(sizeof descriptors)> control{};
  msghdr message{};
  message.msg_iov = &bytes;
  message.msg_iovlen = 1;
  message.msg_control = control.data();
  message.msg_controllen = control.size();
  cmsghdr *header = CMSG_FIRSTHDR(&message);
  header->cmsg_level = SOL_SOCKET;
  header->cmsg_type = SCM_RIGHTS;
  header->cmsg_len = CMSG_LEN(sizeof descriptors);
  std::memcpy(CMSG_DATA(header), descriptors.data(), sizeof descriptors);
  return ::sendmsg(socket_.get(), &message, MSG_NOSIGNAL) == static_cast<ssize_t>(packet.size());
}

// Everything that comes out of the pipe; an outcome when that has no good end.
std::optional<MakerProcess::Outcome> MakerProcess::readAll(int pipe, const Job &job, Clock::time_point until,
                                                           const CKCancellation &cancellation,
                                                           std::string *text) {
  std::vector<char> buffer(1 << 16);
  for (;;) {
    const Wait waited = waitFor(pipe, until, cancellation);
    if (waited == Wait::cancelled) return Outcome{Outcome::Kind::cancelled, {}};
    if (waited == Wait::tooLate) return Outcome{Outcome::Kind::refused, "its thumbnail's maker doesn't end"};
    const ssize_t count = ::read(pipe, buffer.data(), buffer.size());
    if (count < 0 && errno == EINTR) continue;
    if (count <= 0) return std::nullopt;
    text->append(buffer.data(), static_cast<std::size_t>(count));
    if (text->size() > job.limits.outputBytes + 1)
      return Outcome{Outcome::Kind::refused, "its thumbnail's maker writes more than a thumbnail is large"};
  }
}

std::optional<MakerReply> MakerProcess::reply(Clock::time_point until, const CKCancellation &cancellation) {
  MakerReply reply;
  if (waitFor(socket_.get(), until, cancellation) != Wait::ready) return std::nullopt;
  if (::recv(socket_.get(), &reply, sizeof reply, MSG_DONTWAIT) != sizeof reply) return std::nullopt;
  return reply;
}

MakerProcess::Outcome MakerProcess::run(const Job &job, int contents, const CKCancellation &cancellation) {
  isUsable_ = false;
  std::array<int, 2> ends{};
  if (::pipe2(ends.data(), O_CLOEXEC) != 0) return {Outcome::Kind::lost, std::strerror(errno)};
  const OwnedDescriptor pipe(ends[0]);
  if (!send(job, contents, OwnedDescriptor(ends[1]))) return {Outcome::Kind::lost, "it takes no request"};
  const auto until = Clock::now() + std::chrono::milliseconds(job.limits.wallMilliseconds) + kGrace;
  std::string text;
  if (auto outcome = readAll(pipe.get(), job, until, cancellation, &text)) return std::move(*outcome);
  const auto ended = reply(until, cancellation);
  if (cancellation.isCancelled()) return {Outcome::Kind::cancelled, {}};
  if (!ended) return {Outcome::Kind::lost, "it has ended"};
  isUsable_ = true;
  const bool isWell =
      ended->ranOutOfTime == 0 && WIFEXITED(ended->waitStatus) && WEXITSTATUS(ended->waitStatus) == 0;
  if (!isWell || text.empty()) return {Outcome::Kind::refused, reasonOf(*ended, job.limits)};
  if (text[0] == kMadeMark) return {Outcome::Kind::made, text.substr(1)};
  return {Outcome::Kind::refused, reasonOf(text.substr(1))};
}

}  // namespace droxa::keld
