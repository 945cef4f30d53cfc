#include "cli/CommandLine.h"

#include <CLI/CLI.hpp>
#include <cmath>
#include <iostream>
#include <limits>
#include <signal.h>
#include <unistd.h>

#include "cli/ActionCommands.h"
#include "cli/Commands.h"
#include "cli/ContentsCommands.h"
#include "cli/ExitStatus.h"
#include "cli/ItemArgument.h"
#include "cli/Run.h"
#include "cli/ShareCommands.h"
#include "cli/ThumbnailCommands.h"
#include "platform/foundation/Paths.h"
#include "tessaly/QVDaemonConnection.h"

namespace droxa {

namespace {

constexpr char kFooter[] =
    "Names are printed with control characters, bytes that aren't UTF-8 and backslashes escaped\n"
    "(\"\\n\", \"\\xff\", \"\\\\\"); `ls -0` prints them raw, each ended by a NUL byte.\n"
    "Exit status: 0 done, 1 failed or refused, 2 wrong usage, 66 no such item, 69 a part of the system\n"
    "doesn't run, 73 the disk or the cloud is full, 74 the disk failed, 75 no answer in time or the cloud\n"
    "can't be reached, 77 nobody is signed in or it may not be read or changed, 78 the home's drive is in "
    "another cloud,\n"
    "130 Ctrl-C.";

// What the words of the command line mean.
struct Words {
  std::string home;
  double timeout = 30;
  LsOptions ls;
  TreeOptions tree;
  std::size_t depth = 0;
  std::string argument;
  std::string name;
  std::vector<std::string> items;
  std::string folder, cloud, device, account, mount;
  bool noMount = false;
  std::int32_t process = 0;
  bool json = false;
};

// The command line, and the command that was chosen.
class CommandLine {
 public:
  explicit CommandLine(Words &words)
      : words_(words),
        app_("Shows and changes a Droxa drive: its items, their contents and changes, and what serves it.",
             "droxa") {
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
    contents_.emplace(app_);
    actions_.emplace(app_);
    thumbnails_.emplace(app_);
    sharing_.emplace(app_);
    addSystemCommands();
  }

  CLI::App &app() { return app_; }
  const ContentsCommands &contents() const { return *contents_; }
  const ActionCommands &actions() const { return *actions_; }
  const ThumbnailCommands &thumbnails() const { return *thumbnails_; }
  const ShareCommands &sharing() const { return *sharing_; }
  bool has(const char *command) const { return app_.got_subcommand(command); }
  bool hasAccount(const char *command) const { return account_->got_subcommand(command); }
  bool hasDepth() const { return depth_->count() > 0; }
  bool hasProcess() const { return process_->count() > 0; }

 private:
  void addLs() {
    CLI::App *ls = add("ls", "Lists a folder, page by page");
    ls->add_option("item", words_.ls.argument,
                   std::string("The folder: ") + kItemArgumentHelp + " (default: the root)");
    ls->add_flag(
        "-l,--long", words_.ls.isLong,
        "Permissions, where the contents are, size in bytes, date of change, identifier and name.\n"
        "Contents: \"c\" in the cloud alone, \"-\" here and in the cloud, \"u\" here and not yet in\n"
        "the cloud, \"x\" excluded from sync, \".\" none of its own (folders, links)");
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
    CLI::App *status =
        add("status",
            "Shows what runs, since when, the cloud, the transfers and counts; or, of each item\n"
            "that is named, where its contents are and whether the cloud has them");
    status->add_flag("--json", words_.json, "One JSON object, and one for each item");
    status->add_option("item", words_.items, kItemArgumentHelp);
    CLI::App *entitlements =
        add("entitlements",
            "Shows what a running process is entitled to, and which file says so; or, without one,\n"
            "what the files of /etc/droxa/entitlements.d grant");
    process_ = entitlements->add_option("pid", words_.process, "The process's number")
                   ->type_name("PID")
                   ->check(CLI::Range(1, std::numeric_limits<std::int32_t>::max()));
    entitlements->add_flag("--json", words_.json, "One JSON object");
    addArgument(add("mount",
                    "Shows the drive as a folder, which every program can use, and prints where. Documents\n"
                    "that aren't here are fetched when they are read"),
                "dir", "An empty folder; made if it isn't there (default: ~/Droxa Drive)");
    add("unmount", "Takes the folder off again");
    account_ = add("account", "Shows, signs in or signs out the account");
    account_->add_subcommand("show", "Shows who is signed in")
        ->fallthrough()
        ->add_flag("--json", words_.json, "One JSON object");
    addArgument(account_->add_subcommand("sign-in", "Signs somebody in")->fallthrough(), "name",
                "The account's name", &words_.name)
        ->required();
    account_->add_subcommand("sign-out", "Signs out")->fallthrough();
    addRun();
  }

