#include "tessaly/xpc/QVShareOperationServer.h"

#include <kj/debug.h>
#include <utility>

#include "platform/xpc/capnp/Descriptors.h"
#include "tessaly/xpc/QVPassedOperations.h"
#include "tessaly/xpc/QVShareValues.h"

namespace droxa {
namespace {

using Text = std::optional<std::string>;

constexpr auto writeOutcome = [](auto results, Session &, const NSError &error) { setError(results, error); };
constexpr auto writeShareReply = [](auto results, Session &, const std::optional<CKShare> &share,
                                    const NSError &error) {
  setShare(results, share);
  setError(results, error);
};
constexpr auto writeShareAndURL = [](auto results, Session &, const std::optional<CKShare> &share,
                                     const NSURL &url, const NSError &error) {
  setShare(results, share);
  setURL(results, url);
  setError(results, error);
};
constexpr auto writeAccess = [](auto results, Session &, const NSData &data, const Text &text,
                                const NSError &error) {
  if (data) results.setData(xpcBytes(data));
  if (text) results.setText(xpcBytes(*text));
  setError(results, error);
};
constexpr auto writeToken = [](auto results, Session &, const Text &first, const Text &second,
                               const NSError &error) {
  if (first) results.setFirst(xpcBytes(*first));
  if (second) results.setSecond(xpcBytes(*second));
  setError(results, error);
};
constexpr auto writeCurrentUser = [](auto results, Session &,
                                     const std::optional<NSPersonNameComponents> &name, const Text &first,
                                     const Text &second, const Text &third, const NSError &error) {
  if (name) writePersonName(results.initName(), *name);
  if (first) results.setFirst(xpcBytes(*first));
  if (second) results.setSecond(xpcBytes(*second));
  if (third) results.setThird(xpcBytes(*third));
  setError(results, error);
};
constexpr auto writeFoundParticipants = [](auto results, Session &, const QVShareParticipants &participants,
                                           const NSError &error) {
  setParticipants(results, participants);
  setError(results, error);
};
constexpr auto writeSandboxingURL = [](auto results, Session &,
                                       const std::shared_ptr<const FPSandboxingURLWrapper> &wrapper,
                                       const NSError &error) {
  if (wrapper) {
    setURL(results, wrapper->url());
    if (wrapper->descriptor() >= 0) results.setDescriptor(exportDescriptor(wrapper->descriptor()));
  }
  setError(results, error);
};

}  // namespace

Session &QVShareOperationServer::session() const {
  const auto session = sharing_.session();
  KJ_REQUIRE(session != nullptr, "the connection ended");
  return *session;  // kept by the loop, which runs this call of it
}

kj::Promise<void> QVShareOperationServer::copySharingInfoAtURL(CopySharingInfoAtURLContext context) {
  const auto params = context.getParams();
  return sharing_.serve(
      context, [op = getOperation(params, session()), url = getURL(params)](auto &object, auto reply) {
        object.startOperation_toCopySharingInfoAtURL(op, url, reply(writeShareAndURL));
      });
}

kj::Promise<void> QVShareOperationServer::copyShareURLForShare(CopyShareURLForShareContext context) {
  const auto params = context.getParams();
  const Text appName = params.hasAppName() ? Text(xpcString(params.getAppName())) : std::nullopt;
  return sharing_.serve(context, [op = getOperation(params, session()), share = getShare(params), appName](
                                     auto &object, auto reply) {
    object.startOperation_toCopyShareURLForShare(op, share, appName, reply(writeShareAndURL));
  });
}

kj::Promise<void> QVShareOperationServer::saveSharingInfo(SaveSharingInfoContext context) {
  const auto params = context.getParams();
  return sharing_.serve(
      context, [op = getOperation(params, session()), share = getShare(params)](auto &object, auto reply) {
        object.startOperation_toSaveSharingInfo(op, share, reply(writeShareReply));
      });
}

kj::Promise<void> QVShareOperationServer::createSharingInfoForURL(CreateSharingInfoForURLContext context) {
  return sharing_.serve(context, [url = getURL(context.getParams())](auto &object, auto reply) {
    object.createSharingInfoForURL(url, reply(writeShareReply));
  });
}

kj::Promise<void> QVShareOperationServer::unshareShare(UnshareShareContext context) {
  const auto params = context.getParams();
  return sharing_.serve(context, [op = getOperation(params, session()), share = getShare(params),
                                  forceDelete = bool(params.getForceDelete())](auto &object, auto reply) {
    object.startOperation_toUnshareShare(op, share, forceDelete, reply(writeOutcome));
  });
}

kj::Promise<void> QVShareOperationServer::modifyRecordAccessAtURL(ModifyRecordAccessAtURLContext context) {
  const auto params = context.getParams();
  return sharing_.serve(context, [op = getOperation(params, session()), url = getURL(params),
                                  allowAccess = bool(params.getAllowAccess())](auto &object, auto reply) {
    object.startOperation_toModifyRecordAccessAtURL(op, url, allowAccess, reply(writeAccess));
  });
}

kj::Promise<void> QVShareOperationServer::copyParticipantTokenAtURL(
    CopyParticipantTokenAtURLContext context) {
  const auto params = context.getParams();
  return sharing_.serve(
      context, [op = getOperation(params, session()), url = getURL(params)](auto &object, auto reply) {
        object.startOperation_toCopyParticipantTokenAtURL(op, url, reply(writeToken));
      });
}

kj::Promise<void> QVShareOperationServer::prepFolderForSharingAt(PrepFolderForSharingAtContext context) {
  const auto params = context.getParams();
  return sharing_.serve(
      context, [op = getOperation(params, session()), url = getURL(params)](auto &object, auto reply) {
        object.startOperation_toPrepFolderForSharingAt(op, url, reply(writeOutcome));
      });
}

kj::Promise<void> QVShareOperationServer::copyCurrentUserNameAndDisplayHandle(
    CopyCurrentUserNameAndDisplayHandleContext context) {
  return sharing_.serve(context, [](auto &object, auto reply) {
    object.copyCurrentUserNameAndDisplayHandleWithReply(reply(writeCurrentUser));
  });
}

kj::Promise<void> QVShareOperationServer::processSubitemsAtURL(ProcessSubitemsAtURLContext context) {
  const auto params = context.getParams();
  return sharing_.serve(context, [op = getOperation(params, session()), url = getURL(params),
                                  failures = params.getMaxSubsharesFailures(),
                                  processType = params.getProcessType()](auto &object, auto reply) {
    object.startOperation_toProcessSubitemsAtURL(op, url, failures, processType, reply(writeOutcome));
  });
}

kj::Promise<void> QVShareOperationServer::lookupShareParticipants(LookupShareParticipantsContext context) {
  const auto params = context.getParams();
  return sharing_.serve(context, [op = getOperation(params, session()),
                                  participants = getParticipants(params)](auto &object, auto reply) {
    object.startOperation_toLookupShareParticipants(op, participants, reply(writeFoundParticipants));
  });
}

kj::Promise<void> QVShareOperationServer::copyDocumentURLForRecordID(
    CopyDocumentURLForRecordIDContext context) {
  const auto params = context.getParams();
  return sharing_.serve(context, [op = getOperation(params, session()), recordID = getRecordID(params),
                                  syncIfNeeded = bool(params.getSyncIfNeeded())](auto &object, auto reply) {
    object.startOperation_toCopyDocumentURLForRecordID(op, recordID, syncIfNeeded, reply(writeSandboxingURL));
  });
}

}  // namespace droxa
