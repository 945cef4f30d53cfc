#include "platform/xpc/capnp/Progress.h"

#include <kj/debug.h>
#include <utility>

#include "platform/foundation/ThreadSafety.h"
#include "platform/xpc/capnp/Exported.h"
#include "platform/xpc/capnp/Proxy.h"

namespace droxa {
namespace {

class RemoteProgress {
 public:
  virtual ~RemoteProgress() = default;
  virtual void cancel() = 0;
};

class ProgressServer final : public schema::NSProgress::Server {
 public:
  ProgressServer(Session &session, std::shared_ptr<NSProgress> progress)
      : exported_(session, std::move(progress)) {}

  kj::Promise<void> cancel(CancelContext context) override {
    return exported_.serve(context, [](auto &progress, auto reply) {
      progress.cancel();
      reply.done();
    });
  }

 private:
  Exported<NSProgress> exported_;
};

class ProgressProxy final : public XPCProxy<schema::NSProgress, RemoteProgress, ProgressProxy> {
 public:
  using XPCProxy::XPCProxy;
  void cancel() override {
    tell(&Client::cancelRequest, [](auto, Session &) {});
  }
};

// What the mirror is told, whichever side of a connection that comes from.
class ProgressWatching {
 public:
  virtual ~ProgressWatching() = default;
  virtual void began(std::shared_ptr<RemoteProgress> progress, std::int64_t completed,
                     std::int64_t total) = 0;
};

// The mirror, held weakly. The way to cancel the real one belongs to its cancellation handler, so it goes
// with the mirror.
class Mirror final : public ProgressWatching {
 public:
  explicit Mirror(std::weak_ptr<NSProgress> mirror) : mirror_(std::move(mirror)) {}

  void began(std::shared_ptr<RemoteProgress> progress, std::int64_t completed, std::int64_t total) override {
    const auto mirror = mirror_.lock();
    if (!mirror || !progress) return;
    show(completed, total);
    mirror->setCancellationHandler([remote = std::move(progress)] { remote->cancel(); });
  }
  void show(std::int64_t completed, std::int64_t total) const {
    const auto mirror = mirror_.lock();
    if (!mirror) return;
    mirror->setTotalUnitCount(total);
    mirror->setCompletedUnitCount(completed);
  }

 private:
  const std::weak_ptr<NSProgress> mirror_;
};

// Serial: what was told first is shown first.
class WatcherServer final : public schema::NSProgressWatcher::Server {
 public:
  WatcherServer(Session &session, std::shared_ptr<Mirror> mirror)
      : exported_(session, std::move(mirror), XPCOrder::serial) {}

  kj::Promise<void> began(BeganContext context) override {
    const auto params = context.getParams();
    std::shared_ptr<RemoteProgress> progress;
    if (params.hasProgress()) {
      const auto session = exported_.session();
      KJ_REQUIRE(session != nullptr, "the connection ended");
      progress =
          std::make_shared<ProgressProxy>(RemoteObject::received(*session, params.getProgress(), nullptr));
    }
    return exported_.serve(context, [progress, completed = params.getCompleted(), total = params.getTotal()](
                                        auto &mirror, auto reply) {
      mirror.began(progress, completed, total);
      reply.done();
    });
  }

  kj::Promise<void> changed(ChangedContext context) override {
    const auto params = context.getParams();
    return exported_.serve(
        context, [completed = params.getCompleted(), total = params.getTotal()](auto &mirror, auto reply) {
          mirror.show(completed, total);
          reply.done();
        });
  }

 private:
  Exported<Mirror> exported_;
};

class ProgressFollowing {
 public:
  virtual ~ProgressFollowing() = default;
};

// The caller's watcher, told of one progress: one change at a time is on its way, and the next one says how
// things are by then.
class Follower final : public XPCProxy<schema::NSProgressWatcher, ProgressFollowing, Follower>,
                       public std::enable_shared_from_this<Follower> {
 public:
  using XPCProxy::XPCProxy;

  void follow(const std::shared_ptr<NSProgress> &progress) {
    if (progress) {
      {
        const Lock lock(mutex_);
        progress_ = progress;
        isUnderWay_ = true;
      }
      progress->addChangeHandler([self = shared_from_this()] { self->changed(); });
    }
    call(
        &Client::beganRequest,
        [progress](auto params, Session &session) {
          if (!progress) return;
          params.setProgress(kj::heap<ProgressServer>(session, progress));
          params.setCompleted(progress->completedUnitCount());
          params.setTotal(progress->totalUnitCount());
        },
        [self = shared_from_this()] { self->wasTold(); },
        [](auto, const RemoteObject &) { return std::tuple(); }, kUnheard);
  }

 private:
  // A caller that can't be told any more isn't told any more.
  struct Unheard {
    template <class Completion>
    void operator()(const Completion & /*completion*/, const NSError & /*error*/) const {}
  };
  static constexpr XPCCallOptions<Unheard> kUnheard{false, {}};

  void changed() {
    {
      const Lock lock(mutex_);
      isBehind_ = isUnderWay_;
      if (isUnderWay_) return;
      isUnderWay_ = true;
    }
    tellCounts();
  }
  void wasTold() {
    {
      const Lock lock(mutex_);
      isUnderWay_ = isBehind_;
      if (!isBehind_) return;
      isBehind_ = false;
    }
    tellCounts();
  }
  void tellCounts() {
    std::shared_ptr<NSProgress> progress;
    {
      const Lock lock(mutex_);
      progress = progress_.lock();
    }
    if (!progress) return;
    call(
        &Client::changedRequest,
        [completed = progress->completedUnitCount(), total = progress->totalUnitCount()](auto params,
                                                                                         Session &) {
          params.setCompleted(completed);
          params.setTotal(total);
        },
        [self = shared_from_this()] { self->wasTold(); },
        [](auto, const RemoteObject &) { return std::tuple(); }, kUnheard);
  }

  Mutex mutex_;
  std::weak_ptr<NSProgress> progress_ GUARDED_BY(mutex_);
  bool isUnderWay_ GUARDED_BY(mutex_) = false;
  bool isBehind_ GUARDED_BY(mutex_) = false;
};

}  // namespace

schema::NSProgressWatcher::Client exportProgressMirror(Session &session, std::weak_ptr<NSProgress> mirror) {
  return kj::heap<WatcherServer>(session, std::make_shared<Mirror>(std::move(mirror)));
}

ProgressReturn receivedProgressWatcher(Session &session, schema::NSProgressWatcher::Client client) {
  const auto follower = std::make_shared<Follower>(RemoteObject::received(session, kj::mv(client), nullptr));
  return [follower](const std::shared_ptr<NSProgress> &progress) { follower->follow(progress); };
}

}  // namespace droxa
