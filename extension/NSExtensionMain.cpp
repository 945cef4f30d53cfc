#include "extension/NSExtensionMain.h"

#include <cstdio>
#include <fcntl.h>
#include <memory>
#include <signal.h>
#include <sysexits.h>
#include <unistd.h>

#include "extension/ExtensionArguments.h"
#include "extension/HostConnection.h"
#include "extension/HostedExtension.h"
#include "extension/QVFileProviderExtension.h"
#include "platform/featureflags/feature_flags.h"
#include "platform/fileprovider/NSFileProviderManager.h"
#include "platform/foundation/DescriptorLimit.h"
#include "platform/foundation/Paths.h"
#include "platform/usermanagement/UMUserManager.h"
#include "tessaly/QVLog.h"

namespace droxa {
namespace {

constexpr int kUsageError = 2;

constexpr char kUsage[] =
    "usage: droxa-file-provider --host-descriptor N [--home DIR]\n"
    "\n"
    "Droxa Drive's file provider extension. fileproviderd starts it and starts it again.\n"
    "\n"
    "  --host-descriptor N  the connected socket to the host\n"
    "  --home DIR           the drive's home (default: $DROXA_HOME, else ~/.local/share/droxa)\n"
    "  --help               this text\n";

int FailBeforeServing(int status, const std::string &problem) {
  std::fprintf(stderr, "droxa-file-provider: %s\n", problem.c_str());
  return status;
}

// The signals that end the process. Blocked before there are other threads, so that all of them leave the
// signals to WaitForEnd().
sigset_t BlockEndSignals() {
  sigset_t signals;
  sigemptyset(&signals);
  sigaddset(&signals, SIGTERM);
  sigaddset(&signals, SIGINT);
  pthread_sigmask(SIG_BLOCK, &signals, nullptr);
  return signals;
}

void WaitForEnd(const sigset_t &signals) {
  int received = 0;
  sigwait(&signals, &received);
}

void HostHasGone() {
  os_log(qvc_default_log(), "[NOTICE] the host has gone, ending");
  kill(getpid(), SIGTERM);
}

NSError ConfigureProcess(const std::optional<std::string> &home) {
  DroxaSetProcessHome(DroxaHome::resolve(home));
  const std::string configuration = DroxaProcessHome().configuration();
  OSFeatureFlagsSetFolders(configuration + "/feature-flags", "/etc/droxa/feature-flags");
  return UMLoadConfiguration(configuration);
}

// Everything is kept elsewhere, so the process needs no farewell: its other threads are simply stopped.
[[noreturn]] void EndProcess() {
  std::fflush(nullptr);
  _exit(EX_OK);
}

}  // namespace

int NSExtensionMain(int argc, char *argv[]) {
  std::string problem;
  const auto arguments = ExtensionArguments::parse({argv + 1, argv + argc}, &problem);
  if (!arguments) return FailBeforeServing(kUsageError, problem);
  if (arguments->wantsHelp) return std::fputs(kUsage, stdout) < 0 ? EX_IOERR : EX_OK;

  const sigset_t endSignals = BlockEndSignals();
  signal(SIGPIPE, SIG_IGN);
  DroxaRaiseDescriptorLimit();
  fcntl(arguments->hostDescriptor, F_SETFD, FD_CLOEXEC);
  if (const NSError error = ConfigureProcess(arguments->home)) {
    return FailBeforeServing(EX_CONFIG, error.localizedDescription());
  }

  const auto principal = QVFileProviderExtension::init();
  const auto host = std::make_shared<HostConnection>(
      arguments->hostDescriptor, std::make_shared<HostedExtension>(principal), HostHasGone);
  NSFileProviderManager::defaultManager().setHostLink(host);
  host->resume();
  WaitForEnd(endSignals);
  EndProcess();
}

}  // namespace droxa
