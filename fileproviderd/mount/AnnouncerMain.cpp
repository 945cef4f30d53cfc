#include <array>
#include <atomic>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
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

void parentDied(int /*signal*/) {
  const int file = abortFile.load();
  if (file >= 0 && ::write(file, "1", 1) < 0) ::_exit(1);
  ::_exit(0);
}

void watchOver(const std::string &connection) {
  const std::string path = "/sys/fs/fuse/connections/" + connection + "/abort";
  const int opened = connection.empty() ? -1 : ::open(path.c_str(), O_WRONLY | O_CLOEXEC);
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
  }
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
  std::array<char, 16 * 1024> message;
  for (;;) {
    const ssize_t length = ::recv(STDIN_FILENO, message.data(), message.size(), 0);
    if (length < 0 && errno == EINTR) continue;
    if (length <= 0) return 0;
    const std::string text(message.data() + 1, static_cast<std::size_t>(length) - 1);
    if (message[0] == 'w')
      watchOver(text);
    else
      play(message[0], text);
    if (::send(STDIN_FILENO, "k", 1, MSG_NOSIGNAL) != 1) return 0;
  }
}

}  // namespace droxa
