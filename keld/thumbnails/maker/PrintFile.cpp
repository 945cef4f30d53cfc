#include <array>
#include <cerrno>
#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include "keld/thumbnails/maker/Makers.h"

namespace droxa::keld {

namespace {

bool print(const char *bytes, ssize_t size) {
  while (size > 0) {
    const ssize_t count = ::write(STDOUT_FILENO, bytes, static_cast<std::size_t>(size));
    if (count < 0 && errno == EINTR) continue;
    if (count <= 0) return false;
    bytes += count;
    size -= count;
  }
  return true;
}

// What the command prints itself isn't the thumbnail.
bool run(char **command) {
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_addopen(&actions, STDOUT_FILENO, "/dev/null", O_WRONLY, 0);
  pid_t process = 0;
  const bool isStarted = ::posix_spawn(&process, command[0], &actions, nullptr, command, environ) == 0;
  posix_spawn_file_actions_destroy(&actions);
  int status = 0;
  while (isStarted && ::waitpid(process, &status, 0) < 0 && errno == EINTR) {
  }
  return isStarted && WIFEXITED(status) && WEXITSTATUS(status) == 0;
}

}  // namespace

int PrintFileOf(char **command, const char *file) {
  if (!run(command)) return 1;
  const int made = ::open(file, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
  if (made < 0 || !print(&kMadeMark, 1)) return 1;
  std::array<char, 1 << 16> buffer{};
  for (;;) {
    const ssize_t count = ::read(made, buffer.data(), buffer.size());
    if (count <= 0) return count == 0 ? 0 : 1;
    if (!print(buffer.data(), count)) return 1;
  }
}

}  // namespace droxa::keld
