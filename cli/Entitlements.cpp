#include <cerrno>
#include <nlohmann/json.hpp>
#include <sys/syscall.h>
#include <sysexits.h>
#include <unistd.h>
#include <variant>

#include "cli/Commands.h"
#include "cli/ExitStatus.h"
#include "cli/Text.h"
#include "platform/entitlements/ProcessEntitlements.h"

namespace droxa {

namespace {

using Json = nlohmann::ordered_json;

std::string dumped(const Json &json) {
  return json.dump(-1, ' ', false, Json::error_handler_t::replace);
}

const char *kindText(const EntitlementGrant &grant) {
  return grant.kind == EntitlementGrant::Kind::flatpak ? "flatpak" : "executable";
}

Json grantJSON(const EntitlementGrant &grant) {
  Json object{
      {kindText(grant), grant.application}, {"entitlements", grant.entitlements}, {"file", grant.file}};
  for (const auto &[name, value] : grant.values)
    object["values"][name] = std::visit([](const auto &held) { return Json(held); }, value);
  return object;
}

std::string valueText(const EntitlementValue &value) {
  if (const auto *text = std::get_if<std::string>(&value)) return ": " + escapedText(*text);
  const auto *texts = std::get_if<std::vector<std::string>>(&value);
  if (!texts) return "";
  std::string line = ":";
  for (const std::string &text : *texts) line += " " + escapedText(text);
  return line;
}

Json problemsJSON(const std::vector<EntitlementProblem> &problems) {
  Json list = Json::array();
  for (const EntitlementProblem &problem : problems)
    list.push_back({{"file", problem.file}, {"ignored", problem.why}});
  return list;
}

Json grantsJSON(const std::vector<EntitlementGrant> &grants) {
  Json list = Json::array();
  for (const EntitlementGrant &grant : grants) list.push_back(grantJSON(grant));
  return list;
}

void printGrant(std::ostream &out, const EntitlementGrant &grant) {
  out << kindText(grant) << ' ' << escapedText(grant.application) << ", by " << escapedText(grant.file)
      << ":\n";
  for (const std::string &entitlement : grant.entitlements) out << "  " << escapedText(entitlement) << '\n';
  for (const auto &[name, value] : grant.values) out << "  " << escapedText(name) << valueText(value) << '\n';
  if (grant.entitlements.empty() && grant.values.empty()) out << "  nothing\n";
}

void printProblems(std::ostream &out, const std::vector<EntitlementProblem> &problems) {
  for (const EntitlementProblem &problem : problems)
    out << "ignored: " << escapedText(problem.file) << ": " << escapedText(problem.why) << '\n';
}

// As a connection of that process would name it.
NSXPCPeer processPeer(std::int32_t number) {
  NSXPCPeer peer;
  peer.processIdentifier = number;
  peer.processDescriptor = static_cast<int>(syscall(SYS_pidfd_open, number, 0));
  return peer;
}

int showAll(CommandContext &context, bool json) {
  const EntitlementFiles files = EntitlementFiles::processFiles();
  const EntitlementGrants all = files.read();
  if (json) {
    const Json object{{"folder", files.folder()},
                      {"grants", grantsJSON(all.grants)},
                      {"problems", problemsJSON(all.problems)}};
    context.out << dumped(object) << std::endl;
    return kExitSuccess;
  }
  for (const EntitlementGrant &grant : all.grants) printGrant(context.out, grant);
  if (all.grants.empty())
    context.out << "no application is granted anything in " << escapedText(files.folder()) << '\n';
  printProblems(context.out, all.problems);
  context.out.flush();
  return kExitSuccess;
}

void printProcess(std::ostream &out, const ProcessEntitlements &found) {
  const ProcessApplication &application = found.application;
  out << "process " << found.processIdentifier << " is "
      << (application.flatpak ? "the Flatpak application " + escapedText(*application.flatpak)
                              : escapedText(application.executable))
      << '\n';
  for (const EntitlementGrant &grant : found.grants) printGrant(out, grant);
  if (found.grants.empty()) out << "no file grants it anything\n";
  printProblems(out, found.problems);
  out.flush();
}

}  // namespace

int runEntitlements(CommandContext &context, std::optional<std::int32_t> process, bool json) {
  if (!process) return showAll(context, json);
  const NSXPCPeer peer = processPeer(*process);
  const ProcessEntitlements found =
      peer.processDescriptor < 0
          ? ProcessEntitlements{*process, {}, {}, {}, NSError::errorWithPOSIXCode(errno)}
          : EntitlementsOfPeer(peer, EntitlementFiles::processFiles());
  if (peer.processDescriptor >= 0) close(peer.processDescriptor);
  if (found.error) {
    const bool isGone = found.error.code() == ESRCH;
    context.err << "droxa: process " << *process << ": "
                << (isGone ? "there is no such process" : found.error.localizedDescription()) << std::endl;
    return isGone ? EX_NOINPUT : EX_NOPERM;
  }
  if (!json) {
    printProcess(context.out, found);
    return kExitSuccess;
  }
  const ProcessApplication &application = found.application;
  const Json object{
      {"process", found.processIdentifier},
      {"flatpak", application.flatpak ? Json(*application.flatpak) : Json(nullptr)},
      {"executable", application.executable.empty() ? Json(nullptr) : Json(application.executable)},
      {"grants", grantsJSON(found.grants)},
      {"problems", problemsJSON(found.problems)}};
  context.out << dumped(object) << std::endl;
  return kExitSuccess;
}

}  // namespace droxa
