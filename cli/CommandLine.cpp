#include "cli/CommandLine.h"

#include <CLI/CLI.hpp>
#include <cmath>
#include <signal.h>

#include "cli/Commands.h"
#include "cli/ExitStatus.h"
#include "cli/ItemArgument.h"
#include "cli/Run.h"
#include "platform/foundation/Paths.h"
#include "tessaly/QVDaemonConnection.h"

namespace droxa {

namespace {

constexpr char kFooter[] =
    "Names are printed with control characters, bytes that aren't UTF-8 and backslashes escaped\n"
    "(\"\\n\", \"\\xff\", \"\\\\\"); `ls -0` prints them raw, each ended by a NUL byte.\n"
    "Exit status: 0 done, 1 failed, 2 wrong usage, 66 no such item, 69 a part of the system doesn't run,\n"
    "75 no answer in time, 77 nobody is signed in or it may not be read.";

// What the words of the command line mean.
struct Words {
  std::string home;
  double timeout = 30;
  LsOptions ls;
  TreeOptions tree;
  std::size_t depth = 0;
  std::string argument;
  std::string name;
  std::string folder;
  bool json = false;
};

// The command line, and the command that was chosen.
class CommandLine {
 public:
  explicit CommandLine(Words &words)
      : words_(words), app_("Shows a Droxa drive: its items, their changes, and what serves it.", "droxa") {
    app_.require_subcommand(1);
    app_.fallthrough();
    app_.footer(kFooter);
    app_.add_option("--home", words.home,
                    "The drive's home (default: $DROXA_HOME, else ~/.local/share/droxa)")
        ->type_name("DIR");
    app_.add_option("--timeout", words.timeout, "How long each question may take, in seconds (default: 30)")
        ->type_name("SECONDS")
        ->check(CLI::Range(0.001, 86400.0));
    addLs();
    addItemCommands();
    addSystemCommands();
  }

  CLI::App &app() { return app_; }
  bool has(const char *command) const { return app_.got_subcommand(command); }
  bool hasAccount(const char *command) const { return account_->got_subcommand(command); }
  bool hasDepth() const { return depth_->count() > 0; }

 private:
  void addLs() {
    CLI::App *ls = add("ls", "Lists a folder, page by page");
    ls->add_option("item", words_.ls.argument,
                   std::string("The folder: ") + kItemArgumentHelp + " (default: the root)");
    ls->add_flag("-l,--long", words_.ls.isLong,
                 "Permissions, size in bytes, date of change, identifier and name");
    ls->add_option_function<std::string>(
          "--sort", [this](const std::string &order) { words_.ls.byDate = order == "date"; },
          "By name (bytes), or by date, the newest first")
        ->type_name("name|date")
        ->check(CLI::IsMember({"name", "date"}));
    auto *all = ls->add_flag("--all-folders", words_.ls.allFolders, "Every folder of the drive");
    auto *working =
        ls->add_flag("--working-set", words_.ls.workingSet, "The working set, in the order of its changes");
    auto *json = ls->add_flag("--json", words_.ls.json, "One JSON object a line");
    ls->add_flag("-0,--null", words_.ls.nulls, "Raw names, each ended by a NUL byte")->excludes(json);
    all->excludes(working);
    working->excludes(ls->get_option("--sort"));
    ls->get_option("item")->excludes(all)->excludes(working);
  }

  void addItemCommands() {
    addArgument(add("stat", "Shows an item's properties"), "item", kItemArgumentHelp)->required();
    addArgument(add("id", "Prints the identifier of the item at a path"), "path",
                "A path of the drive or the replica")
        ->required();
    addArgument(add("url", "Prints where an item's file is"), "item", kItemArgumentHelp)->required();
    CLI::App *tree = add("tree", "Shows a folder and all that is below it");
    tree->add_option("item", words_.tree.argument, std::string("The folder: ") + kItemArgumentHelp);
    depth_ = tree->add_option("--depth", words_.depth, "How many levels to show")->type_name("N");
    tree->add_flag("--json", words_.tree.json, "One JSON object a line");
    CLI::App *watch = add("watch",
                          "Prints each change of a folder's children as it happens, until Ctrl-C:\n"
                          "+ added, ~ changed, > renamed, - removed, * listed anew");
    addArgument(watch, "item", kItemArgumentHelp)->required();
    for (const char *command : {"stat", "watch"})
      app_.get_subcommand(command)->add_flag("--json", words_.json, "JSON, one object a line");
  }

