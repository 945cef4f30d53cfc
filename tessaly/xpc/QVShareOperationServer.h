#pragma once

#include <memory>

#include "platform/xpc/capnp/Exported.h"
#include "tessaly/QVShareOperationProtocol.h"
#include "tessaly/xpc/QVShareOperation.capnp.h"

namespace droxa {

// The sharing operations as a peer calls them; alone, or as a part of the daemon's protocol.
// Thread contract: the loop; the object is called on the pool, several calls at a time.
class QVShareOperationServer : public virtual schema::QVShareOperationProtocol::Server {
 public:
  QVShareOperationServer(Session &session, std::shared_ptr<QVShareOperationProtocol> object)
      : sharing_(session, std::move(object)) {}

  kj::Promise<void> copySharingInfoAtURL(CopySharingInfoAtURLContext context) override;
  kj::Promise<void> copyShareURLForShare(CopyShareURLForShareContext context) override;
  kj::Promise<void> saveSharingInfo(SaveSharingInfoContext context) override;
  kj::Promise<void> createSharingInfoForURL(CreateSharingInfoForURLContext context) override;
  kj::Promise<void> unshareShare(UnshareShareContext context) override;
  kj::Promise<void> modifyRecordAccessAtURL(ModifyRecordAccessAtURLContext context) override;
  kj::Promise<void> copyParticipantTokenAtURL(CopyParticipantTokenAtURLContext context) override;
  kj::Promise<void> prepFolderForSharingAt(PrepFolderForSharingAtContext context) override;
  kj::Promise<void> copyCurrentUserNameAndDisplayHandle(
      CopyCurrentUserNameAndDisplayHandleContext context) override;
  kj::Promise<void> processSubitemsAtURL(ProcessSubitemsAtURLContext context) override;
  kj::Promise<void> lookupShareParticipants(LookupShareParticipantsContext context) override;
  kj::Promise<void> copyDocumentURLForRecordID(CopyDocumentURLForRecordIDContext context) override;

 private:
  // The session, for what a call passes along.
  Session &session() const;

  Exported<QVShareOperationProtocol> sharing_;
};

}  // namespace droxa
