#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <nlohmann/json.hpp>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <sysexits.h>
#include <unistd.h>

#include "cli/Commands.h"
#include "cli/ExitStatus.h"
#include "cli/Materialising.h"
#include "cli/Text.h"

extern char **environ;

namespace droxa {

namespace {

using Json = nlohmann::ordered_json;

constexpr char kOpener[] = "xdg-open";

// The first program of that name in $PATH, "" when there is none.
std::string programInPath(const std::string &name) {
  const char *variable = std::getenv("PATH");
  const std::string folders = variable ? variable : "";
  for (std::size_t start = 0; start <= folders.size();) {
    const std::size_t end = std::min(folders.find(':', start), folders.size());
    const std::string program = folders.substr(start, end - start) + "/" + name;
    if (end > start && access(program.c_str(), X_OK) == 0) return program;
    start = end + 1;
  }
  return {};
}

// Runs it to its end, which for an opener comes once it has handed the document on; -1 when it can't be run.
int runOpener(const std::string &program, const std::string &path) {
  std::string words[] = {program, path};
  char *argv[] = {words[0].data(), words[1].data(), nullptr};
  posix_spawnattr_t attributes;
  posix_spawnattr_init(&attributes);
  sigset_t none;
  sigemptyset(&none);
  sigset_t reset;
  sigemptyset(&reset);
  sigaddset(&reset, SIGPIPE);
  posix_spawnattr_setsigmask(&attributes, &none);
  posix_spawnattr_setsigdefault(&attributes, &reset);
  posix_spawnattr_setflags(&attributes, POSIX_SPAWN_SETSIGMASK | POSIX_SPAWN_SETSIGDEF);
  pid_t child = 0;
  const int code = posix_spawn(&child, program.c_str(), nullptr, &attributes, argv, environ);
  posix_spawnattr_destroy(&attributes);
  if (code != 0) return -1;
  int status = 0;
  while (waitpid(child, &status, 0) < 0)
    if (errno != EINTR) return -1;
  return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

void printJSON(CommandContext &context, const ContentsArgument &contents, const std::string &path,
               bool wasOpened) {
  const Json json{{"path", contents.argument}, {"file", path}, {"opened", wasOpened}};
  context.out << json.dump(-1, ' ', false, Json::error_handler_t::replace) << std::endl;
}

int openItem(CommandContext &context, const ContentsArgument &contents, bool json) {
  // A folder is shown as it is; what is in it comes when it is opened.
  Materialised here{contents.urls.front(), NSError(), false};
  if (!contents.isFolder) here = materialise(context, contents, {});
  if (here.error) return reportError(context, contents.argument, here.error);
  const std::string path = here.url.path();
  const std::string opener = programInPath(kOpener);
  if (opener.empty()) {
    if (json) {
      printJSON(context, contents, path, false);
    } else {
      context.out << escapedText(path) << std::endl;
    }
    return kExitSuccess;
  }
  const int status = runOpener(opener, path);
  if (json) printJSON(context, contents, path, status == 0);
  if (status == 0) return kExitSuccess;
  context.err << "droxa: " << escapedText(contents.argument) << ": " << kOpener << " can't open it";
  if (status > 0) context.err << " (status " << status << ")";
  context.err << "; its contents are here, at " << escapedText(path) << std::endl;
  return kExitFailure;
}

}  // namespace

int runOpen(CommandContext &context, const std::vector<std::string> &arguments, bool json) {
  return forEachContents(context, arguments,
                         [&](const ContentsArgument &contents) { return openItem(context, contents, json); });
}

}  // namespace droxa
