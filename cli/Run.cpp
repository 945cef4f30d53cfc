#include "cli/Run.h"

#include <filesystem>
#include <fstream>
#include <iostream>
#include <pwd.h>
#include <sysexits.h>
#include <unistd.h>

#include "cli/ControlClient.h"
#include "cli/DaemonClient.h"
#include "cli/ExitStatus.h"
#include "cli/HomeCloud.h"
#include "cli/HomeSetup.h"
#include "cli/SampleDrive.h"
#include "cli/Supervisor.h"
#include "cli/Text.h"
#include "platform/foundation/ProcessLock.h"

namespace droxa {

namespace {

namespace fs = std::filesystem;
using namespace std::chrono_literals;

constexpr auto kStartPatience = 30s;
constexpr auto kShowPatience = 10s;
constexpr auto kForever = std::chrono::hours(24 * 365);

std::string programBeside(const char *name) {
  std::error_code code;
  const fs::path self = fs::read_symlink("/proc/self/exe", code);
  return (self.parent_path() / name).native();
}

std::string userName() {
  const passwd *entry = getpwuid(getuid());
  return entry && entry->pw_name && entry->pw_name[0] != '\0' ? entry->pw_name : "me";
}

// A word for a shell.
std::string quoted(const std::string &word) {
  static constexpr char kPlain[] = "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789/._-+:@%,";
  if (!word.empty() && word.find_first_not_of(kPlain) == std::string::npos) return word;
  std::string text = "'";
  for (const char character : word)
    text += character == '\'' ? std::string("'\\''") : std::string(1, character);
  return text + "'";
}

// One run of `droxa run`.
class Run {
 public:
  Run(std::ostream &out, std::ostream &err, DroxaHome home, HomeCloud cloud)
      : out_(out),
        err_(err),
        home_(std::move(home)),
        cloud_(std::move(cloud)),
        supervisor_(err),
        daemon_(QVDaemonConnection::defaultConnection(), 2s) {}

  int serve(const HomeSetup &setup) {
    std::string problem;
    Outcome outcome = startAll(setup.isNew, &problem);
    if (outcome == Outcome::ready) outcome = awaitDocuments(setup.imported);
    if (outcome == Outcome::ready) outcome = awaitMount();
    if (outcome == Outcome::stopped) return kExitSuccess;
    if (outcome == Outcome::failed) {
      supervisor_.stop();
      err_ << "droxa: " << problem << std::endl;
      return EX_UNAVAILABLE;
    }
    printStarted(setup);
    while (!supervisor_.keepRunning(kForever)) {
    }
    out_ << "ending…" << std::endl;
    supervisor_.stop();
    return kExitSuccess;
  }

  void printNextSteps() {
    const std::string droxa = quoted(programBeside("droxa")) + " --home " + quoted(home_.root());
    const std::string &folder = hostStatus_.mountPoint;
    if (!folder.empty())
      out_ << "folder: " << quoted(folder) << "\n";
    else if (!hostStatus_.mountProblem.empty())
      out_ << "folder: none: " << hostStatus_.mountProblem << "\n";
    out_ << "files:  " << documentsFolder(home_.replica(), kDefaultContainer) << "\n"
         << "cloud:  " << cloudFolder(home_, cloud_) << "\n"
         << "next:   " << droxa << " ls -l\n"
         << "        " << droxa << " cat PATH\n"
         << "        " << droxa << " download /\n"
         << "        " << droxa << " watch /\n"
         << "        " << droxa << " status\n";
    out_.flush();
  }

 private:
  enum class Outcome { ready, stopped, failed };

  Outcome startAll(bool isNew, std::string *problem) {
    if (!add("keld", cloud_.keldOptions(), problem)) return Outcome::failed;
    Outcome outcome = await([this] { return !daemon_.status().error; }, problem);
    if (outcome != Outcome::ready) return outcome;
    if (isNew && !signInSomebody(problem)) return Outcome::failed;
    if (!add("fileproviderd", {}, problem)) return Outcome::failed;
    outcome = await([this] { return hostAnswers(); }, problem);
    return outcome;
  }

