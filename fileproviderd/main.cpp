#include <cstdio>
#include <filesystem>
#include <signal.h>
#include <string_view>
#include <sysexits.h>
#include <systemd/sd-daemon.h>
#include <unistd.h>

#include "fileproviderd/Host.h"
#include "fileproviderd/HostArguments.h"
#include "fileproviderd/mount/Announcer.h"
#include "platform/foundation/DescriptorLimit.h"
#include "platform/foundation/Paths.h"
#include "platform/foundation/ProcessLock.h"

namespace {

using namespace droxa;

constexpr int kUsageError = 2;

constexpr char kUsage[] =
    "usage: fileproviderd [--home DIR] [--extension PROGRAM]\n"
    "\n"
    "Serves one home's drive to `droxa`: starts the file provider extension when it is needed, and again "
    "when it\n"
    "has gone.\n"
    "\n"
    "  --home DIR           the drive's home (default: $DROXA_HOME, else ~/.local/share/droxa)\n"
    "  --extension PROGRAM  the extension's program (default: droxa-file-provider beside this one)\n"
    "  --help               this text\n";

int fail(int status, const std::string &problem) {
  std::fprintf(stderr, "fileproviderd: %s\n", problem.c_str());
  return status;
}

// Beside this program, as it is built, or where it is installed.
std::string extensionProgram() {
  std::error_code problem;
  const auto folder = std::filesystem::read_symlink("/proc/self/exe", problem).parent_path();
  const auto installed = folder.parent_path() / "libexec/droxa/droxa-file-provider";
  const auto built = folder / "droxa-file-provider";
  return (access(built.c_str(), X_OK) != 0 && access(installed.c_str(), X_OK) == 0 ? installed : built)
      .native();
}

// Blocked before there are other threads, so that the signals wait for waitForEnd().
sigset_t blockEndSignals() {
  sigset_t signals;
  sigemptyset(&signals);
  sigaddset(&signals, SIGTERM);
  sigaddset(&signals, SIGINT);
  pthread_sigmask(SIG_BLOCK, &signals, nullptr);
  signal(SIGPIPE, SIG_IGN);
  return signals;
}

void waitForEnd(const sigset_t &signals) {
  int received = 0;
  sigwait(&signals, &received);
}

}  // namespace

int main(int argc, char *argv[]) {
  if (argc == 2 && argv[1] == std::string_view(Announcer::kArgument)) return announcerMain();
  std::string problem;
  const auto arguments = HostArguments::parse({argv + 1, argv + argc}, &problem);
  if (!arguments) return fail(kUsageError, problem);
  if (arguments->wantsHelp) return std::fputs(kUsage, stdout) < 0 ? EX_IOERR : EX_OK;

  const sigset_t endSignals = blockEndSignals();
  DroxaRaiseDescriptorLimit();
  DroxaSetProcessHome(DroxaHome::resolve(arguments->home));
  if (!DroxaProcessHome().create(&problem)) return fail(EX_CANTCREAT, problem);
  int holder = 0;
  const auto lock = ProcessLock::acquire(DroxaProcessHome().run() + "/fileproviderd.pid", &holder, &problem);
  if (!lock && holder != 0) {
    return fail(EX_TEMPFAIL,
                "process " + std::to_string(holder) + " serves " + DroxaProcessHome().root() + " already");
  }
  if (!lock) return fail(EX_CANTCREAT, problem);

  const std::string program = arguments->extension.value_or(extensionProgram());
  if (access(program.c_str(), X_OK) != 0)
    return fail(EX_UNAVAILABLE, "there is no extension program at " + program);
  const auto host = Host::create(program, "/proc/self/exe");
  NSError error;
  if (!host->start(&error)) return fail(EX_UNAVAILABLE, error.localizedDescription());
  sd_notify(0, "READY=1");
  waitForEnd(endSignals);
  sd_notify(0, "STOPPING=1");
  host->stop();
  std::fflush(nullptr);
  _exit(EX_OK);  // the pool's threads have nothing left to say
}
