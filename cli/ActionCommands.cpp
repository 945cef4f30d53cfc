#include "cli/ActionCommands.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <limits>

#include "cli/ExitStatus.h"
#include "cli/ItemArgument.h"

namespace droxa {

namespace {

constexpr const char *kCommands[] = {"import", "mkdir", "rename", "mv",       "trash", "restore",
                                     "rm",     "tag",   "untag",  "favorite", "used"};
constexpr const char *kStoppable[] = {"import", "mv", "rm"};

}  // namespace

ActionCommands::ActionCommands(CLI::App &app) : app_(app) {
  addPlaces();
  addTrash();
  addNotes();
}

CLI::App *ActionCommands::add(const char *name, const char *description) {
  CLI::App *command = app_.add_subcommand(name, description)->fallthrough();
  command->add_flag("--json", json_, "The item that came back, as one JSON object a line");
  return command;
}

CLI::Option *ActionCommands::addItem(CLI::App *command, const char *help) {
  return command->add_option("item", argument_, std::string(help) + ": " + kItemArgumentHelp)->required();
}

CLI::Option *ActionCommands::addItems(CLI::App *command, const char *name, const std::string &help) {
  return command->add_option(name, arguments_, help)->required();
}

void ActionCommands::addPlaces() {
  addItems(add("import",
               "Copies files and folders of this machine into a folder of the drive; shows how far it is.\n"
               "Nothing is overwritten. Ctrl-C cancels and leaves nothing half done"),
           "file", "Files or folders of this machine, and last the folder of the drive")
      ->type_name("FILE... FOLDER");
  CLI::App *mkdir = add("mkdir", "Makes folders");
  addItems(mkdir, "path", "A path of the drive, or one inside the replica");
  mkdir->add_flag("-p,--parents", withParents_,
                  "Makes those above it too, and is content with what is there");
  CLI::App *rename = add("rename", "Gives an item another name, in its folder");
  addItem(rename, "The item");
  rename->add_option("name", name_, "The new name: up to 255 bytes, any but '/'")->required();
  addItems(add("mv",
               "Moves items into a folder, or one item to a new name in a folder. What has to be downloaded\n"
               "for that is, first, and shows how far it is. Nothing is overwritten; Ctrl-C cancels"),
           "item", std::string("Items, each ") + kItemArgumentHelp + "; and last where they go")
      ->type_name("ITEM... FOLDER|NEWPATH");
}

void ActionCommands::addTrash() {
  addItems(add("trash", "Moves items into the trash, which `droxa ls .Trash` shows"), "item",
           kItemArgumentHelp);
  CLI::App *restore =
      add("restore",
          "Brings items back from the trash: to where they were, or into a folder. A name that\n"
          "is taken there gets a number");
  addItems(restore, "item", "\".Trash/NAME\", as the drive shows it, or an identifier");
  restore->add_option("--to", folder_, "The folder that they go to")->type_name("FOLDER");
  CLI::App *rm = add("rm", "Deletes items for good, on all devices; `droxa trash` can be taken back");
  addItems(rm, "item", kItemArgumentHelp);
  rm->add_flag("-r,--recursive", withContents_, "Folders too, with everything below them");
}

void ActionCommands::addNotes() {
  CLI::App *tag = add("tag", "Adds tags to an item; without names, shows those it has");
  addItem(tag, "The item");
  tag->add_option("name", names_, "The tags");
  CLI::App *untag = add("untag", "Removes tags from an item");
  addItem(untag, "The item");
  auto *names = untag->add_option("name", names_, "The tags");
  auto *all = untag->add_flag("--all", none_, "All of them")->excludes(names);
  untag->require_option(1, 0);
  untag->callback([names, all] {
    if (!*names && !*all) throw CLI::RequiredError("a tag, or --all");
  });
  CLI::App *favorite = add("favorite", "Makes an item a favourite with that rank, or none any more");
  addItem(favorite, "The item");
  auto *rank = favorite->add_option("rank", rank_, "From 1 on")
                   ->check(CLI::Range(std::uint64_t{1}, std::numeric_limits<std::uint64_t>::max()));
  auto *none = favorite->add_flag("--none", none_, "No favourite")->excludes(rank);
  favorite->callback([rank, none] {
    if (!*rank && !*none) throw CLI::RequiredError("a rank, or --none");
  });
  CLI::App *used = add("used", "Notes when an item was last used");
  addItem(used, "The item");
  auto *date = used->add_option(
      "date", date_,
      "2026-01-31, 2026-01-31T12:00, 2026-01-31T12:00:00Z; without a zone it is local (default: now)");
  used->add_flag("--never", none_, "Never")->excludes(date);
}

bool ActionCommands::has(const char *command) const {
  return app_.got_subcommand(command);
}

bool ActionCommands::isChosen() const {
  return std::any_of(std::begin(kCommands), std::end(kCommands),
                     [this](const char *command) { return has(command); });
}

bool ActionCommands::canBeStopped() const {
  return std::any_of(std::begin(kStoppable), std::end(kStoppable),
                     [this](const char *command) { return has(command); });
}

// The last argument of `import` and `mv` is the place.
int ActionCommands::runToFolder(CommandContext &context) const {
  if (arguments_.size() < 2) {
    context.err << "droxa: it needs the items, and last where they go" << std::endl;
    return kExitUsage;
  }
  const std::vector<std::string> items(arguments_.begin(), arguments_.end() - 1);
  return has("import") ? runImport(context, items, arguments_.back(), json_)
                       : runMv(context, items, arguments_.back(), json_);
}

int ActionCommands::run(CommandContext &context) const {
  const auto folder = folder_.empty() ? std::nullopt : std::optional(folder_);
  if (has("import") || has("mv")) return runToFolder(context);
  if (has("mkdir")) return runMkdir(context, arguments_, withParents_, json_);
  if (has("rename")) return runRename(context, argument_, name_, json_);
  if (has("trash")) return runTrash(context, arguments_, json_);
  if (has("restore")) return runRestore(context, arguments_, folder, json_);
  if (has("rm")) return runRm(context, arguments_, withContents_, json_);
  if (has("tag")) return runTag(context, argument_, names_, json_);
  if (has("untag")) return runUntag(context, argument_, names_, json_);
  if (has("favorite"))
    return runFavorite(context, argument_, none_ ? std::nullopt : std::optional(rank_), json_);
  return runUsed(context, {argument_, date_, none_, json_});
}

}  // namespace droxa
