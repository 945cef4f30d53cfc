#include "cli/ShareClient.h"

#include <nlohmann/json.hpp>
#include <sys/syscall.h>
#include <unistd.h>

#include "cli/ShareConnection.h"
#include "platform/entitlements/ProcessEntitlements.h"
#include "tessaly/QVCClientPrivilegesDescriptor.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVSharingService.h"
#include "tessaly/xpc/QVCXPCSharingOperationInterface.h"
#include "tessaly/xpc/QVSharingServiceInterface.h"

namespace droxa {

namespace {

constexpr char kShareOperations[] = "com.quorva.Tessaly.private.SharingOperation";
using Operations = QVShareOperationProtocol;
using Share = std::optional<CKShare>;

// A missing share where one was promised is an error too.
CallResult<CKShare> present(const Share &share, const NSError &error) {
  if (error || share) return {share.value_or(CKShare()), error};
  return {{}, NSError(NSCocoaErrorDomain, NSXPCConnectionReplyInvalid)};
}

CallResult<CKShareParticipant> lookUpThrough(ShareConnection &connection, const std::string &nameOrHandle) {
  CKShareParticipant asked;
  asked.userIdentity.accountName = nameOrHandle;
  return connection.ask<CKShareParticipant, Operations>([&](Operations &remote, auto slot) {
    remote.startOperation_toLookupShareParticipants(
        nullptr, QVShareParticipants({asked}),
        [slot, nameOrHandle](const QVShareParticipants &found, const NSError &error) {
          if (found && !found->empty()) return slot->put({found->front(), NSError()});
          const NSError nobody = qvc_error(QVErrorNoSuchItem, "nobody is known as " + nameOrHandle);
          slot->put({{}, error ? error : nobody});
        });
    return nullptr;
  });
}

class DocumentShare final : public ShareClient {
 public:
  DocumentShare(CommandContext &context, std::string identifier)
      : context_(context), identifier_(std::move(identifier)) {}
  NSError open() {
    return connection_.open(context_, QVSharingServiceName, identifier_, getSharingServiceInterface());
  }

  CallResult<CKShare> fetch() override {
    return connection_.ask<CKShare, QVSharingService>([](QVSharingService &remote, auto slot) {
      return remote.fetchShareWithCompletion(
          [slot](const Share &share, const NSError &error) { slot->put(present(share, error)); });
    });
  }
  CallResult<CKShare> save(const CKShare &share) override {
    return connection_.ask<CKShare, QVSharingService>([&](QVSharingService &remote, auto slot) {
      return remote.saveShare(
          share, [slot](const Share &saved, const NSError &error) { slot->put(present(saved, error)); });
    });
  }
  CallResult<NSURL> link(const CKShare & /*share*/) override {
    return connection_.ask<NSURL, QVSharingService>([](QVSharingService &remote, auto slot) {
      return remote.fetchShareURLWithCompletion([slot](const NSURL &url, const NSError &error) {
        slot->put({url, error});
      });
    });
  }
  NSError withdraw(const CKShare & /*share*/) override {
    const auto gone = connection_.ask<bool, QVSharingService>([](QVSharingService &remote, auto slot) {
      return remote.unshareWithCompletion([slot](const NSError &error) { slot->put({true, error}); });
    });
    return gone.error;
  }
  CallResult<CKShareParticipant> lookUp(const std::string &nameOrHandle) override {
    ShareConnection operations;
    const NSError error =
        operations.open(context_, kShareOperations, identifier_, QVCXPCSharingOperationInterface());
    if (error) return {{}, error};
    const auto found = lookUpThrough(operations, nameOrHandle);
    if (!qv_isTessalyErrorCode(found.error, QVErrorPrivilegeRequired)) return found;
    CKShareParticipant named;
    const bool isHandle = nameOrHandle.find('@') != std::string::npos;
    (isHandle ? named.userIdentity.handle : named.userIdentity.accountName) = nameOrHandle;
    return {named, NSError()};
  }

 private:
  CommandContext &context_;
  const std::string identifier_;
  ShareConnection connection_;
};

class FolderShare final : public ShareClient {
 public:
  explicit FolderShare(const NSURL &url) : url_(url) {}
  NSError open(CommandContext &context, const std::string &identifier) {
    return connection_.open(context, kShareOperations, identifier, QVCXPCSharingOperationInterface());
  }