  bool add(const std::string &name, const std::vector<std::string> &options, std::string *problem) {
    const std::string program = programBeside(name.c_str());
    if (access(program.c_str(), X_OK) != 0) {
      *problem = "there is no program " + program;
      return false;
    }
    std::vector<std::string> command{program, "--home", home_.root()};
    command.insert(command.end(), options.begin(), options.end());
    return supervisor_.add(ChildProcess(name, command, home_.logs() + "/" + name + ".log"), problem);
  }

  // Until `isReady` holds, with the children looked after meanwhile.
  template <class Condition>
  Outcome await(Condition isReady, std::string *problem) {
    const auto until = ChildProcess::Clock::now() + kStartPatience;
    while (ChildProcess::Clock::now() < until) {
      if (isReady()) return Outcome::ready;
      if (supervisor_.keepRunning(50ms)) return Outcome::stopped;
    }
    const ChildProcess &child = supervisor_.children().back();
    *problem = child.name() + " did not get ready within 30 s";
    if (!child.lastEnd().empty()) *problem += " (" + child.lastEnd() + ")";
    *problem += "; its log: " + child.logFile();
    return Outcome::failed;
  }

  // A drive is ready when what was put into its cloud is shown; of very many documents the rest follows.
  Outcome awaitDocuments(std::uint64_t imported) {
    const auto isShown = [this, imported] {
      const auto status = daemon_.status();
      const auto transfers = daemon_.transferStatus();
      return !status.error && !transfers.error && status.value.documents >= imported &&
             transfers.value.uploads.queued + transfers.value.uploads.active == 0;
    };
    const auto until = ChildProcess::Clock::now() + kShowPatience;
    while (imported > 0 && !isShown() && ChildProcess::Clock::now() < until)
      if (supervisor_.keepRunning(50ms)) return Outcome::stopped;
    return Outcome::ready;
  }

  // The folder is there when the drive is said to run; where it can't be, the rest works without it.
  Outcome awaitMount() {
    const auto isSettled = [this] {
      hostAnswers();
      return !hostStatus_.mountPoint.empty() || !hostStatus_.mountProblem.empty();
    };
    const auto until = ChildProcess::Clock::now() + kShowPatience;
    std::error_code code;
    while (fs::exists(home_.mountFile(), code) && !isSettled() && ChildProcess::Clock::now() < until)
      if (supervisor_.keepRunning(50ms)) return Outcome::stopped;
    return Outcome::ready;
  }

  bool signInSomebody(std::string *problem) {
    const auto account = daemon_.account();
    if (!account.error && account.value) return true;
    const auto signedIn = daemon_.signIn(cloud_.account.empty() ? userName() : cloud_.account);
    if (!signedIn.error) return true;
    *problem = "can't sign in: " + signedIn.error.localizedDescription();
    return false;
  }

  // A look at the root starts the extension, so that all three run. Somebody who signed out stays so.
  bool hostAnswers() {
    ControlClient host(std::make_shared<ControlConnectionOverXPC>(home_.hostSocket(), 10s), 10s);
    const NSError error = host.item(NSFileProviderRootContainerItemIdentifier).error;
    const auto status = host.status();
    hostStatus_ = status.value;
    return !status.error && exitStatusForError(error) != EX_UNAVAILABLE &&
           exitStatusForError(error) != EX_TEMPFAIL;
  }

  void printStarted(const HomeSetup &setup) {
    out_ << "drive:  " << home_.root() << " (" << setup.summary << ")\n"
         << "runs:   ";
    for (const ChildProcess &child : supervisor_.children())
      out_ << child.name() << " (" << child.identifier() << "), ";
    out_ << "the extension (" << hostStatus_.extensionProcessIdentifier << "); Ctrl-C ends them\n";
    printNextSteps();
  }

