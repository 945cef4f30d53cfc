#include <algorithm>
#include <cerrno>
#include <map>
#include <poll.h>
#include <pthread.h>
#include <sys/eventfd.h>
#include <sys/inotify.h>
#include <thread>
#include <unistd.h>

#include "platform/cloudkit/embedded/Calls.h"
#include "platform/oslog/os_log.h"

namespace droxa::embedded {
namespace {

// A writer that dies between its commit and the touch of the watched file wakes nobody; and a cloud that was
// replaced needs a new watch.
constexpr int kLookAnywayMilliseconds = 2000;

struct ZoneState {
  std::int64_t number;  // the zone's; in a shared database the view's
  std::int64_t seq;
  bool isOwn;  // made through this very object
};

// The zones that a database has, with the numbers of their last changes; and whether others made any since.
struct Queries {
  const char *zones;
  const char *changes;
};
constexpr Queries kPrivate{"SELECT id, name, seq, session, NULL FROM zones WHERE account = ?",
                           "SELECT 1 FROM records WHERE zone = ? AND seq > ? AND session <> ? LIMIT 1"};
constexpr Queries kShared{
    "SELECT views.id, zones.name, views.seq, 0, accounts.name FROM views JOIN zones ON zones.id = views.zone"
    " JOIN accounts ON accounts.id = zones.account WHERE views.account = ? AND EXISTS"
    " (SELECT 1 FROM share_access JOIN shares ON shares.id = share"
    " WHERE share_access.account = views.account AND shares.zone = zones.id)",
    "SELECT 1 FROM view_records WHERE view = ? AND seq > ? AND session <> ? LIMIT 1"};

// Watches the cloud on a thread of its own, which ends when stop() was called.
// Thread contract: begin() and look() on one thread at a time; stop() on any thread.
class Watch {
 public:
  Watch(std::shared_ptr<Home> home, CKZonesChangedHandler handler)
      : home_(std::move(home)),
        handler_(std::move(handler)),
        queries_(home_->scope() == CKDatabaseScope::privateDatabase ? kPrivate : kShared),
        inotify_(inotify_init1(IN_NONBLOCK | IN_CLOEXEC)),
        stopped_(eventfd(0, EFD_NONBLOCK | EFD_CLOEXEC)) {
    context_.cancellation = std::make_shared<CKCancellation>();
  }
  ~Watch() {
    if (inotify_ >= 0) close(inotify_);
    if (stopped_ >= 0) close(stopped_);
  }
  Watch(const Watch &) = delete;
  Watch &operator=(const Watch &) = delete;

  NSError begin() {
    if (inotify_ < 0 || stopped_ < 0 || !watchFile()) {
      return CKErrorMake(CKErrorCode::serviceUnavailable, "Changes of the cloud can't be watched",
                         NSError::errorWithPOSIXCode(errno));
    }
    return readZones(zones_, nullptr);
  }

  void run() {
    pthread_setname_np(pthread_self(), "droxa-cloud");
    while (!context_.isCancelled()) {
      pollfd files[] = {{inotify_, POLLIN, 0}, {stopped_, POLLIN, 0}};
      poll(files, 2, kLookAnywayMilliseconds);
      drain();
      watchFile();  // the same watch, unless another file has come into its place
      look();
    }
  }

  void stop() {
    context_.cancellation->cancel();
    eventfd_write(stopped_, 1);
  }

 private:
  using Zones = std::map<CKRecordZoneID, ZoneState>;

  bool watchFile() const {
    return inotify_add_watch(inotify_, home_->watchedFile().c_str(), IN_MODIFY | IN_ATTRIB) >= 0;
  }

  void drain() const {
    char events[4096];
    while (read(inotify_, events, sizeof events) > 0) {
    }
  }

  // Reads the zones as they are; and which of them others changed since the last look.
  NSError readZones(Zones &zones, std::vector<CKRecordZoneID> *changed) const {
    return home_->run(Home::Access::read, context_, [&](const Connection &connection) {
      SqlUse row = connection.use(queries_.zones);
      row.bind(connection.account);
      while (row.step()) {
        const ZoneState state{row.integer(0), row.integer(2), row.integer(3) == home_->session()};
        CKRecordZoneID zone{row.text(1)};
        if (!row.isNull(4)) zone.ownerName = row.text(4);
        zones[zone] = state;
        if (changed && isChangedByOthers(connection, zone, state)) changed->push_back(zone);
      }
    });
  }

  bool isChangedByOthers(const Connection &connection, const CKRecordZoneID &zone,
                         const ZoneState &state) const {
    const auto before = zones_.find(zone);
    const bool isNew = before == zones_.end() || before->second.number != state.number;
    if (isNew && !state.isOwn) return true;
    const std::int64_t seq = isNew ? 0 : before->second.seq;
    if (state.seq == seq) return false;
    if (state.seq < seq) return true;  // put back to an earlier state
    SqlUse row = connection.use(queries_.changes);
    return row.bind(state.number).bind(seq).bind(home_->session()).step();
  }

  void look() {
    Zones zones;
    std::vector<CKRecordZoneID> changed;
    if (const NSError error = readZones(zones, &changed)) {
      // The next look tells what this one would have.
      if (!context_.isCancelled()) {
        os_log_debug(os_log_create("droxa", "cloudkit"), "can't look for changes: %@", error);
      }
      return;
    }
    for (const auto &zone : zones_) {
      if (!zones.contains(zone.first)) changed.push_back(zone.first);
    }
    zones_ = std::move(zones);
    if (!changed.empty() && !context_.isCancelled()) handler_(changed);
  }

  const std::shared_ptr<Home> home_;
  const CKZonesChangedHandler handler_;
  const Queries &queries_;
  const int inotify_;
  const int stopped_;
  CKCallContext context_;
  Zones zones_;  // as of the last look
};

class Subscription final : public CKSubscription {
 public:
  explicit Subscription(std::shared_ptr<Watch> watch)
      : watch_(std::move(watch)), thread_([held = watch_] { held->run(); }) {}
  ~Subscription() override {
    watch_->stop();
    if (thread_.get_id() == std::this_thread::get_id()) {
      thread_.detach();  // the handler itself releases it; the thread ends when the handler returns
    } else {
      thread_.join();
    }
  }
  Subscription(const Subscription &) = delete;
  Subscription &operator=(const Subscription &) = delete;

 private:
  const std::shared_ptr<Watch> watch_;
  std::thread thread_;
};

}  // namespace

std::unique_ptr<CKSubscription> Subscribe(std::shared_ptr<Home> home, CKZonesChangedHandler handler,
                                          NSError *error) {
  auto watch = std::make_shared<Watch>(std::move(home), std::move(handler));
  if (NSError failure = watch->begin()) {
    if (error) *error = failure;
    return nullptr;
  }
  return std::make_unique<Subscription>(std::move(watch));
}

}  // namespace droxa::embedded