  void addSystemCommands() {
    add("status", "Shows what runs, since when, ranks and counts")
        ->add_flag("--json", words_.json, "One JSON object");
    account_ = add("account", "Shows, signs in or signs out the account");
    account_->add_subcommand("show", "Shows who is signed in")
        ->fallthrough()
        ->add_flag("--json", words_.json, "One JSON object");
    addArgument(account_->add_subcommand("sign-in", "Signs somebody in")->fallthrough(), "name",
                "The account's name", &words_.name)
        ->required();
    account_->add_subcommand("sign-out", "Signs out")->fallthrough();
    addArgument(
        add("run",
            "Serves the drive in the foreground: starts keld, fileproviderd and the extension, and\n"
            "keeps them running until Ctrl-C"),
        "folder",
        "Serve a copy of this folder's documents, on a home of its own unless --home names one. The folder\n"
        "is never written to. Default: a small sample drive, when the home is new",
        &words_.folder);
  }

  CLI::App *add(const char *name, const char *description) {
    return app_.add_subcommand(name, description)->fallthrough();
  }
  CLI::Option *addArgument(CLI::App *command, const char *name, const char *help,
                           std::string *value = nullptr) {
    return command->add_option(name, value ? *value : words_.argument, help);
  }

  Words &words_;
  CLI::App app_;
  CLI::App *account_ = nullptr;
  CLI::Option *depth_ = nullptr;
};

// Waits for Ctrl-C or SIGTERM, which are blocked from then on.
bool waitForStopSignal(std::chrono::milliseconds longest) {
  sigset_t signals;
  sigemptyset(&signals);
  sigaddset(&signals, SIGINT);
  sigaddset(&signals, SIGTERM);
  pthread_sigmask(SIG_BLOCK, &signals, nullptr);
  const timespec time{longest.count() / 1000, longest.count() % 1000 * 1'000'000};
  return sigtimedwait(&signals, nullptr, &time) > 0;
}

int runCommand(const CommandLine &line, const Words &words, std::ostream &out, std::ostream &err) {
  const std::optional<std::string> home = words.home.empty() ? std::nullopt : std::optional(words.home);
  if (line.has("run"))
    return runRun(out, err, {home, words.folder.empty() ? std::nullopt : std::optional(words.folder)});

  DroxaSetProcessHome(DroxaHome::resolve(home));
  const std::chrono::milliseconds timeout(std::llround(words.timeout * 1000));
  CommandContext context{
      out,
      err,
      std::make_shared<ControlClient>(
          std::make_shared<ControlConnectionOverXPC>(DroxaProcessHome().hostSocket(), timeout), timeout),
      QVDaemonConnection::defaultConnection(),
      timeout,
      waitForStopSignal};
  if (line.has("ls")) return runLs(context, words.ls);
  if (line.has("stat")) return runStat(context, words.argument, words.json);
  if (line.has("id")) return runId(context, words.argument);
  if (line.has("url")) return runUrl(context, words.argument);
  if (line.has("tree")) {
    TreeOptions options = words.tree;
    if (line.hasDepth()) options.depth = words.depth;
    return runTree(context, options);
  }
  if (line.has("watch")) {
    waitForStopSignal(std::chrono::milliseconds(0));  // before there are threads that could take the signal
    return runWatch(context, words.argument, words.json);
  }
  if (line.has("status")) return runStatus(context, words.json);
  if (line.hasAccount("sign-in")) return runAccountSignIn(context, words.name);
  if (line.hasAccount("sign-out")) return runAccountSignOut(context);
  return runAccountShow(context, words.json);
}

}  // namespace

int droxaMain(int argc, const char *const *argv, std::ostream &out, std::ostream &err) {
  Words words;
  CommandLine line(words);
  try {
    line.app().parse(argc, argv);
  } catch (const CLI::ParseError &error) {
    return line.app().exit(error, out, err) == 0 ? kExitSuccess : kExitUsage;
  }
  return runCommand(line, words, out, err);
}

}  // namespace droxa
