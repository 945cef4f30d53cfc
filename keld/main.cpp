// keld, the sync daemon of one home.

#include <CLI/CLI.hpp>
#include <filesystem>
#include <iostream>
#include <malloc.h>
#include <optional>
#include <poll.h>
#include <signal.h>
#include <sys/eventfd.h>
#include <sys/signalfd.h>
#include <sysexits.h>
#include <systemd/sd-daemon.h>
#include <unistd.h>

#include "keld/Keld.h"
#include "keld/KeldListener.h"
#include "keld/sync/CloudImport.h"
#include "keld/sync/DeviceName.h"
#include "keld/sync/DriveAccount.h"
#include "keld/sync/SyncStore.h"
#include "platform/cloudkit/EmbeddedCloud.h"
#include "platform/foundation/DescriptorLimit.h"
#include "platform/foundation/Paths.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {
namespace {

struct Arguments {
  std::optional<std::string> home;
  std::string cloud;       // "": the home's own
  std::string importFrom;  // "": serve
  std::string device;
  std::string account;
  WatcherKind watcher = WatcherKind::best;
  bool foreground = true;
};

int fail(const std::string &problem, int status) {
  std::cerr << "keld: " << problem << "\n";
  return status;
}

// Waits for a signal to end, or for the daemon's own end.
bool waitForEnd(int signals, int failure) {
  pollfd waits[2] = {{signals, POLLIN, 0}, {failure, POLLIN, 0}};
  while (::poll(waits, 2, -1) < 0) {
  }
  return waits[1].revents == 0;
}

int serve(const Arguments &arguments, int signals) {
  const DroxaHome home = DroxaHome::resolve(arguments.home);
  DroxaSetProcessHome(home);
  const int failure = ::eventfd(0, EFD_CLOEXEC);
  KeldOptions options;
  options.keeper.watcher = arguments.watcher;
  options.sync.cloudFolder = arguments.cloud;
  options.sync.device = arguments.device;
  options.sync.account = arguments.account;
  options.failed = [failure](const std::string &) {
    const std::uint64_t one = 1;
    (void)!::write(failure, &one, sizeof one);
  };
  std::string problem;
  const auto daemon = Keld::start(home, options, &problem);
  if (!daemon) return fail(problem, EX_UNAVAILABLE);
  NSError error;
  const auto listener = KeldListener::listen(daemon, home.daemonSocket(), &error);
  if (!listener)
    return fail("can't listen at " + home.daemonSocket() + ": " + error.description(), EX_UNAVAILABLE);
  ::sd_notify(0, "READY=1");
  os_log(qvc_default_log(), "[NOTICE] keld serves %s (watching by %s)", home.root(),
         daemon->keeper().watcherDescription());
  const bool wasAsked = waitForEnd(signals, failure);
  ::sd_notify(0, "STOPPING=1");
  listener->invalidate();
  daemon->stop();
  ::unlink(home.daemonSocket().c_str());
  return wasAsked ? EX_OK : EX_SOFTWARE;
}

// The daemon makes them, of the files that the documents came from. Without its database there are none.
ThumbnailsWanted noteThumbnails(const DroxaHome &home) {
  std::shared_ptr<SyncStore> store;
  try {
    store = std::make_shared<SyncStore>(home.state() + "/sync.sqlite");
  } catch (const SqlError &error) {
    std::cerr << "keld: thumbnails won't be made: " << error.what() << "\n";
    return nullptr;
  }
  return [store](const std::vector<WantedThumbnail> &wanted) {
    try {
      store->transaction([&] {
        for (const WantedThumbnail &each : wanted) store->wantThumbnail(each);
      });
    } catch (const SqlError &error) {
      std::cerr << "keld: " << wanted.size() << " thumbnails won't be made: " << error.what() << "\n";
    }
  };
}

// Puts a folder's documents into the home's cloud, and says what it did, the last line in full.
int importFolder(const Arguments &arguments) {
  const DroxaHome home = DroxaHome::resolve(arguments.home);
  std::string problem;
  if (!home.create(&problem)) return fail(problem, EX_CANTCREAT);
  const std::string folder = arguments.cloud.empty() ? home.root() + "/cloud" : arguments.cloud;
  const std::string device = arguments.device.empty() ? DeviceName(home) : arguments.device;
  std::string account;
  try {
    account = DriveAccount(home, arguments.account);
  } catch (const std::runtime_error &refused) {
    return fail(refused.what(), EX_CONFIG);
  }
  NSError error;
  const auto cloud = EmbeddedCloud::open(folder, account, device, &error);
  if (!cloud) return fail(folder + ": " + error.localizedDescription(), EX_UNAVAILABLE);
  const auto progress = [](const ImportReport &so) {
    std::cout << so.documents << " documents, " << so.folders << " folders, " << so.bytes << " bytes"
              << std::endl;
  };
  const ImportReport report =
      ImportIntoCloud(*cloud, arguments.importFrom, {home.root(), folder}, progress, noteThumbnails(home));
  for (const std::string &left : report.problems) std::cerr << "keld: left out " << left << "\n";
  if (report.error) return fail(report.error.localizedDescription(), EX_IOERR);
  return EX_OK;
}

int run(int argc, char **argv) {
  CLI::App app("keld keeps the item database of a drive in line with its documents, and serves it.", "keld");
  Arguments arguments;
  std::string home, watcher = "best";
  const std::map<std::string, WatcherKind> kinds{{"best", WatcherKind::best},
                                                 {"fanotify", WatcherKind::fanotify},
                                                 {"inotify", WatcherKind::inotify},
                                                 {"scan", WatcherKind::scan}};
  auto *homeOption =
      app.add_option("--home", home, "The home's folder (default: $DROXA_HOME, else the user's)");
  app.add_option("--watcher", arguments.watcher,
                 "How changes are noticed: best, fanotify (needs privileges), inotify, scan")
      ->envname("DROXA_WATCHER")
      ->transform(CLI::CheckedTransformer(kinds, CLI::ignore_case))
      ->option_text("KIND");
  app.add_option("--cloud", arguments.cloud, "The folder that the drive's cloud is in (default: the home's)")
      ->envname("DROXA_CLOUD")
      ->option_text("DIR");
  app.add_option("--device", arguments.device, "What this device is called (default: the machine's name)")
      ->option_text("NAME");
  app.add_option(
         "--account", arguments.account,
         "The account in the cloud that the drive belongs to (default: as before, else who runs this)")
      ->option_text("NAME");
  app.add_option("--import", arguments.importFrom,
                 "Put the documents of a folder into the cloud, and end; the folder is only read")
      ->option_text("FOLDER");
  app.add_flag("--foreground,!--no-foreground", arguments.foreground,
               "Stay in the foreground, which it always does");
  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError &error) {
    return app.exit(error) == 0 ? EX_OK : 2;
  }
  if (homeOption->count() > 0) arguments.home = home;
  if (!arguments.importFrom.empty()) {
    arguments.importFrom = std::filesystem::absolute(arguments.importFrom).lexically_normal().string();
    return importFolder(arguments);
  }

  // Blocked before the first thread is made, so that they are taken from the descriptor alone.
  sigset_t ending;
  sigemptyset(&ending);
  for (const int signal : {SIGTERM, SIGINT, SIGHUP}) sigaddset(&ending, signal);
  ::pthread_sigmask(SIG_BLOCK, &ending, nullptr);
  ::signal(SIGPIPE, SIG_IGN);
  DroxaRaiseDescriptorLimit();
  ::mallopt(M_ARENA_MAX, 4);  // many short-lived threads would each keep memory of their own
  return serve(arguments, ::signalfd(-1, &ending, SFD_CLOEXEC));
}

}  // namespace
}  // namespace droxa::keld

int main(int argc, char **argv) {
  return droxa::keld::run(argc, argv);
}
