#include "cli/FolderImport.h"

#include <array>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <string_view>
#include <sys/wait.h>
#include <unistd.h>

#include "cli/ContentsText.h"
#include "cli/Text.h"

extern char **environ;

namespace droxa {

namespace {

constexpr int kLookMilliseconds = 100;
constexpr std::string_view kSpeaker = "keld: ";
constexpr std::string_view kLeftOut = "left out ";

// The reading end of what the program prints, given out line by line.
// Thread contract: one thread.
class Lines {
 public:
  Lines() {
    if (pipe2(ends_.data(), O_CLOEXEC) != 0) ends_ = {-1, -1};
  }
  ~Lines() {
    closeEnd(0);
    closeEnd(1);
  }
  Lines(const Lines &) = delete;
  Lines &operator=(const Lines &) = delete;

  bool isOpen() const { return ends_[0] >= 0; }
  int reading() const { return ends_[0]; }
  int writing() const { return ends_[1]; }
  void closeWriting() { closeEnd(1); }

  // Reads what there is. At the end the descriptor is closed, and a line without its end counts.
  template <class Take>
  void read(const Take &take) {
    std::array<char, 4096> piece{};
    const ssize_t length = ::read(ends_[0], piece.data(), piece.size());
    if (length < 0 && errno == EINTR) return;
    if (length > 0) text_.append(piece.data(), static_cast<std::size_t>(length));
    for (std::size_t end; (end = text_.find('\n')) != std::string::npos; text_.erase(0, end + 1))
      take(text_.substr(0, end));
    if (length > 0) return;
    if (!text_.empty()) take(text_);
    closeEnd(0);
  }

 private:
  void closeEnd(std::size_t end) {
    if (ends_[end] >= 0) close(ends_[end]);
    ends_[end] = -1;
  }
  std::array<int, 2> ends_{-1, -1};
  std::string text_;
};

// One run of the program.
class Import {
 public:
  Import(bool isTerminal, std::ostream &out, std::ostream &err)
      : isTerminal_(isTerminal), out_(out), err_(err) {}

  FolderImportResult run(const std::vector<std::string> &command) {
    if (!start(command)) return result_;
    while (progress_.isOpen() || errors_.isOpen()) {
      if (wasStopped()) return stop();
      pollfd waits[2] = {{progress_.reading(), POLLIN, 0}, {errors_.reading(), POLLIN, 0}};
      if (poll(waits, 2, kLookMilliseconds) <= 0) continue;
      if (waits[0].revents != 0) progress_.read([this](const std::string &line) { tookProgress(line); });
      if (waits[1].revents != 0) errors_.read([this](const std::string &line) { tookError(line); });
    }
    const int status = end();
    if (WIFEXITED(status) && WEXITSTATUS(status) == 0) {
      result_.end = FolderImportResult::End::done;
      result_.problem.clear();
    } else if (result_.problem.empty()) {
      result_.problem = WIFSIGNALED(status) ? "keld was killed by signal " + std::to_string(WTERMSIG(status))
                                            : "keld ended with status " + std::to_string(WEXITSTATUS(status));
    }
    return result_;
  }

 private:
  bool start(const std::vector<std::string> &command) {
    if (!progress_.isOpen() || !errors_.isOpen()) {
      result_.problem = std::string("can't make a pipe: ") + std::strerror(errno);
      return false;
    }
    std::vector<std::string> words = command;
    std::vector<char *> argv;
    argv.reserve(words.size() + 1);
    for (std::string &word : words) argv.push_back(word.data());
    argv.push_back(nullptr);
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
    posix_spawn_file_actions_adddup2(&actions, progress_.writing(), STDOUT_FILENO);
    posix_spawn_file_actions_adddup2(&actions, errors_.writing(), STDERR_FILENO);
    posix_spawnattr_t attributes;
    posix_spawnattr_init(&attributes);
    sigset_t none;
    sigemptyset(&none);
    posix_spawnattr_setsigmask(&attributes, &none);
    // A group of its own: a terminal's Ctrl-C is for this process, which passes it on.
    posix_spawnattr_setflags(&attributes, POSIX_SPAWN_SETSIGMASK | POSIX_SPAWN_SETPGROUP);
    const int code = posix_spawn(&child_, argv[0], &actions, &attributes, argv.data(), environ);
    posix_spawnattr_destroy(&attributes);
    posix_spawn_file_actions_destroy(&actions);
    progress_.closeWriting();
    errors_.closeWriting();
    if (code != 0) result_.problem = "can't start " + command.front() + ": " + std::strerror(code);
    return code == 0;
  }

  static bool wasStopped() {
    sigset_t signals;
    sigemptyset(&signals);
    for (const int number : {SIGINT, SIGTERM, SIGHUP}) sigaddset(&signals, number);
    const timespec none{0, 0};
    return sigtimedwait(&signals, nullptr, &none) > 0;
  }

  FolderImportResult stop() {
    kill(child_, SIGTERM);
    (void)end();
    result_.end = FolderImportResult::End::stopped;
    return result_;
  }

  // Waits for the program's end.
  int end() {
    int status = 0;
    while (waitpid(child_, &status, 0) < 0 && errno == EINTR) {
    }
    clearLine();
    return status;
  }

  void tookProgress(const std::string &line) {
    unsigned long long documents = 0;
    unsigned long long folders = 0;
    unsigned long long bytes = 0;
    // NOLINTNEXTLINE(cert-err34-c): a program of our own wrote it
    if (std::sscanf(line.c_str(), "%llu documents, %llu folders, %llu bytes", &documents, &folders, &bytes) !=
        3)
      return;
    result_.documents = documents;
    result_.folders = folders;
    result_.bytes = bytes;
    if (!isTerminal_) return;
    out_ << "\rinto the cloud: " << countText(documents, "document") << ", " << countText(folders, "folder")
         << ", " << bytesText(bytes) << "\033[K" << std::flush;
    isLineShown_ = true;
  }

  void tookError(const std::string &line) {
    const std::string_view text =
        std::string_view(line).substr(line.rfind(kSpeaker, 0) == 0 ? kSpeaker.size() : 0);
    if (text.rfind(kLeftOut, 0) != 0) {
      result_.problem = text;  // the last words of one that fails
      return;
    }
    ++result_.leftOut;
    clearLine();
    err_ << "droxa: " << escapedText(text) << std::endl;
  }

  void clearLine() {
    if (isLineShown_) out_ << "\r\033[K" << std::flush;
    isLineShown_ = false;
  }

  const bool isTerminal_;
  std::ostream &out_;
  std::ostream &err_;
  Lines progress_, errors_;
  pid_t child_ = 0;
  bool isLineShown_ = false;
  FolderImportResult result_;
};

}  // namespace

FolderImportResult runFolderImport(const std::vector<std::string> &command, bool isTerminal,
                                   std::ostream &out, std::ostream &err) {
  return Import(isTerminal, out, err).run(command);
}

}  // namespace droxa
