#pragma once

#include <chrono>
#include <memory>
#include <optional>
#include <tuple>
#include <type_traits>
#include <utility>

#include "platform/xpc/NSXPCProxyCreating.h"
#include "platform/xpc/capnp/RemoteObject.h"

namespace droxa {

void xpcLogFailure(const NSError &error);
void xpcLogWaitOnLoop();

// How a call differs from the proxy's others.
struct XPCNoFailure {};
template <class Failure = XPCNoFailure>
struct XPCCallOptions {
  bool hasDeadline = true;
  Failure failure = {};  // `failure(completion, error)` instead of the error handler
};
inline constexpr XPCCallOptions<> XPCWithoutDeadline{false, {}};
template <class Failure>
XPCCallOptions<Failure> XPCAnsweringFailures(Failure failure) {
  return {true, std::move(failure)};
}

// The record of a call whose request `fill` writes and whose reply goes to `completion`.
template <class Fill, class Completion, class Failure>
class TypedCallRecord final : public CallRecord {
 public:
  TypedCallRecord(RemoteObject called, Fill filling, Completion completing, Failure failing)
      : remote(std::move(called)),
        fill(std::move(filling)),
        completion(std::move(completing)),
        failure(std::move(failing)) {}

  void fail(const NSError &error) override {
    if constexpr (!std::is_same_v<Failure, XPCNoFailure>) {
      failure(completion, error);
    } else if (remote.errorHandler) {
      remote.errorHandler(error);
    } else {
      xpcLogFailure(error);
    }
  }

  RemoteObject remote;
  Fill fill;
  Completion completion;
  Failure failure;
};

template <class Protocol>
struct XPCProxyCreatingProtocol : Protocol, NSXPCProxyCreating<Protocol> {};

// The base of the proxies: `Self` implements `Protocol` by calls of the remote `Schema`.
// Thread contract: any thread, never the loop.
template <class Schema, class Protocol, class Self>
class XPCProxy : public std::conditional_t<std::is_base_of_v<NSXPCProxyCreating<Protocol>, Protocol>,
                                           Protocol, XPCProxyCreatingProtocol<Protocol>> {
 public:
  explicit XPCProxy(RemoteObject remote) : remote_(std::move(remote)) {}

  std::shared_ptr<Protocol> remoteObjectProxyWithErrorHandler(NSXPCErrorHandler handler) override {
    return std::make_shared<Self>(remote_.withErrorHandler(std::move(handler)));
  }

 protected:
  using Client = typename Schema::Client;

  // Makes a call. On the loop, `fill(params, session)` writes the request and `decode(results, remote)` gives
  // the tuple of the completion's arguments, or throws when the reply makes no sense. The method may be one
  // of an interface that the schema extends.
  template <class Called, class Params, class Results, class Fill, class Completion, class Decode,
            class Failure = XPCNoFailure>
  void call(capnp::Request<Params, Results> (Called::*method)(kj::Maybe<capnp::MessageSize>), Fill fill,
            Completion completion, Decode decode, XPCCallOptions<Failure> options = {}) const {
    static_assert(std::is_base_of_v<Called, Client>);
    using Record = TypedCallRecord<Fill, Completion, Failure>;
    auto record =
        std::make_unique<Record>(remote_, std::move(fill), std::move(completion), std::move(options.failure));
    Record &waiting = *record;
    std::shared_ptr<CallWaiter> waiter;
    if (remote_.synchronous) {
      if (XPCLoop::shared().isCurrent()) {
        xpcLogWaitOnLoop();
      } else {
        record->waiter = waiter = std::make_shared<CallWaiter>();
      }
    }
    std::optional<std::chrono::milliseconds> deadline;
    if (options.hasDeadline) deadline = remote_.session->callDeadline();
    const bool posted = XPCLoop::shared().post([method, decode, deadline, session = remote_.session,
                                                made = kj::mv(record)]() mutable {
      session->call(std::move(made), deadline,
                    [&](Record &sent, std::uint64_t number) { return send(method, sent, number, decode); });
    });
    if (!waiter) return;
    if (posted) {
      waiter->wait();
    } else {
      waiting.fail(Session::invalidError());  // the process exits: the record is left where it is
    }
  }

  // A call without a reply: only its failure is told.
  template <class Called, class Params, class Results, class Fill>
  void tell(capnp::Request<Params, Results> (Called::*method)(kj::Maybe<capnp::MessageSize>),
            Fill fill) const {
    call(
        method, std::move(fill), [] {}, [](auto, const RemoteObject &) { return std::tuple(); });
  }

 private:
  template <class Called, class Record, class Params, class Results, class Decode>
  static kj::Promise<ReplyBlock> send(
      capnp::Request<Params, Results> (Called::*method)(kj::Maybe<capnp::MessageSize>), Record &record,
      std::uint64_t number, Decode decode) {
    Called client = record.remote.template as<typename Called::Calls>();
    auto request = (client.*method)(nullptr);
    record.fill(typename Params::Builder(request), *record.remote.session);
    Session &session = *record.remote.session;
    return request.send().then(
        [&record, &session, number, decode](capnp::Response<Results> &&response) -> ReplyBlock {
          if (!session.waits(number)) return nullptr;
          auto values =
              decode(typename Results::Reader(response), static_cast<const RemoteObject &>(record.remote));
          return [kept = std::move(values)](CallRecord &answered) {
            std::apply(static_cast<Record &>(answered).completion, kept);
          };
        });
  }

  const RemoteObject remote_;
};

}  // namespace droxa
