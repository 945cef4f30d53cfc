#include "fileproviderd/mount/Announcer.h"

#include <array>
#include <cerrno>
#include <csignal>
#include <poll.h>
#include <spawn.h>
#include <sys/socket.h>
#include <sys/wait.h>

extern char **environ;

namespace droxa {

namespace {

constexpr int kPatienceMilliseconds = 5000;

}  // namespace

std::shared_ptr<Announcer> Announcer::start(const std::string &program) {
  std::array<int, 2> ends{};
  if (::socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0, ends.data()) != 0) return nullptr;
  Descriptor ours(ends[0]);
  const Descriptor theirs(ends[1]);
  std::string name = program;
  std::string argument = kArgument;
  std::array<char *, 3> words{name.data(), argument.data(), nullptr};
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_adddup2(&actions, theirs.get(), 0);
  pid_t process = 0;
  const int error = ::posix_spawn(&process, program.c_str(), &actions, nullptr, words.data(), environ);
  posix_spawn_file_actions_destroy(&actions);
  if (error != 0) return nullptr;
  return std::shared_ptr<Announcer>(new Announcer(process, std::move(ours)));
}

Announcer::~Announcer() {
  {
    const Lock held(lock_);
    socket_ = Descriptor();
  }
  ::kill(process_, SIGKILL);
  int status = 0;
  while (::waitpid(process_, &status, 0) < 0 && errno == EINTR) {
  }
}

bool Announcer::send(char kind, const std::string &text) {
  const std::string message = kind + text;
  const Lock held(lock_);
  if (!socket_) return false;
  char answer = 0;
  pollfd waited{socket_.get(), POLLIN, 0};
  const bool isPlayed = ::send(socket_.get(), message.data(), message.size(), MSG_NOSIGNAL) > 0 &&
                        ::poll(&waited, 1, kPatienceMilliseconds) > 0 &&
                        ::recv(socket_.get(), &answer, 1, 0) == 1;
  if (isPlayed) return true;
  socket_ = Descriptor();
  ::kill(process_, SIGKILL);
  return false;
}

bool Announcer::play(Play play, const std::string &path) {
  return send(static_cast<char>(play), path);
}

void Announcer::watchOver(const MountPoint &point, unsigned connection) {
  if (connection != 0) send('w', std::to_string(connection) + '\n' + point.source() + '\n' + point.path());
}

void Announcer::watchOverNothing() {
  send('w', {});
}

}  // namespace droxa
