#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "enumeration/QVBaseFileEnumerator.h"
#include "platform/foundation/NSURL.h"
#include "tessaly/QVProtocol.h"

namespace droxa {

// The enumerator of the root and of every other folder: before the first page is listed it has the daemon
// push what changes below its folder, collects the pushes as pending changes, and tells the framework to ask
// for them. Changes of the account, and for the root of the container list, start a new token generation.
//
// The update channel is none, being set up, or established. A lost one is none again: the next listing sets
// it up anew, so nothing is retried here. After invalidate() it is none for good.
//
// Thread contract: as for QVBaseFileEnumerator. The daemon's pushes come on its connection's threads, the two
// notifications on their poster's, which must not be `_queue`: _accountTokenDidChange waits for it.
class QVFileEnumerator : public QVBaseFileEnumerator, public QVItemNotificationReceiving {
 public:
  // Null, with an error logged, for a nil `url`. `url` is the folder that the daemon is to watch.
  static std::shared_ptr<QVFileEnumerator> initWithFileObjectID(std::optional<QVFileObjectID> fileObjectID,
                                                                NSURL url, std::string itemIdentifier,
                                                                bool recursive);

  // Completes on `_queue`.
  void setupNotificationReceivingIfNeededWithCompletion(SetupCompletion completion) override;

  void receiveUpdates(const QVQueryItems &items, const std::vector<std::string> &logicalExtensions,
                      const std::vector<std::string> &physicalExtensions, QVReply reply) override;
  // Does nothing and never replies, deliberately.
  void receiveProgressUpdates(const std::vector<std::string> &updates, QVReply reply) override;

  // The handlers of QVContainerListDidChangeNotification and QVAccountTokenDidChangeNotification.
  void containerListDidChange();
  void _accountTokenDidChange();

 protected:
  QVFileEnumerator(std::optional<QVFileObjectID> fileObjectID, NSURL url, std::string itemIdentifier,
                   bool recursive);

  // Both on `_queue` only.
  void _setupNotificationReceivingIfNeededWithCompletion(const SetupCompletion &completion);
  void _startObservingAccountChangesIfNeeded();

  void _signalChange();
  void _handleNotificationError(const NSError &error);

  const NSURL _url;

 private:
  void askForUpdateSender(const SetupCompletion &finish);
  // On `_queue` only.
  void useUpdateSender(const std::shared_ptr<QVItemNotificationSender> &sender);
  std::shared_ptr<QVFileEnumerator> sharedSelf();
};

}  // namespace droxa
