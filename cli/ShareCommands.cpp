#include "cli/ShareCommands.h"

#include <CLI/CLI.hpp>

#include "cli/ExitStatus.h"
#include "cli/ItemArgument.h"
#include "cli/ShareText.h"
#include "cli/Text.h"

namespace droxa {

namespace {

constexpr char kPermissions[] = "read-only|read-write|none";

}  // namespace

ShareCommands::ShareCommands(CLI::App &app) : app_(app) {
  share_ = app_.add_subcommand(
                   "share",
                   "Shows whether an item is shared, with whom and how, or changes that. Documents are\n"
                   "shared by anybody; folders by programs that are entitled to it")
               ->fallthrough();
  share_->require_subcommand(0, 1);
  share_->add_option("item", arguments_.item, kItemArgumentHelp);
  share_->add_flag("--json", arguments_.json, "One JSON object");
  add("create", "Shares an item, with nobody yet");
  add("link", "Prints the link by which others reach what is shared");
  add("participants", "Shows with whom it is shared");
  addChanges();
  CLI::App *accept =
      share_->add_subcommand("accept", "Takes what somebody shares, by its link; prints where it is then")
          ->fallthrough();
  accept->add_option("url", url_, "The link")->required();
  accept->add_flag("--json", arguments_.json, "One JSON object");
}

CLI::App *ShareCommands::add(const char *name, const char *description) {
  CLI::App *command = share_->add_subcommand(name, description)->fallthrough();
  command->add_option("item", arguments_.item, kItemArgumentHelp)->required();
  command->add_flag("--json", arguments_.json, "One JSON object");
  return command;
}

void ShareCommands::addChanges() {
  CLI::App *added = add("add", "Shares it with people too, who may change it unless told otherwise");
  added->add_option("name", names_, "Account names or handles")->required();
  added->add_flag("--read-only", readOnly_, "They may only read it");
  CLI::App *permission = add("permission", "Says what a participant may do, or everybody who has the link");
  auto *named = permission->add_option("permission", permission_, std::string("NAME ") + kPermissions)
                    ->type_name("")
                    ->expected(0, 2);
  permission->add_option("--everyone", everyone_, "Of everybody who has the link")
      ->type_name(kPermissions)
      ->check(CLI::IsMember({"read-only", "read-write", "none"}))
      ->excludes(named);
  CLI::App *save = add("save", "Gives the share another title");
  save->add_option("--title", title_, "What people call it")->required();
  CLI::App *remove = add("remove",
                         "Takes a participant out; without a name, ends the sharing, or leaves what\n"
                         "somebody else shares");
  remove_ = remove->add_option("name", name_, "The participant's account name or handle");
}

bool ShareCommands::has(const char *command) const {
  return share_->got_subcommand(command);
}

bool ShareCommands::isChosen() const {
  return app_.got_subcommand("share");
}

int ShareCommands::runPermission(CommandContext &context) const {
  if (!everyone_.empty())
    return runSharePermission(context, arguments_, std::nullopt, *permissionOfText(everyone_));
  const auto permission = permission_.size() == 2 ? permissionOfText(permission_[1]) : std::nullopt;
  if (permission) return runSharePermission(context, arguments_, permission_[0], *permission);
  context.err << "droxa: share permission: give NAME and " << kPermissions << ", or --everyone "
              << kPermissions << std::endl;
  return kExitUsage;
}

int ShareCommands::run(CommandContext &context) const {
  if (has("accept")) return runShareAccept(context, url_, arguments_.json);
  if (arguments_.item.empty()) {
    context.err << "droxa: share: which item? `droxa share --help` shows what there is" << std::endl;
    return kExitUsage;
  }
  if (has("create")) return runShareCreate(context, arguments_);
  if (has("link")) return runShareLink(context, arguments_);
  if (has("participants")) return runShareParticipants(context, arguments_);
  if (has("add"))
    return runShareAdd(
        context, arguments_, names_,
        readOnly_ ? CKShareParticipantPermission::readOnly : CKShareParticipantPermission::readWrite);
  if (has("permission")) return runPermission(context);
  if (has("save")) return runShareSave(context, arguments_, title_);
  if (has("remove"))
    return runShareRemove(context, arguments_, remove_->count() > 0 ? std::optional(name_) : std::nullopt);
  return runShareShow(context, arguments_);
}

}  // namespace droxa
