#include <array>
#include <atomic>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <optional>
#include <string>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include "fileproviderd/mount/Announcer.h"

namespace droxa {

namespace {

// The connection's file that ends all its requests; open beforehand, so that a signal's handler can use it.
std::atomic<int> abortFile{-1};
std::atomic<bool> isParentDead{false};

// This process may itself wait for the dead one, and goes on from there.
void parentDied(int /*signal*/) {
  const int before = errno;
  const int file = abortFile.load();
  const ssize_t written = file >= 0 ? ::write(file, "1", 1) : 0;
  static_cast<void>(written);
  errno = before;
  isParentDead = true;
}

// What is to be taken off in the end.
struct Watched {
  std::optional<MountPoint> point;
  unsigned connection = 0;
};

// "NUMBER", source and path, each on a line; "": nothing.
void watchOver(const std::string &text, Watched *watched) {
  watched->point.reset();
  const std::size_t first = text.find('\n');
  const std::size_t second = first == std::string::npos ? first : text.find('\n', first + 1);
  int opened = -1;
  if (second != std::string::npos) {
    watched->point.emplace(text.substr(second + 1), text.substr(first + 1, second - first - 1));
    watched->connection = static_cast<unsigned>(std::strtoul(text.c_str(), nullptr, 10));
    const std::string file = "/sys/fs/fuse/connections/" + text.substr(0, first) + "/abort";
    opened = ::open(file.c_str(), O_WRONLY | O_CLOEXEC);
  }
  const int before = abortFile.exchange(opened);
  if (before >= 0) ::close(before);
}

void changeAttributes(const char *path) {
  ::utimensat(AT_FDCWD, path, nullptr, AT_SYMLINK_NOFOLLOW);
}

// The host answers with the file as it is, whatever is asked here.
void changeContents(const char *path) {
  struct stat status;
  if (::lstat(path, &status) != 0 || !S_ISREG(status.st_mode) || ::truncate(path, status.st_size) != 0)
    changeAttributes(path);
}

void writeBack(const char *folder) {
  const Descriptor opened(::open(folder, O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (opened) ::syncfs(opened.get());
}

void play(char kind, const std::string &path) {
  constexpr mode_t kFileMode = 0600;
  constexpr mode_t kFolderMode = 0700;
  switch (static_cast<Announcer::Play>(kind)) {
    case Announcer::Play::makeFile:
      ::mknod(path.c_str(), S_IFREG | kFileMode, 0);
      return;
    case Announcer::Play::makeFolder:
      ::mkdir(path.c_str(), kFolderMode);
      return;
    case Announcer::Play::makeLink:
      if (::symlink("-", path.c_str()) != 0) return;
      return;
    case Announcer::Play::removeFile:
      ::unlink(path.c_str());
      return;
    case Announcer::Play::removeFolder:
      ::rmdir(path.c_str());
      return;
    case Announcer::Play::changeContents:
      return changeContents(path.c_str());
    case Announcer::Play::changeAttributes:
      return changeAttributes(path.c_str());
    case Announcer::Play::writeBack:
      return writeBack(path.c_str());
  }
}

// False when the host has gone.
bool serveOne(Watched *watched) {
  std::array<char, 16 * 1024> message;
  const ssize_t length = ::recv(STDIN_FILENO, message.data(), message.size(), 0);
  if (isParentDead) return false;
  if (length < 0 && errno == EINTR) return true;
  if (length <= 0) return false;
  const std::string text(message.data() + 1, static_cast<std::size_t>(length) - 1);
  if (message[0] == 'w')
    watchOver(text, watched);
  else
    play(message[0], text);
  return !isParentDead && ::send(STDIN_FILENO, "k", 1, MSG_NOSIGNAL) == 1;
}

}  // namespace

int announcerMain() {
  const pid_t parent = ::getppid();
  struct sigaction action {};
  action.sa_handler = parentDied;
  ::sigaction(SIGUSR1, &action, nullptr);
  for (const int ignored : {SIGINT, SIGTERM, SIGHUP, SIGPIPE}) ::signal(ignored, SIG_IGN);
  sigset_t none;
  sigemptyset(&none);
  ::pthread_sigmask(SIG_SETMASK, &none, nullptr);
  ::prctl(PR_SET_PDEATHSIG, SIGUSR1);
  if (::getppid() != parent) return 0;
  Watched watched;
  while (serveOne(&watched)) {
  }
  // Nobody serves it any more.
  if (watched.point) watched.point->takeOff(watched.connection);
  return 0;
}

}  // namespace droxa