  std::ostream &out_;
  std::ostream &err_;
  const DroxaHome home_;
  const HomeCloud cloud_;
  Supervisor supervisor_;
  DaemonClient daemon_;
  FPDStatus hostStatus_;
};

// A cloud that isn't there yet is made by keld; one that is there has what others put into it.
bool hasCloud(const DroxaHome &home, const HomeCloud &cloud) {
  std::error_code code;
  const fs::directory_iterator entries(cloudFolder(home, cloud), code);
  return !code && entries != fs::directory_iterator();
}

std::optional<HomeSetup> setUp(const DroxaHome &home, const HomeCloud &cloud,
                               const std::optional<std::string> &folder, std::ostream &out, std::ostream &err,
                               std::string *problem) {
  HomeSetupRequest request;
  request.folder = folder;
  request.hasCloudOfOthers = hasCloud(home, cloud);
  request.import = [&](const std::string &source) {
    std::vector<std::string> command{programBeside("keld"), "--home", home.root(), "--import", source};
    const auto options = cloud.keldOptions();
    command.insert(command.end(), options.begin(), options.end());
    return runFolderImport(command, &out == &std::cout && isatty(STDOUT_FILENO) == 1, out, err);
  };
  return setUpHome(home, request, problem);
}

// Tells the host, also one that is started again, where to mount the drive.
bool noteMount(const DroxaHome &home, const RunOptions &options, std::string *problem) {
  std::error_code code;
  fs::remove(home.mountFile(), code);
  if (!options.isMounted) return true;
  const std::string path = options.mount ? fs::absolute(*options.mount, code).lexically_normal().native()
                                         : home.defaultMountPoint();
  std::ofstream file(home.mountFile());
  file << path << std::flush;
  if (file) return true;
  *problem = home.mountFile() + ": can't be written";
  return false;
}

}  // namespace

DroxaHome homeForFolder(const std::string &folder) {
  std::error_code code;
  const fs::path real = fs::weakly_canonical(folder, code);
  const std::string path = code ? folder : real.native();
  std::uint64_t hash = 14695981039346656037U;  // FNV-1a: the same for every run and build
  for (const char character : path) hash = (hash ^ static_cast<unsigned char>(character)) * 1099511628211U;
  std::string text;
  for (int digit = 0; digit < 8; ++digit, hash >>= 4U) text += "0123456789abcdef"[hash & 15U];
  return DroxaHome(DroxaHome::resolve(std::nullopt).root() + "-drives/" + fs::path(path).filename().native() +
                   "-" + text);
}

int runRun(std::ostream &out, std::ostream &err, const RunOptions &options) {
  std::error_code code;
  std::optional<std::string> folder;
  if (options.folder) {
    if (!fs::is_directory(*options.folder, code)) {
      err << "droxa: " << escapedText(*options.folder) << ": "
          << (code ? code.message() : "is not a folder; name the folder whose documents the drive is to have")
          << std::endl;
      return EX_NOINPUT;
    }
    folder = fs::canonical(*options.folder, code).native();
  }
  const bool isNamed = options.home || std::getenv("DROXA_HOME");
  const DroxaHome home = folder && !isNamed ? homeForFolder(*folder) : DroxaHome::resolve(options.home);
  std::string problem;
  if (!home.create(&problem)) {
    err << "droxa: " << problem << std::endl;
    return EX_CANTCREAT;
  }
  DroxaSetProcessHome(home);
  blockSupervisorSignals();

  const auto fail = [&err, &problem](int status) {
    err << "droxa: " << problem << std::endl;
    return status;
  };
  const auto cloud = resolveHomeCloud(home, options.cloud, options.device, options.account, &problem);
  if (!cloud) return fail(EX_CONFIG);
  int holder = 0;
  const auto lock = ProcessLock::acquire(home.run() + "/droxa-run.pid", &holder, &problem);
  Run run(out, err, home, *cloud);
  if (!lock && holder != 0) {
    out << "drive:  " << home.root() << " runs already, under process " << holder << "\n";
    run.printNextSteps();
    return kExitSuccess;
  }
  if (!lock || !rememberHomeCloud(home, *cloud, &problem)) return fail(EX_CANTCREAT);
  if (!noteMount(home, options, &problem)) return fail(EX_CANTCREAT);
  const auto setup = setUp(home, *cloud, folder, out, err, &problem);
  if (!setup) return fail(EX_CANTCREAT);
  if (setup->isStopped) {
    err << "droxa: stopped; the same command goes on with " << escapedText(*folder) << std::endl;
    return kExitInterrupted;
  }
  return run.serve(*setup);
}

}  // namespace droxa
