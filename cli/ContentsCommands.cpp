#include "cli/ContentsCommands.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cmath>

#include "cli/ItemArgument.h"

namespace droxa {

namespace {

constexpr const char *kCommands[] = {"cat", "open", "download", "evict", "pin", "unpin", "wait", "deletions"};
// Reading ends with its process, as any command of a pipe.
constexpr const char *kStoppable[] = {"download", "evict", "wait", "deletions"};

}  // namespace

ContentsCommands::ContentsCommands(CLI::App &app) : app_(app) {
  add("cat",
      "Fetches documents' contents where they aren't here, and writes them out; nothing of a document is\n"
      "written before the whole of it is here",
      "A document", true);
  add("open",
      "Fetches documents and opens each with the program for its kind (xdg-open); where there is no such\n"
      "program, says where the document is",
      "A document, or a folder, which isn't fetched", true);
  add("download",
      "Fetches what isn't here: a document, or everything below a folder. Shows how far it is, in one line\n"
      "on a terminal. Ctrl-C cancels; the same command goes on where it was",
      "A document or a folder", true);
  add("evict",
      "Lets go of local contents, which the cloud keeps: a document's, or everything's below a folder. What\n"
      "the cloud doesn't have yet, what a program has open and what is pinned stays, and is listed; the "
      "exit\n"
      "status is then 1",
      "A document or a folder", true);
  add("pin",
      "Keeps contents here: they are fetched and never let go of. A folder pins what comes into it too",
      "A document or a folder", true);
  add("unpin", "Ends that; the contents stay until they are let go of", "A document or a folder", true);
  addWait();
  addDeletions();
}

CLI::App *ContentsCommands::add(const char *name, const char *description, const char *help, bool needsOne) {
  CLI::App *command = app_.add_subcommand(name, description)->fallthrough();
  command->add_option("item", arguments_, std::string(help) + ": " + kItemArgumentHelp)->required(needsOne);
  if (std::string(name) != "cat") command->add_flag("--json", json_, "One JSON object a line");
  return command;
}

void ContentsCommands::addWait() {
  CLI::App *wait = add("wait",
                       "Returns when everything that was changed here is safe in the cloud, or says what\n"
                       "can't be",
                       "What is waited for (default: the whole drive)", false);
  wait->add_option("--timeout", waitSeconds_, "Gives up after that long, with status 75 (default: never)")
      ->type_name("SECONDS")
      ->check(CLI::Range(0.001, 86400.0 * 365));
}

void ContentsCommands::addDeletions() {
  deletions_ = app_.add_subcommand("deletions",
                                   "Shows how many deletions are held: many at once may be an accident, so\n"
                                   "they aren't carried out in the cloud before they are answered")
                   ->fallthrough();
  deletions_->require_subcommand(0, 1);
  deletions_->add_flag("--json", json_, "One JSON object");
  deletions_->add_subcommand("carry-out", "Deletes them in the cloud, and so on every device")->fallthrough();
  deletions_->add_subcommand("restore", "Brings what was deleted back here")->fallthrough();
}

bool ContentsCommands::has(const char *command) const {
  return app_.got_subcommand(command);
}

bool ContentsCommands::isChosen() const {
  return std::any_of(std::begin(kCommands), std::end(kCommands),
                     [this](const char *command) { return has(command); });
}

bool ContentsCommands::canBeStopped() const {
  return std::any_of(std::begin(kStoppable), std::end(kStoppable),
                     [this](const char *command) { return has(command); });
}

int ContentsCommands::run(CommandContext &context) const {
  if (has("cat")) return runCat(context, arguments_);
  if (has("open")) return runOpen(context, arguments_, json_);
  if (has("download")) return runDownload(context, arguments_, json_);
  if (has("evict")) return runEvict(context, arguments_, json_);
  if (has("pin")) return runPin(context, arguments_, true, json_);
  if (has("unpin")) return runPin(context, arguments_, false, json_);
  if (has("wait")) {
    WaitOptions options{arguments_, std::nullopt, json_};
    if (waitSeconds_ > 0) options.timeout = std::chrono::milliseconds(std::llround(waitSeconds_ * 1000));
    return runWait(context, options);
  }
  if (deletions_->got_subcommand("carry-out")) return runDeletions(context, DeletionsAnswer::carryOut, json_);
  if (deletions_->got_subcommand("restore")) return runDeletions(context, DeletionsAnswer::restore, json_);
  return runDeletions(context, DeletionsAnswer::none, json_);
}

}  // namespace droxa
