#include "sharing/QVFileProviderShareOperationProxy.h"

#include <tuple>
#include <type_traits>
#include <utility>

#include "additions/QVLogSection.h"
#include "sharing/_QVFileProviderShareOperationWrapper.h"
#include "tessaly/QVDaemonConnection.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVLog.h"

// The name of a method as its log lines show it, and the name of its reply.
#define METHOD_NAMES(selector)                         \
  "-[QVFileProviderShareOperationProxy " selector "]", \
      "-[QVFileProviderShareOperationProxy " selector "]_block_invoke"

namespace droxa {
namespace {

template <class... Values>
void LogReply(const char *name, const Values &...values) {
  static_assert(sizeof...(Values) <= 3 || sizeof...(Values) == 5);
  if constexpr (sizeof...(Values) == 1) {
    os_log_info(qvc_default_log(), "[INFO] %s: reply(%@)", name, values...);
  } else if constexpr (sizeof...(Values) == 2) {
    os_log_info(qvc_default_log(), "[INFO] %s: reply(%@, %@)", name, values...);
  } else if constexpr (sizeof...(Values) == 3) {
    os_log_info(qvc_default_log(), "[INFO] %s: reply(%@, %@, %@)", name, values...);
  } else {
    os_log_info(qvc_default_log(), "[INFO] %s: reply(%@, %@, %@, %@, %@)", name, values...);
  }
}

}  // namespace

struct QVFileProviderShareOperationProxy::Privilege {
  bool (QVCClientPrivilegesDescriptor::*isEntitled)() const;
  const char *name;
};
const QVFileProviderShareOperationProxy::Privilege QVFileProviderShareOperationProxy::kSharingProxy = {
    &QVCClientPrivilegesDescriptor::isSharingProxyEntitled, "isSharingProxyEntitled"};
const QVFileProviderShareOperationProxy::Privilege
    QVFileProviderShareOperationProxy::kSharingPrivateInterface = {
        &QVCClientPrivilegesDescriptor::isSharingPrivateInterfaceEntitled,
        "isSharingPrivateInterfaceEntitled"};
const QVFileProviderShareOperationProxy::Privilege QVFileProviderShareOperationProxy::kFolderSharingProxy = {
    &QVCClientPrivilegesDescriptor::isFolderSharingProxyEntitled, "isFolderSharingProxyEntitled"};

QVFileProviderShareOperationProxy::QVFileProviderShareOperationProxy(
    std::shared_ptr<NSFileProviderExtension> extension, std::string itemIdentifier,
    std::shared_ptr<NSOperationQueue> operationQueue,
    std::shared_ptr<const QVCClientPrivilegesDescriptor> clientPriviledgesDescriptor)
    : _fileProviderExtension(std::move(extension)),
      _itemIdentifier(std::move(itemIdentifier)),
      _operationQueue(std::move(operationQueue)),
      _clientPriviledgesDescriptor(std::move(clientPriviledgesDescriptor)) {}

// The client's connection has ended, which nobody else of whom the daemon knows would tell it.
QVFileProviderShareOperationProxy::~QVFileProviderShareOperationProxy() {
  std::vector<std::weak_ptr<_QVFileProviderShareOperationWrapper>> operations;
  {
    const Lock lock(_lock);
    operations.swap(_operations);
  }
  for (const auto &one : operations)
    if (const auto operation = one.lock()) operation->abandon();
}

std::shared_ptr<QVOperationClient> QVFileProviderShareOperationProxy::wrapped(
    const Operation &operation) const {
  auto wrapper = std::make_shared<_QVFileProviderShareOperationWrapper>(operation);
  const Lock lock(_lock);
  std::erase_if(_operations, [](const auto &one) { return one.expired(); });
  _operations.push_back(wrapper);
  return wrapper;
}

std::shared_ptr<QVFileProviderXPCAutomaticErrorProxy> QVFileProviderShareOperationProxy::remoteObject() {
  constexpr char name[] = "deamon connection";  // so spelt on purpose: logs are searched for it
  return std::make_shared<QVFileProviderXPCAutomaticErrorProxy>(
      [connection = QVDaemonConnection::defaultConnection()](NSXPCErrorHandler handler) {
        return connection->remoteObjectProxyWithErrorHandler(std::move(handler));
      },
      nullptr, name, 0);
}

// All twelve calls. The section ends when the call has been passed on, mostly before the reply comes.
template <class Method, class... Values, class... Arguments>
void QVFileProviderShareOperationProxy::forward(const char *name, const char *replyName,
                                                const Privilege &privilege, Method method,
                                                const std::function<void(Values...)> &reply,
                                                Arguments &&...arguments) const {
  const QVLogSection section(true);
  os_log_info(qvc_default_log(), "[INFO] ┏%llx %s ", section.tag(), name);
  const std::function<void(Values...)> answer = [replyName, reply](Values... values) {
    LogReply(replyName, values...);
    reply(values...);
  };
  if (!((*_clientPriviledgesDescriptor).*privilege.isEntitled)()) {
    std::tuple<std::decay_t<Values>...> nothing{};
    std::get<sizeof...(Values) - 1>(nothing) = qv_errorWithDomain(
        QVTessalyErrorDomain, QVErrorPrivilegeRequired, "%s privilege required", privilege.name);
    std::apply(answer, nothing);
    return;
  }
  // The daemon never gets a client's operation itself.
  [[maybe_unused]] const auto passed = [this]<class Argument>(const Argument &argument) -> decltype(auto) {
    if constexpr (std::is_same_v<Argument, Operation>) {
      return wrapped(argument);
    } else {
      return (argument);
    }
  };
  remoteObject()->call(method, answer, passed(arguments)...);
}

void QVFileProviderShareOperationProxy::startOperation_toCopySharingInfoAtURL(Operation op, const NSURL &url,
                                                                              QVShareAndURLReply reply) {
  forward(METHOD_NAMES("startOperation:toCopySharingInfoAtURL:reply:"), kSharingProxy,
          &QVProtocol::startOperation_toCopySharingInfoAtURL, reply, op, url);
}

void QVFileProviderShareOperationProxy::startOperation_toCopyShareURLForShare(
    Operation op, const std::optional<CKShare> &share, const std::optional<std::string> &appName,
    QVShareAndURLReply reply) {
  forward(METHOD_NAMES("startOperation:toCopyShareURLForShare:appName:reply:"), kSharingProxy,
          &QVProtocol::startOperation_toCopyShareURLForShare, reply, op, share, appName);
}

void QVFileProviderShareOperationProxy::startOperation_toSaveSharingInfo(Operation op,
                                                                         const std::optional<CKShare> &share,
                                                                         QVShareReply reply) {
  forward(METHOD_NAMES("startOperation:toSaveSharingInfo:reply:"), kSharingProxy,
          &QVProtocol::startOperation_toSaveSharingInfo, reply, op, share);
}

void QVFileProviderShareOperationProxy::createSharingInfoForURL(const NSURL &url, QVShareReply reply) {
  forward(METHOD_NAMES("createSharingInfoForURL:reply:"), kSharingProxy, &QVProtocol::createSharingInfoForURL,
          reply, url);
}

void QVFileProviderShareOperationProxy::startOperation_toUnshareShare(Operation op,
                                                                      const std::optional<CKShare> &share,
                                                                      bool forceDelete,
                                                                      QVShareOutcomeReply reply) {
  forward(METHOD_NAMES("startOperation:toUnshareShare:forceDelete:reply:"), kSharingProxy,
          &QVProtocol::startOperation_toUnshareShare, reply, op, share, forceDelete);
}

void QVFileProviderShareOperationProxy::startOperation_toModifyRecordAccessAtURL(Operation op,
                                                                                 const NSURL &url,
                                                                                 bool allowAccess,
                                                                                 QVRecordAccessReply reply) {
  forward(METHOD_NAMES("startOperation:toModifyRecordAccessAtURL:allowAccess:reply:"), kSharingProxy,
          &QVProtocol::startOperation_toModifyRecordAccessAtURL, reply, op, url, allowAccess);
}

void QVFileProviderShareOperationProxy::startOperation_toCopyParticipantTokenAtURL(
    Operation op, const NSURL &url, QVParticipantTokenReply reply) {
  forward(METHOD_NAMES("startOperation:toCopyParticipantTokenAtURL:reply:"), kSharingPrivateInterface,
          &QVProtocol::startOperation_toCopyParticipantTokenAtURL, reply, op, url);
}

void QVFileProviderShareOperationProxy::startOperation_toPrepFolderForSharingAt(Operation op,
                                                                                const NSURL &url,
                                                                                QVShareOutcomeReply reply) {
  forward(METHOD_NAMES("startOperation:toPrepFolderForSharingAt:reply:"), kSharingPrivateInterface,
          &QVProtocol::startOperation_toPrepFolderForSharingAt, reply, op, url);
}

void QVFileProviderShareOperationProxy::copyCurrentUserNameAndDisplayHandleWithReply(
    QVCurrentUserReply reply) {
  forward(METHOD_NAMES("copyCurrentUserNameAndDisplayHandleWithReply:"), kSharingPrivateInterface,
          &QVProtocol::copyCurrentUserNameAndDisplayHandleWithReply, reply);
}

void QVFileProviderShareOperationProxy::startOperation_toProcessSubitemsAtURL(
    Operation op, const NSURL &url, std::uint64_t maxSubsharesFailures, std::uint64_t processType,
    QVShareOutcomeReply reply) {
  forward(METHOD_NAMES("startOperation:toProcessSubitemsAtURL:maxSubsharesFailures:processType:reply:"),
          kFolderSharingProxy, &QVProtocol::startOperation_toProcessSubitemsAtURL, reply, op, url,
          maxSubsharesFailures, processType);
}

void QVFileProviderShareOperationProxy::startOperation_toLookupShareParticipants(
    Operation op, const QVShareParticipants &participants, QVParticipantsReply reply) {
  forward(METHOD_NAMES("startOperation:toLookupShareParticipants:reply:"), kSharingProxy,
          &QVProtocol::startOperation_toLookupShareParticipants, reply, op, participants);
}

void QVFileProviderShareOperationProxy::startOperation_toCopyDocumentURLForRecordID(
    Operation op, const std::optional<CKRecordID> &recordID, bool syncIfNeeded, QVSandboxingURLReply reply) {
  forward(METHOD_NAMES("startOperation:toCopyDocumentURLForRecordID:syncIfNeeded:reply:"),
          kSharingPrivateInterface, &QVProtocol::startOperation_toCopyDocumentURLForRecordID, reply, op,
          recordID, syncIfNeeded);
}

}  // namespace droxa
