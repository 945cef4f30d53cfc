#pragma once

#include <atomic>
#include <functional>
#include <memory>
#include <optional>
#include <tuple>
#include <utility>

#include "platform/dispatch/dispatch.h"
#include "platform/xpc/capnp/CurrentConnection.h"
#include "platform/xpc/capnp/RemoteObject.h"
#include "platform/xpc/capnp/Session.h"

namespace droxa {

void xpcLogSecondAnswer();

// The answer that a call of the peer waits for: given once, by whichever copy of the reply is called first;
// the call whose reply is dropped without an answer fails. Thread contract: claim() on any thread, everything
// else on the loop.
template <class Context>
class OpenReply final : public UnansweredCall {
 public:
  OpenReply(Session &session, Context context, kj::Own<kj::PromiseFulfiller<void>> fulfiller)
      : session_(session.shared_from_this()),
        context_(context),
        fulfiller_(kj::mv(fulfiller)),
        number_(session.addUnanswered(*this)) {
    if (number_ == 0) abandon("the connection ended");
  }
  ~OpenReply() noexcept(false) override { abandon("it was dropped without an answer"); }

  // Whether the caller is the one to answer; logs a second attempt.
  bool claim() {
    if (!claimed_.exchange(true)) return true;
    xpcLogSecondAnswer();
    return false;
  }

  template <class Encode>
  void answer(Encode encode) {
    if (!open_) return;
    open_ = false;
    session_->removeUnanswered(number_);
    auto problem = kj::runCatchingExceptions([&] { encode(context_.getResults(), *session_); });
    KJ_IF_MAYBE (failed, problem) {
      fulfiller_->reject(kj::mv(*failed));
    } else {
      fulfiller_->fulfill();
    }
    session_->watchQueue();
  }

  void abandon(const char *why) override {
    if (!open_) return;
    open_ = false;
    session_->removeUnanswered(number_);
    fulfiller_->reject(KJ_EXCEPTION(FAILED, "the call wasn't answered", why));
  }

 private:
  const std::shared_ptr<Session> session_;
  Context context_;  // valid while open_
  kj::Own<kj::PromiseFulfiller<void>> fulfiller_;
  const std::uint64_t number_;
  bool open_ = true;
  std::atomic<bool> claimed_ = false;
};

// A reply as it is handed to an exported object: `reply(encode)` is what a completion can be made of, where
// `encode(results, session, values…)` writes the answer, on the loop.
// Thread contract: any thread.
template <class Context>
class Reply {
 public:
  explicit Reply(std::shared_ptr<OpenReply<Context>> open) : open_(std::move(open)) {}

  template <class Encode>
  auto operator()(Encode encode) const {
    return [open = open_, encode](const auto &...values) {
      if (!open->claim()) return;
      // Objects among the values are released where the last of them is let go of, which isn't the loop.
      auto kept = std::make_shared<std::tuple<std::decay_t<decltype(values)>...>>(values...);
      XPCLoop::shared().post([open, encode, kept]() mutable {
        open->answer([&](auto results, Session &session) {
          std::apply([&](const auto &...value) { encode(results, session, value...); }, *kept);
        });
        releaseValues(std::move(kept));
      });
    };
  }
  // Answers a call that has no values to give.
  void done() const {
    (*this)([](auto, Session &) {})();
  }

 private:
  template <class T>
  struct IsObject : std::false_type {};
  template <class T>
  struct IsObject<std::shared_ptr<T>> : std::bool_constant<!std::is_const_v<T>> {};

  template <class... Values>
  static void releaseValues(std::shared_ptr<std::tuple<Values...>> kept) {
    if constexpr ((IsObject<Values>::value || ...)) {
      dispatch_async_global([released = std::move(kept)] {});
    }
  }

  std::shared_ptr<OpenReply<Context>> open_;
};

enum class XPCOrder : bool { concurrent, serial };

// An object of this process as the peer may call it; a member of the object's server.
// Thread contract: the loop. The object is called on the pool (serial: one call after the other) and released
// there.
template <class Protocol>
class Exported {
 public:
  Exported(Session &session, std::shared_ptr<Protocol> object, XPCOrder order = XPCOrder::concurrent)
      : session_(session.weak_from_this()), connection_(session.connection()), object_(std::move(object)) {
    if (order == XPCOrder::serial) queue_ = dispatch_queue_create("xpc-object", DISPATCH_QUEUE_SERIAL);
  }
  Exported(const Exported &) = delete;
  Exported &operator=(const Exported &) = delete;
  ~Exported() {
    dispatch_async_global([object = std::move(object_), queue = std::move(queue_)] {});
  }

  // `invoke(object, reply)` calls the object.
  template <class Context, class Invoke>
  kj::Promise<void> serve(Context context, Invoke invoke) {
    const auto session = session_.lock();
    KJ_REQUIRE(session != nullptr, "the connection ended");
    auto answered = kj::newPromiseAndFulfiller<void>();
    Reply<Context> reply(makeSharedOnLoop<OpenReply<Context>>(*session, context, kj::mv(answered.fulfiller)));
    context.releaseParams();
    dispatch_block_t block = [object = object_, connection = connection_, invoke = std::move(invoke),
                              reply = std::move(reply)]() {
      const CurrentConnectionScope scope(connection);
      invoke(*object, reply);
    };
    if (queue_) {
      dispatch_async(queue_, std::move(block));
    } else {
      session->gate()->run(std::move(block));
    }
    return kj::mv(answered.promise);
  }

  std::shared_ptr<Session> session() const { return session_.lock(); }

 private:
  const std::weak_ptr<Session> session_;
  const std::weak_ptr<XPCConnection> connection_;
  std::shared_ptr<Protocol> object_;
  dispatch_queue_t queue_;
};

}  // namespace droxa
