#include "keld/Keld.h"

#include <future>
#include <sys/stat.h>
#include <system_error>
#include <unistd.h>
#include <uuid/uuid.h>

#include "keld/KeldSession.h"
#include "keld/Schema.h"
#include "keld/SharedContainer.h"
#include "keld/TrashNotes.h"
#include "keld/contents/ContentsStorage.h"
#include "keld/sync/DeviceName.h"
#include "keld/sync/DriveAccount.h"
#include "keld/sync/DriveCloud.h"
#include "platform/fileprovider/FPReplacements.h"
#include "platform/foundation/NSDate.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVLog.h"
#include "tessaly/QVNotifications.h"
#include "tessaly/QVUbiquitousItems.h"

namespace droxa::keld {

Keld::Keld(const DroxaHome &home, KeldOptions options)
    : home_(home),
      options_(std::move(options)),
      replicaPath_(NSURL::fileURLWithPath(home.replica()).path()),
      databasePath_(home.state() + "/keld.sqlite"),
      startedNanoseconds_(NSDate::now().nanosecondsSince1970()) {}

Keld::~Keld() {
  stop();
}

std::shared_ptr<Keld> Keld::start(const DroxaHome &home, KeldOptions options, std::string *problem) {
  if (!home.create(problem)) return nullptr;
  std::shared_ptr<Keld> daemon(new Keld(home, std::move(options)));
  daemon->lock_ = HomeLock::take(home.run() + "/keld.lock", problem);
  if (!daemon->lock_) return nullptr;
  *problem = MoveTrashOfOldLayout(daemon->replicaPath_);
  if (!problem->empty()) return nullptr;
  *problem = MakeBuiltInContainers(daemon->replicaPath_);
  if (!problem->empty()) return nullptr;
  daemon->removeAbandonedActions();
  try {
    daemon->driveAccount_ = DriveAccount(home, daemon->options_.sync.account);
  } catch (const std::exception &refused) {
    *problem = refused.what();
    return nullptr;
  }
  try {
    daemon->open();
  } catch (const std::exception &error) {
    *problem = error.what();
    if (problem->find(daemon->databasePath_) == std::string::npos)
      *problem = daemon->databasePath_ + ": " + *problem;
    return nullptr;
  }
  return daemon;
}

void Keld::open() {
  OpenedDatabase opened = DatabaseOpen(databasePath_);
  const bool wasDamaged = !opened.damagedCopy.empty();
  KeeperOptions keeperOptions = options_.keeper;
  keeperOptions.showsPromises = replicaHasPromises();
  keeper_ = std::make_unique<Keeper>(std::move(opened.database), databasePath_, replicaPath_, keeperOptions,
                                     containers_, *this);
  readers_ = std::make_unique<ReaderPool>(databasePath_);
  account_ = std::make_unique<AccountKeeper>(
      home_.configuration(), [this](const std::string &name) { return identifierForAccount(name); });
  SharedZones::readTitles(home_.state(), [this](const std::string &container, const std::string &title) {
    containers_.setTitle(container, title);
  });
  keeper_->start();
  openSync();
  const NSError error = account_->load();
  if (error) os_log_error(qvc_default_log(), "[ERROR] can't read the account: %@", error);
  offerAccount(!wasDamaged && !error);
  accountChanged();
}

// What actions of programs that died have left in their folder.
void Keld::removeAbandonedActions() {
  const NSURL folder =
      NSURL::fileURLWithPath(replicaPath_ + "/" + QVPrivateStorageName + "/" + QVActionsFolderName);
  const std::size_t removed = FPRemoveAbandonedReplacements(folder);
  if (removed != 0)
    os_log(qvc_default_log(), "[NOTICE] removed what %lu actions of items have left", removed);
}

// Asked before the keeper looks at anything; whether the storage can be opened is the sync's to tell.
bool Keld::replicaHasPromises() const {
  int error = 0;
  const auto storage = ContentsStorage::open(replicaPath_, options_.sync.contents, &error);
  return storage && storage->form() == DatalessForm::promise;
}

void Keld::openSync() {
  SyncOptions options = options_.sync;
  if (options.device.empty()) options.device = DeviceName(home_);
  std::shared_ptr<CKCloud> cloud = options.cloud;
  if (!cloud) {
    const std::string folder = options.cloudFolder.empty() ? home_.root() + "/cloud" : options.cloudFolder;
    NSError error;
    cloud = OpenDriveCloud(home_, folder, driveAccount_, options.device, &error);
    if (!cloud) throw std::runtime_error(error.localizedDescription());
  }
  const auto readItems = [this](const std::function<void(ItemQueries &)> &work) {
    return read([&](ItemQueries &queries, const ItemPresenter &) { work(queries); });
  };
  sync_ = std::make_shared<SyncEngine>(
      replicaPath_, home_.state() + "/sync.sqlite", cloud, [this] { return keeper_.get(); }, readItems,
      options);
  RememberDriveAccount(sync_->store(), driveAccount_);
  ContentsServiceHost host;
  host.replicaPath = replicaPath_;
  host.keeper = [this]() -> Keeper & { return *keeper_; };
  host.read = readItems;
  host.pathBelowReplica = [this](const NSURL &url) { return pathBelowReplica(url); };
  host.isSignedIn = [this] { return account_->isSignedIn(); };
  host.sharedEngines = [this] { return sharedZones_->engines(); };
  host.engineOf = [this](const ItemRecord &item) { return engineOf(item); };
  contents_ = std::make_shared<ContentsService>(std::move(host), sync_);
  openSharing(cloud);
  std::string itemDatabase;
  (void)readItems([&](ItemQueries &queries) { itemDatabase = queries.metaText("uuid"); });
  sync_->start(itemDatabase);
  openSharedZones(cloud, itemDatabase);
}

void Keld::openSharedZones(const std::shared_ptr<CKCloud> &cloud, const std::string &itemDatabase) {
  SharedZonesHost host;
  host.replicaPath = replicaPath_;
  host.stateFolder = home_.state();
  host.keeper = [this] { return keeper_.get(); };
  host.read = [this](const std::function<void(ItemQueries &)> &work) {
    return read([&](ItemQueries &queries, const ItemPresenter &) { work(queries); });
  };
  host.itemDatabase = itemDatabase;
  host.setTitle = [this](const std::string &container, const std::string &title) {
    containers_.setTitle(container, title);
    // Whatever it does next, it reads the list anew.
    keeper_->perform([](Reconciler &, ItemQueries &, ItemEdits &) {}, [] {});
  };
  const std::shared_ptr<CKCloud> shared = cloud->sharedDatabase();
  sharedZones_ = std::make_shared<SharedZones>(std::move(host), sync_, shared, options_.sync.pollInterval);
  sharedZones_->start();
  sharedFeed_ = sharedZones_.get();
}

void Keld::openSharing(const std::shared_ptr<CKCloud> &cloud) {
  SharingHost host;
  host.replicaPath = replicaPath_;
  host.keeper = [this]() -> Keeper & { return *keeper_; };
  host.read = [this](const std::function<void(ItemQueries &)> &work) {
    return read([&](ItemQueries &queries, const ItemPresenter &) { work(queries); });
  };
  host.pathBelowReplica = [this](const NSURL &url) { return pathBelowReplica(url); };
  host.isSignedIn = [this] { return account_->isSignedIn(); };
  host.engineOf = [this](const ItemRecord &item) { return engineOf(item); };
  host.engineOfZone = [this](const CKRecordZoneID &zone) {
    return zone == sync_->scope().zone ? sync_ : sharedZones_->engineOf(SharedContainerOf(zone.ownerName));
  };
  sharing_ = std::make_shared<SharingService>(std::move(host), SharingPlaces(cloud, driveAccount_),
                                              options_.sharing);
}

std::shared_ptr<SyncEngine> Keld::engineOf(const ItemRecord &item) {
  if ((item.flags & kOthersFlag) == 0) return sync_;
  std::string container;
  (void)read([&](ItemQueries &queries, const ItemPresenter &) {
    const std::vector<std::string> names = queries.namesTo(item);
    if (!names.empty()) container = names.front();
  });
  auto engine = sharedZones_->engineOf(container);
  return engine ? engine : sync_;  // a container that is about to go
}

void Keld::accountChanged() {
  sync_->setSignedIn(account_->isSignedIn());
  sharedZones_->setSignedIn(account_->isSignedIn());
}

// A home that is used for the first time works at once. Who signed out there stays signed out: the database
// knows that the account was offered, and one that replaces a damaged one doesn't offer it again.
void Keld::offerAccount(bool mayOffer) {
  bool wasOffered = false;
  (void)read([&](ItemQueries &queries, const ItemPresenter &) {
    wasOffered = queries.metaNumber("accountOffered") != 0;
  });
  if (wasOffered) return;
  if (mayOffer && !account_->isSignedIn()) {
    const NSError error = account_->signIn(driveAccount_);
    if (error) os_log_error(qvc_default_log(), "[ERROR] can't sign the drive's account in: %@", error);
  }
  performAndWait([](ItemEdits &edits) { edits.setMeta("accountOffered", 1); });
}

// Whoever signs in or out next must find it remembered, so it is committed first.
void Keld::performAndWait(const std::function<void(ItemEdits &edits)> &edit) {
  auto written = std::make_shared<std::promise<void>>();
  keeper_->perform([edit](Reconciler &, ItemQueries &, ItemEdits &edits) { edit(edits); },
                   [written] { written->set_value(); });
  written->get_future().wait();
}

std::string Keld::identifierForAccount(const std::string &name) {
  const std::string key = "account:" + name;
  std::string known;
  (void)read([&](ItemQueries &queries, const ItemPresenter &) { known = queries.metaText(key); });
  if (!known.empty()) return known;
  uuid_t uuid;
  ::uuid_generate(uuid);
  char text[37];
  ::uuid_unparse_lower(uuid, text);
  const std::string made = text;
  performAndWait([&](ItemEdits &edits) { edits.setMetaText(key, made); });
  return made;
}

void Keld::stop() {
  if (stopped_.exchange(true)) return;
  if (sharing_) sharing_->queue().stop();
  if (sharedZones_) sharedZones_->stop();
  if (sync_) sync_->stop();
  if (keeper_) keeper_->stop();
}

std::shared_ptr<QVProtocol> Keld::newSession() {
  return std::make_shared<KeldSession>(shared_from_this());
}

NSError Keld::read(const Read &work) {
  if (stopped_) return qvc_error(QVErrorShuttingDown, "the daemon is shutting down");
  try {
    readers_->read(
        [&](ItemQueries &queries) { work(queries, ItemPresenter(containers_.current(), queries)); });
    return NSError();
  } catch (const SqlError &error) {
    os_log_error(qvc_default_log(), "[ERROR] the item database can't be read: %s", error.what());
    return qvc_error(QVErrorDatabase, databasePath_ + ": " + error.what());
  }
}

NSError Keld::checkSignedIn() const {
  return account_->isSignedIn() ? NSError() : qvc_errorLoggedOut();
}

std::optional<std::string> Keld::pathBelowReplica(const NSURL &url) const {
  if (!url.isFileURL()) return std::nullopt;
  const std::string &path = url.path();
  if (path.size() <= replicaPath_.size() + 1 || path.compare(0, replicaPath_.size(), replicaPath_) != 0 ||
      path[replicaPath_.size()] != '/')
    return std::nullopt;
  return path.substr(replicaPath_.size() + 1);
}

QVDaemonStatus Keld::status() {
  QVDaemonStatus status;
  status.processIdentifier = static_cast<std::uint32_t>(::getpid());
  status.startedNanoseconds = startedNanoseconds_;
  const Counters counters = keeper_->counters();
  status.rank = counters.rank;
  status.documents = counters.documents;
  status.folders = counters.folders;
  status.aliases = counters.aliases;
  status.firstScanDone = keeper_->firstScanDone();
  if (!status.firstScanDone) {
    (void)read([&](ItemQueries &queries, const ItemPresenter &) {
      status.pendingScans = queries.countFoldersAfter(keeper_->scannedThrough());
    });
  }
  status.senders = senders_.count();
  status.watcher = keeper_->watcherDescription();
  for (const char *suffix : {"", "-wal"}) {
    struct stat file;
    if (::stat((databasePath_ + suffix).c_str(), &file) == 0)
      status.databaseBytes += static_cast<std::uint64_t>(file.st_size);
  }
  return status;
}

// --- What the keeper tells.

void Keld::itemsChanged(Commit commit, ItemQueries &queries) {
  senders_.publish(std::move(commit), queries);
}

void Keld::feedAdvanced() {
  if (sync_) sync_->itemsChanged();
  if (SharedZones *shared = sharedFeed_) shared->itemsChanged();
}

void Keld::containerListChanged() {
  notifications_->post(QVContainerListDidChangeNotification);
}

void Keld::keeperFailed(const std::string &why) {
  stopped_ = true;
  if (options_.failed) options_.failed(why);
}

// --- What senders ask.

void Keld::findWatchTarget(const NSURL &url,
                           std::function<void(std::optional<UpdateWatch>, const NSError &)> reply) {
  const auto path = pathBelowReplica(url);
  if (!path) return reply(std::nullopt, qvc_errorNoSuchItem(url.path()));
  const auto find = [self = shared_from_this(), path = *path](NSError *error) {
    std::optional<UpdateWatch> watch;
    *error = self->read([&](ItemQueries &queries, const ItemPresenter &presenter) {
      const auto record = queries.byPathBelowReplica(path);
      if (record) watch = UpdateWatch{record->id, record->id == presenter.containers().root(), 0, 0};
    });
    return watch;
  };
  NSError error;
  const auto known = find(&error);
  if (known || error) return reply(known, error);
  // It may be so new that the keeper hasn't seen it.
  keeper_->lookAt(*path, [find, reply = std::move(reply)] {
    NSError problem;
    const auto found = find(&problem);
    reply(found, problem);
  });
}

NSError Keld::beginWatch(UpdateSender &sender, UpdateWatch watch, std::uint64_t since) {
  return senders_.beginWatch(sender, watch, since, [this](const auto &question) {
    return read([&](ItemQueries &queries, const ItemPresenter &) { question(queries); });
  });
}

bool Keld::exists(ItemNumber id) {
  bool found = false;
  (void)read([&](ItemQueries &queries, const ItemPresenter &) {
    const auto record = queries.byID(id);
    found = record && record->parent != kLimboFolder;
  });
  return found;
}

QVQueryItems Keld::itemsForPush(const std::vector<PendingPush> &pushes) {
  QVQueryItems items;
  (void)read([&](ItemQueries &queries, const ItemPresenter &presenter) {
    for (const PendingPush &push : pushes) {
      if (push.isDead) {
        items.push_back(ItemPresenter::deadItem(push.id, push.kind));
        continue;
      }
      const auto record = queries.byID(push.id);
      if (!record || record->parent == kLimboFolder) {
        if (push.hasLeft) items.push_back(ItemPresenter::deadItem(push.id, push.kind));
        continue;
      }
      // What went into private storage is gone, for everybody but its owner.
      const bool isHidden = record->zone() == Zone::privateStorage;
      items.push_back(isHidden ? ItemPresenter::deadItem(push.id, push.kind) : presenter.item(*record));
    }
  });
  return items;
}

}  // namespace droxa::keld
