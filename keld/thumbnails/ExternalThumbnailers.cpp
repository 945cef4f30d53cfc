#include "keld/thumbnails/ExternalThumbnailers.h"

#include <array>
#include <cerrno>
#include <fcntl.h>
#include <spawn.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include "keld/FolderReading.h"
#include "keld/thumbnails/maker/MakerProtocol.h"
#include "platform/quicklook/InstalledThumbnailers.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

constexpr char kBubblewrap[] = "/usr/bin/bwrap";
constexpr int kContents = 3;
constexpr char kDocument[] = "/document";
constexpr char kPicture[] = "/tmp/thumbnail.png";
constexpr char kPrinter[] = "/printer";

// How the document's descriptor is shown as a file: by itself where that is known, else by the path that it
// has.
enum class Showing { notAtAll, descriptor, path };

// An empty file system with the machine's programs and libraries, no network, no other processes, nobody's
// documents.
std::vector<std::string> confinement(Showing showing) {
  std::vector<std::string> words{kBubblewrap,     "--unshare-all", "--die-with-parent",
                                 "--new-session", "--clearenv",    "--setenv",
                                 "PATH",          "/usr/bin:/bin", "--setenv",
                                 "HOME",          "/tmp",          "--setenv",
                                 "LANG",          "C.UTF-8",       "--ro-bind",
                                 "/usr",          "/usr",          "--proc",
                                 "/proc",         "--dev",         "/dev",
                                 "--size",        "67108864",      "--tmpfs",
                                 "/tmp"};
  for (const char *path : {"/bin", "/lib", "/lib64", "/etc/fonts", "/etc/ld.so.cache", "/etc/alternatives",
                           "/var/cache/fontconfig"})
    words.insert(words.end(), {"--ro-bind-try", path, path});
  if (showing == Showing::descriptor)
    words.insert(words.end(), {"--ro-bind-fd", std::to_string(kContents), kDocument});
  else
    words.insert(words.end(), {"--ro-bind", "/proc/self/fd/" + std::to_string(kContents), kDocument});
  return words;
}

bool runsWell(std::vector<std::string> words) {
  const OwnedDescriptor contents(::open("/proc/self/exe", O_RDONLY | O_CLOEXEC));
  std::vector<char *> arguments;
  arguments.reserve(words.size() + 1);
  for (std::string &word : words) arguments.push_back(word.data());
  arguments.push_back(nullptr);
  std::array<char *, 1> environment{nullptr};
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_adddup2(&actions, contents.get(), kContents);
  for (const int standard : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO})
    posix_spawn_file_actions_addopen(&actions, standard, "/dev/null", O_RDWR, 0);
  posix_spawn_file_actions_addclosefrom_np(&actions, kContents + 1);
  pid_t process = 0;
  const bool isStarted =
      ::posix_spawn(&process, kBubblewrap, &actions, nullptr, arguments.data(), environment.data()) == 0;
  posix_spawn_file_actions_destroy(&actions);
  int status = 1;
  while (isStarted && ::waitpid(process, &status, 0) < 0 && errno == EINTR) {
  }
  return isStarted && WIFEXITED(status) && WEXITSTATUS(status) == 0;
}

// One that needs privileges gets none: whoever starts it has given up all new ones.
bool isPlainProgram() {
  struct stat status {};
  return ::stat(kBubblewrap, &status) == 0 && (status.st_mode & S_ISUID) == 0;
}

Showing findShowing() {
  for (const Showing showing : {Showing::descriptor, Showing::path}) {
    auto words = confinement(showing);
    words.insert(words.end(), {"/usr/bin/test", "-r", kDocument});
    if (isPlainProgram() && runsWell(std::move(words))) return showing;
  }
  os_log_error(
      qvc_default_log(),
      "[ERROR] installed thumbnailers aren't used: %s can't confine them here (it isn't installed, or "
      "unprivileged user namespaces are off)",
      std::string(kBubblewrap));
  return Showing::notAtAll;
}

Showing showing() {
  static const Showing found = findShowing();
  return found;
}

void replace(std::string *word, const std::string &mark, const std::string &text) {
  for (std::size_t at = word->find(mark); at != std::string::npos; at = word->find(mark, at + text.size()))
    word->replace(at, mark.size(), text);
}

}  // namespace

bool CanConfineThumbnailers() {
  return showing() != Showing::notAtAll;
}

std::vector<std::string> ConfinedThumbnailerCommand(const std::string &mimeType, const std::string &program) {
  const auto thumbnailer = InstalledThumbnailers::shared().forType(mimeType);
  if (!thumbnailer || !CanConfineThumbnailers()) return {};
  std::vector<std::string> words = confinement(showing());
  // Its libraries are the machine's; it may itself be anywhere.
  words.insert(words.end(), {"--ro-bind", program, kPrinter, kPrinter, "--print", kPicture});
  for (std::string word : thumbnailer->command) {
    replace(&word, "%i", kDocument);
    replace(&word, "%u", std::string("file://") + kDocument);
    replace(&word, "%o", kPicture);
    replace(&word, "%s", std::to_string(kThumbnailSide));
    replace(&word, "%%", "%");
    words.push_back(std::move(word));
  }
  return words;
}

}  // namespace droxa::keld
