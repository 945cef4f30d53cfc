#include <nlohmann/json.hpp>

#include "cli/Commands.h"
#include "cli/DaemonClient.h"
#include "cli/ExitStatus.h"
#include "cli/HomeCloud.h"
#include "cli/Text.h"

namespace droxa {

int runAccountShow(CommandContext &context, bool json) {
  const auto account = DaemonClient(context.daemon, context.timeout).account();
  if (account.error) return reportError(context, "the account", account.error);
  const std::string drive = rememberedAccount(DroxaProcessHome());
  if (json) {
    nlohmann::ordered_json object;
    object["account"] =
        account.value ? nlohmann::ordered_json(account.value->name) : nlohmann::ordered_json(nullptr);
    if (!drive.empty()) object["driveAccount"] = drive;
    context.out << object.dump(-1, ' ', false, nlohmann::ordered_json::error_handler_t::replace) << std::endl;
  } else if (account.value) {
    context.out << escapedText(account.value->name);
    if (!drive.empty() && drive != account.value->name)
      context.out << " (the drive is the account " << escapedText(drive) << "'s)";
    context.out << std::endl;
  } else {
    context.out << "nobody is signed in; `droxa account sign-in NAME` signs somebody in" << std::endl;
  }
  return kExitSuccess;
}

int runAccountSignIn(CommandContext &context, const std::string &name) {
  const auto account = DaemonClient(context.daemon, context.timeout).signIn(name);
  if (account.error) return reportError(context, "signing in as \"" + name + "\"", account.error);
  context.out << "signed in as " << escapedText(account.value ? account.value->name : name) << std::endl;
  return kExitSuccess;
}

int runAccountSignOut(CommandContext &context) {
  const NSError error = DaemonClient(context.daemon, context.timeout).signOut();
  if (error) return reportError(context, "signing out", error);
  context.out << "signed out" << std::endl;
  return kExitSuccess;
}

}  // namespace droxa