  void addRun() {
    CLI::App *run =
        add("run",
            "Serves the drive in the foreground: starts keld, fileproviderd and the extension, and\n"
            "keeps them running until Ctrl-C");
    addArgument(
        run, "folder",
        "Put this folder's documents into the drive's cloud first, on a home of its own unless --home\n"
        "names one. The folder is never written to. Default: a small sample drive, when the home and its\n"
        "cloud are new",
        &words_.folder);
    run->add_option(
           "--cloud", words_.cloud,
           "The folder that the drive's cloud is in; several homes may share one, as devices of one\n"
           "drive. The home remembers it (default: the home's own folder \"cloud\")")
        ->envname("DROXA_CLOUD")
        ->type_name("DIR");
    run->add_option("--device", words_.device,
                    "What this device is called, as conflict copies show it; remembered too (default: the\n"
                    "machine's name)")
        ->type_name("NAME");
    run->add_option(
           "--account", words_.account,
           "The account in the cloud that the drive belongs to, remembered too: homes of two accounts\n"
           "on one cloud are two people's (default: who runs it)")
        ->type_name("NAME");
    auto *mount = run->add_option("--mount", words_.mount,
                                  "The folder that shows the drive (default: \"~/Droxa Drive\", or \"Droxa "
                                  "Drive\" in a home\nthat isn't the usual one)")
                      ->type_name("DIR");
    run->add_flag("--no-mount", words_.noMount, "Shows the drive as no folder")->excludes(mount);
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
  std::optional<ContentsCommands> contents_;
  std::optional<ActionCommands> actions_;
  std::optional<ThumbnailCommands> thumbnails_;
  std::optional<ShareCommands> sharing_;
  CLI::App *account_ = nullptr;
  CLI::Option *depth_ = nullptr;
  CLI::Option *process_ = nullptr;
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
  const auto given = [](const std::string &word) {
    return word.empty() ? std::nullopt : std::optional(word);
  };
  const std::optional<std::string> home = given(words.home);
  if (line.has("run"))
    return runRun(out, err,
                  {home, given(words.folder), given(words.cloud), given(words.device), given(words.account),
                   given(words.mount), !words.noMount});

  DroxaSetProcessHome(DroxaHome::resolve(home));
  const std::chrono::milliseconds timeout(std::llround(words.timeout * 1000));
  CommandContext context{
      out,
      err,
      std::make_shared<ControlClient>(
          std::make_shared<ControlConnectionOverXPC>(DroxaProcessHome().hostSocket(), timeout), timeout),
      QVDaemonConnection::defaultConnection(),
      timeout,
      waitForStopSignal,
      &out == &std::cout && isatty(STDOUT_FILENO) == 1};
  if (line.has("ls")) return runLs(context, words.ls);
  if (line.has("stat")) return runStat(context, words.argument, words.json);
  if (line.has("id")) return runId(context, words.argument);
  if (line.has("url")) return runUrl(context, words.argument);
  if (line.has("tree")) {
    TreeOptions options = words.tree;
    if (line.hasDepth()) options.depth = words.depth;
    return runTree(context, options);
  }
  // Before there are threads that could take the signal.
  if (line.has("watch") || line.contents().canBeStopped() || line.actions().canBeStopped() ||
      line.thumbnails().canBeStopped())
    waitForStopSignal(std::chrono::milliseconds(0));
  if (line.has("watch")) return runWatch(context, words.argument, words.json);
  if (line.contents().isChosen()) return line.contents().run(context);
  if (line.actions().isChosen()) return line.actions().run(context);
  if (line.thumbnails().isChosen()) return line.thumbnails().run(context);
  if (line.sharing().isChosen()) return line.sharing().run(context);
  if (line.has("status"))
    return words.items.empty() ? runStatus(context, words.json)
                               : runItemStatus(context, words.items, words.json);
  if (line.has("mount")) return runMount(context, words.argument);
  if (line.has("unmount")) return runUnmount(context);
  if (line.has("entitlements"))
    return runEntitlements(context, line.hasProcess() ? std::optional(words.process) : std::nullopt,
                           words.json);
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
