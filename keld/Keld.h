#pragma once

#include <atomic>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "keld/AccountKeeper.h"
#include "keld/ContainerList.h"
#include "keld/HomeLock.h"
#include "keld/Keeper.h"
#include "keld/Listing.h"
#include "keld/NotificationHub.h"
#include "keld/ReaderPool.h"
#include "keld/UpdateSenders.h"
#include "keld/sharing/SharingService.h"
#include "keld/sync/ContentsService.h"
#include "keld/sync/SharedZones.h"
#include "platform/foundation/Paths.h"
#include "tessaly/QVProtocol.h"

namespace droxa::keld {

struct KeldOptions {
  KeeperOptions keeper;
  SyncOptions sync;
  SharingOptions sharing;
  // Called once, on a thread of the daemon, when it can't go on: its program ends then.
  std::function<void(const std::string &why)> failed;
};

// The daemon of one home: the item database, the keeper that follows the replica, and what clients are
// answered with. Clients hold sessions (newSession()), one for each connection.
//
// Thread contract: every member on any thread. Questions are answered from the readers' connections on the
// calling thread; only the keeper writes.
class Keld final : public KeeperListener, public UpdateSenderHost, public std::enable_shared_from_this<Keld> {
 public:
  // Makes the home where it is missing, opens the database and begins to watch and to scan. Null with
  // `problem` saying what is wrong and what to do.
  static std::shared_ptr<Keld> start(const DroxaHome &home, KeldOptions options, std::string *problem);
  ~Keld() override;

  // Ends watching and writing; what is asked from now on is answered with QVErrorShuttingDown.
  void stop();

  // One client's way to the daemon. Its senders and subscriptions end with it.
  std::shared_ptr<QVProtocol> newSession();

  // What sessions are answered with.
  using Read = std::function<void(ItemQueries &queries, const ItemPresenter &presenter)>;
  NSError read(const Read &work);  // nil, or why it can't be answered
  NSError checkSignedIn() const;
  Keeper &keeper() { return *keeper_; }
  ListingCursors &cursors() { return cursors_; }
  NotificationHub &notifications() { return *notifications_; }
  AccountKeeper &account() { return *account_; }
  UpdateSenders &senders() { return senders_; }
  QVContentsProtocol &contents() { return *contents_; }
  SyncEngine &sync() { return *sync_; }
  SharedZones &sharedZones() { return *sharedZones_; }
  SharingService &sharing() { return *sharing_; }
  // Whether anybody is signed in has changed.
  void accountChanged();
  std::shared_ptr<const Containers> containers() const { return containers_.current(); }
  const std::string &replicaPath() const { return replicaPath_; }
  // The part of the URL's path below the replica; nullopt for one outside of it, or the replica itself.
  std::optional<std::string> pathBelowReplica(const NSURL &url) const;
  QVDaemonStatus status();

  // KeeperListener.
  void itemsChanged(Commit commit, ItemQueries &queries) override;
  void feedAdvanced() override;
  void containerListChanged() override;
  void keeperFailed(const std::string &why) override;

  // UpdateSenderHost.
  void findWatchTarget(const NSURL &url,
                       std::function<void(std::optional<UpdateWatch>, const NSError &)> reply) override;
  std::uint64_t lastCommit() override { return senders_.lastCommit(); }
  NSError beginWatch(UpdateSender &sender, UpdateWatch watch, std::uint64_t since) override;
  bool exists(ItemNumber id) override;
  QVQueryItems itemsForPush(const std::vector<PendingPush> &pushes) override;

 private:
  Keld(const DroxaHome &home, KeldOptions options);
  void open();
  void removeAbandonedActions();
  void openSync();
  std::shared_ptr<SyncEngine> engineOf(const ItemRecord &item);
  void openSharedZones(const std::shared_ptr<CKCloud> &cloud, const std::string &itemDatabase);
  void openSharing(const std::shared_ptr<CKCloud> &cloud);
  bool replicaHasPromises() const;
  void offerAccount(bool mayOffer);
  std::string identifierForAccount(const std::string &name);
  void performAndWait(const std::function<void(ItemEdits &edits)> &edit);

  const DroxaHome home_;
  const KeldOptions options_;
  const std::string replicaPath_;
  const std::string databasePath_;
  const std::int64_t startedNanoseconds_;
  std::string driveAccount_;  // constant after start()
  std::unique_ptr<HomeLock> lock_;
  ContainerList containers_;
  ListingCursors cursors_;
  UpdateSenders senders_;
  const std::shared_ptr<NotificationHub> notifications_ = std::make_shared<NotificationHub>();
  std::unique_ptr<ReaderPool> readers_;
  std::unique_ptr<AccountKeeper> account_;
  std::unique_ptr<Keeper> keeper_;
  std::shared_ptr<SyncEngine> sync_;
  std::shared_ptr<SharedZones> sharedZones_;
  std::atomic<SharedZones *> sharedFeed_{nullptr};  // the same, once the keeper may tell it of changes
  std::shared_ptr<QVContentsProtocol> contents_;
  std::shared_ptr<SharingService> sharing_;
  std::atomic<bool> stopped_{false};
};

}  // namespace droxa::keld
