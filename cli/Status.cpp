#include <nlohmann/json.hpp>
#include <sysexits.h>

#include "cli/Commands.h"
#include "cli/ContentsText.h"
#include "cli/DaemonClient.h"
#include "cli/ExitStatus.h"
#include "cli/Text.h"
#include "platform/foundation/NSDate.h"

namespace droxa {

namespace {

using Json = nlohmann::ordered_json;

// What the parts say of themselves; a part that is down has an error instead.
struct SystemStatus {
  CallResult<QVDaemonStatus> daemon;
  CallResult<DaemonClient::Account> account;
  CallResult<QVTransferStatus> transfers;
  CallResult<FPDStatus> host;
  bool isWhole() const { return !daemon.error && !host.error; }
};

SystemStatus gather(CommandContext &context) {
  DaemonClient daemon(context.daemon, context.timeout);
  SystemStatus status;
  status.daemon = daemon.status();
  if (status.daemon.error) {
    // The same wait again would tell nothing new.
    status.account.error = status.transfers.error = status.daemon.error;
  } else {
    status.account = daemon.account();
    status.transfers = daemon.transferStatus();
  }
  status.host = context.host->status();
  return status;
}

std::string processText(std::uint32_t identifier, std::int64_t started) {
  return "process " + std::to_string(identifier) + ", since " + localTimeText(started) + " (" +
         durationText(NSDate::now().nanosecondsSince1970() - started) + ")";
}

constexpr char kIndentation[] = "               ";

void printDaemon(std::ostream &out, const CallResult<QVDaemonStatus> &daemon) {
  if (daemon.error) {
    out << "keld           does not answer: " << explanationOfError(daemon.error) << '\n';
    return;
  }
  const QVDaemonStatus &status = daemon.value;
  out << "keld           " << processText(status.processIdentifier, status.startedNanoseconds) << '\n'
      << kIndentation << "rank " << status.rank << "; " << countText(status.documents, "document") << ", "
      << countText(status.folders, "folder") << ", " << status.aliases
      << (status.aliases == 1 ? " alias" : " aliases") << "; database of " << status.databaseBytes / 1024
      << " KiB\n"
      << kIndentation << "watches by " << escapedText(status.watcher) << "; "
      << countText(status.senders, "update sender") << "; "
      << (status.firstScanDone ? "scanned" : "first scan under way") << ", "
      << countText(status.pendingScans, "folder") << " to look at\n";
}

void printAccount(std::ostream &out, const CallResult<DaemonClient::Account> &account) {
  out << "account        ";
  if (account.error) {
    out << "not known\n";
  } else {
    out << (account.value ? escapedText(account.value->name) : "nobody is signed in") << '\n';
  }
}

void printHost(std::ostream &out, const CallResult<FPDStatus> &host) {
  if (host.error) {
    out << "fileproviderd  does not answer: " << explanationOfError(host.error) << '\n'
        << "extension      not known\n";
    return;
  }
  const FPDStatus &status = host.value;
  out << "fileproviderd  " << processText(status.processIdentifier, status.startedNanoseconds) << '\n'
      << kIndentation << countText(status.followedContainers, "container") << " followed, "
      << countText(status.cachedItems, "item") << " kept, " << countText(status.watchers, "watcher") << ", "
      << countText(status.signals, "signal") << " received\n"
      << "extension      ";
  if (status.extensionProcessIdentifier == 0) {
    out << "not running; it is started when it is needed\n";
  } else {
    out << processText(status.extensionProcessIdentifier, status.extensionStartedNanoseconds) << '\n';
  }
  out << kIndentation << "started " << countText(status.extensionLaunches, "time");
  if (!status.lastExtensionEnd.empty()) out << "; last ended with " << status.lastExtensionEnd;
  out << '\n' << "mount          ";
  if (!status.mountPoint.empty())
    out << escapedText(status.mountPoint) << '\n';
  else
    out << "none" << (status.mountProblem.empty() ? "" : ": " + escapedText(status.mountProblem)) << '\n';
}

Json daemonJSON(const CallResult<QVDaemonStatus> &daemon) {
  if (daemon.error) return {{"running", false}, {"problem", explanationOfError(daemon.error)}};
  const QVDaemonStatus &status = daemon.value;
  return {{"running", true},
          {"process", status.processIdentifier},
          {"started", isoTimeText(status.startedNanoseconds)},
          {"rank", status.rank},
          {"documents", status.documents},
          {"folders", status.folders},
          {"aliases", status.aliases},
          {"pendingScans", status.pendingScans},
          {"senders", status.senders},
          {"watcher", status.watcher},
          {"firstScanDone", status.firstScanDone},
          {"databaseBytes", status.databaseBytes}};
}

Json hostJSON(const CallResult<FPDStatus> &host) {
  if (host.error) return {{"running", false}, {"problem", explanationOfError(host.error)}};
  const FPDStatus &status = host.value;
  return {{"running", true},
          {"process", status.processIdentifier},
          {"started", isoTimeText(status.startedNanoseconds)},
          {"followedContainers", status.followedContainers},
          {"cachedItems", status.cachedItems},
          {"watchers", status.watchers},
          {"signals", status.signals},
          {"mount", status.mountPoint.empty() ? Json(nullptr) : Json(status.mountPoint)},
          {"mountProblem", status.mountProblem}};
}

Json extensionJSON(const CallResult<FPDStatus> &host) {
  if (host.error) return nullptr;
  const FPDStatus &status = host.value;
  Json json{{"running", status.extensionProcessIdentifier != 0}};
  if (status.extensionProcessIdentifier != 0) {
    json["process"] = status.extensionProcessIdentifier;
    json["started"] = isoTimeText(status.extensionStartedNanoseconds);
  }
  json["launches"] = status.extensionLaunches;
  json["lastEnd"] = status.lastExtensionEnd;
  return json;
}

std::string statusJSON(const SystemStatus &status) {
  Json json;
  json["keld"] = daemonJSON(status.daemon);
  json["account"] =
      !status.account.error && status.account.value ? Json(status.account.value->name) : Json(nullptr);
  json["transfers"] =
      status.transfers.error ? Json(nullptr) : Json::parse(transferJSON(status.transfers.value));
  json["fileproviderd"] = hostJSON(status.host);
  json["extension"] = extensionJSON(status.host);
  return json.dump(-1, ' ', false, Json::error_handler_t::replace);
}

}  // namespace

int runStatus(CommandContext &context, bool json) {
  const SystemStatus status = gather(context);
  if (json) {
    context.out << statusJSON(status) << '\n';
  } else {
    printDaemon(context.out, status.daemon);
    printAccount(context.out, status.account);
    if (!status.transfers.error) context.out << transferLines(status.transfers.value);
    printHost(context.out, status.host);
  }
  context.out.flush();
  return status.isWhole() ? kExitSuccess : EX_UNAVAILABLE;
}

}  // namespace droxa
