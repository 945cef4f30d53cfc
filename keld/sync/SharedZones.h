#pragma once

#include <condition_variable>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "keld/Keeper.h"
#include "keld/sync/SyncEngine.h"
#include "platform/cloudkit/CKCloud.h"
#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVProtocol.h"

namespace droxa::keld {

// What the shared zones need of the daemon around them.
struct SharedZonesHost {
  std::string replicaPath, stateFolder;
  std::function<Keeper *()> keeper;
  ReplicaFiles::Read read;
  std::function<void(const std::string &containerID, const std::string &title)> setTitle;
  std::string itemDatabase;  // which one it is; see SyncEngine::start()
};

// What others share with this account: owns an engine for each owner's zone, with a container and a database
// of its own, from when the zone is first seen in the cloud until it isn't any more. It is looked for at the
// start, when the cloud tells of changes, and from time to time. Thread contract: any thread; looking,
// beginning and ending of engines happen on a thread of its own.
class SharedZones : public std::enable_shared_from_this<SharedZones> {
 public:
  // `cloud` is the account's shared database.
  SharedZones(SharedZonesHost host, std::shared_ptr<SyncEngine> drive, std::shared_ptr<CKCloud> cloud,
              std::chrono::milliseconds pollInterval);
  ~SharedZones();

  // Tells how the containers of the zones known so far are called. Before the keeper looks at them.
  static void readTitles(const std::string &stateFolder,
                         const std::function<void(const std::string &, const std::string &)> &setTitle);

  void start();  // after the drive's engine
  void stop();   // before it, while the keeper still runs
  void setSignedIn(bool isSignedIn);
  void itemsChanged();

  std::vector<std::shared_ptr<SyncEngine>> engines() const;
  // Null when no zone is shown there (any more).
  std::shared_ptr<SyncEngine> engineOf(const std::string &containerID) const;

  // Accepts the share with that URL, and replies with where its root is, when it is there. Where this account
  // is the owner that is in its own drive. Replies on the pool.
  void acceptShare(const NSURL &url, QVURLReply reply);

 private:
  void run();
  void look();
  void lookForZones();
  void tryToBegin(const std::string &owner);
  void begin(const std::string &owner);
  void beginKnown();
  bool end(const std::string &containerID);
  void makeContainer(const std::string &containerID) const;
  // By what people know the owner; "" when that can't be asked now.
  std::string titleOf(const std::string &owner) const;
  void refreshTitle(SyncEngine &engine);
  std::string databaseOf(const std::string &containerID) const;
  void zoneIsGone(const std::string &containerID);
  void waitForWork();
  void accept(const NSURL &url, const QVURLReply &reply);
  // Waits until the record's item is there. "": it doesn't come.
  std::string waitForItem(const CKRecordID &root, bool isOwn);

  const SharedZonesHost host_;
  const std::shared_ptr<SyncEngine> drive_;
  const std::shared_ptr<CKCloud> cloud_;
  const std::chrono::milliseconds pollInterval_;
  const std::shared_ptr<CKCancellation> stopping_ = std::make_shared<CKCancellation>();
  std::unique_ptr<CKSubscription> subscription_;  // its own thread's
  std::chrono::steady_clock::time_point nextPoll_;
  std::set<std::string> failed_;  // owners whose zones can't be shown; told once
  std::set<std::string> titled_;  // the containers whose owners were looked up since the start

  mutable Mutex mutex_;
  std::condition_variable_any wake_;
  bool stop_ GUARDED_BY(mutex_) = false;
  bool signedIn_ GUARDED_BY(mutex_) = false;
  bool hasNews_ GUARDED_BY(mutex_) = true;
  std::map<std::string, std::shared_ptr<SyncEngine>> engines_ GUARDED_BY(mutex_);  // by the containers
  std::set<std::string> gone_ GUARDED_BY(mutex_);  // containers of zones that are
  std::thread thread_;
};

}  // namespace droxa::keld