  CallResult<CKShare> fetch() override {
    const auto there = connection_.ask<CKShare, Operations>([&](Operations &remote, auto slot) {
      remote.startOperation_toCopySharingInfoAtURL(
          nullptr, url_, [slot](const Share &share, const NSURL &, const NSError &error) {
            slot->put(present(share, error));
          });
      return nullptr;
    });
    if (!qv_isTessalyErrorCode(there.error, QVErrorNoShare)) return there;
    return connection_.ask<CKShare, Operations>([&](Operations &remote, auto slot) {
      remote.createSharingInfoForURL(
          url_, [slot](const Share &share, const NSError &error) { slot->put(present(share, error)); });
      return nullptr;
    });
  }
  CallResult<CKShare> save(const CKShare &share) override {
    return connection_.ask<CKShare, Operations>([&](Operations &remote, auto slot) {
      remote.startOperation_toSaveSharingInfo(
          nullptr, share,
          [slot](const Share &saved, const NSError &error) { slot->put(present(saved, error)); });
      return nullptr;
    });
  }
  CallResult<NSURL> link(const CKShare &share) override {
    return connection_.ask<NSURL, Operations>([&](Operations &remote, auto slot) {
      remote.startOperation_toCopyShareURLForShare(
          nullptr, share, std::nullopt, [slot](const Share &, const NSURL &url, const NSError &error) {
            slot->put({url, error});
          });
      return nullptr;
    });
  }
  NSError withdraw(const CKShare &share) override {
    const auto gone = connection_.ask<bool, Operations>([&](Operations &remote, auto slot) {
      remote.startOperation_toUnshareShare(nullptr, share, false, [slot](const NSError &error) {
        slot->put({true, error});
      });
      return nullptr;
    });
    return gone.error;
  }
  CallResult<CKShareParticipant> lookUp(const std::string &nameOrHandle) override {
    return lookUpThrough(connection_, nameOrHandle);
  }

 private:
  const NSURL url_;
  ShareConnection connection_;
};

// The entitlement for the privilege that the refusal names.
const char *missingEntitlement(const NSError &error) {
  const std::string text = error.localizedDescription();
  if (text.starts_with("isFolderSharingProxyEntitled")) return QVFolderSharingProxyEntitlement;
  if (text.starts_with("isSharingPrivateInterfaceEntitled")) return QVSharingPrivateInterfaceEntitlement;
  return QVSharingProxyEntitlement;
}

}  // namespace

CallResult<std::unique_ptr<ShareClient>> documentShare(CommandContext &context,
                                                       const std::string &identifier) {
  auto made = std::make_unique<DocumentShare>(context, identifier);
  if (const NSError error = made->open()) return {nullptr, error};
  return {std::move(made), NSError()};
}

CallResult<std::unique_ptr<ShareClient>> folderShare(CommandContext &context, const std::string &identifier,
                                                     const NSURL &url) {
  auto made = std::make_unique<FolderShare>(url);
  if (const NSError error = made->open(context, identifier)) return {nullptr, error};
  return {std::move(made), NSError()};
}

std::string privilegeAdvice(const NSError &error) {
  if (!qv_isTessalyErrorCode(error, QVErrorPrivilegeRequired)) return {};
  NSXPCPeer self;
  self.processIdentifier = getpid();
  self.processDescriptor = static_cast<int>(syscall(SYS_pidfd_open, getpid(), 0));
  const EntitlementFiles files = EntitlementFiles::processFiles();
  const ProcessApplication application = EntitlementsOfPeer(self, files).application;
  if (self.processDescriptor >= 0) close(self.processDescriptor);
  const char *entitlement = missingEntitlement(error);
  const nlohmann::ordered_json grant{{application.flatpak ? "flatpak" : "executable",
                                      application.flatpak ? *application.flatpak : application.executable},
                                     {"entitlements", {entitlement}}};
  const nlohmann::ordered_json contents{{"applications", nlohmann::ordered_json::array({grant})}};
  return "this program isn't entitled to " + std::string(entitlement) +
         ". An administrator grants it with a file " + files.folder() +
         "/droxa-share.json, owned by root and writable by nobody else, that holds\n" +
         contents.dump(-1, ' ', false, nlohmann::ordered_json::error_handler_t::replace);
}

}  // namespace droxa
