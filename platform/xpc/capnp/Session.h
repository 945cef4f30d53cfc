#pragma once

#include <atomic>
#include <capnp/rpc-twoparty.h>
#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <unordered_map>

#include "platform/xpc/capnp/CallGate.h"
#include "platform/xpc/capnp/CallRecord.h"
#include "platform/xpc/capnp/Loop.h"
#include "platform/xpc/capnp/SessionStream.h"

namespace droxa {

class XPCConnection;

// A call of the peer that wasn't answered yet.
// Thread contract: the loop.
class UnansweredCall {
 public:
  virtual ~UnansweredCall() noexcept(false) = default;
  virtual void abandon(const char *why) = 0;  // answers with a failure
};

// The loop's side of one connection: the socket, the library's objects over it, the calls under way in both
// directions.
//
// Each outgoing call has a record here until its reply, its failure, its deadline or the session's end takes
// it out: whoever takes the record answers the call, so it is answered once.
//
// Thread contract: create(), start(), end(), setCallDeadline() and callDeadline() on any thread; everything
// else on the loop, where the session is destroyed too.
class Session final : public std::enable_shared_from_this<Session>,
                      public XPCLoopResident,
                      private kj::TaskSet::ErrorHandler {
 public:
  using Exporter = kj::Function<capnp::Capability::Client(Session &)>;

  // Takes ownership of the socket.
  static std::shared_ptr<Session> create(int socket, std::int32_t peer);
  ~Session() noexcept(false);

  // Calls made before the start wait for it. `connection` is kept until the end.
  void start(std::shared_ptr<XPCConnection> connection, Exporter exporter);
  // Ends the session by this side's wish, which is told to `connection` (null: to nobody). What this side has
  // said before, answers and calls, is still written, as far as the peer reads it soon.
  void end(std::shared_ptr<XPCConnection> connection);
  void setCallDeadline(std::chrono::milliseconds deadline) { callDeadline_ = deadline.count(); }
  std::chrono::milliseconds callDeadline() const { return std::chrono::milliseconds(callDeadline_); }

  capnp::Capability::Client &peerObject() { return peerObject_; }
  const std::weak_ptr<XPCConnection> &connection() const { return weakConnection_; }
  const std::shared_ptr<CallGate> &gate() const { return gate_; }

  // Makes a call: `send(record, number)` sends it and returns a promise of what gives the reply to the
  // record.
  template <class Record, class Send>
  void call(std::unique_ptr<Record> record, std::optional<std::chrono::milliseconds> deadline, Send send) {
    if (over_ || isEnding_) return refuse(std::move(record));
    allowDescriptors();
    const std::uint64_t number = ++lastCall_;
    Record &kept = *record;
    calls_.emplace(number, std::move(record));
    kj::Promise<void> work = kj::evalNow([&] {
                               return send(kept, number);
                             }).then([this, number](ReplyBlock &&reply) { answer(number, kj::mv(reply)); });
    track(number, deadline, kj::mv(work));
  }

  // The failure of calls over a connection that this side has ended.
  static NSError invalidError();

  // Whether the call still waits for its answer; else its record is gone.
  bool waits(std::uint64_t number) const { return calls_.contains(number); }

  // Remembers a call of the peer; 0 when there are too many, which ends the session.
  std::uint64_t addUnanswered(UnansweredCall &call);
  void removeUnanswered(std::uint64_t number) { unanswered_.erase(number); }
  // Ends the session when the peer doesn't read what is written to it.
  void watchQueue();
  void watchQueueSoon();

  void loopDidEnd() override;

 private:
  Session(int socket, std::int32_t peer);
  void prepare();
  void startOnLoop(std::shared_ptr<XPCConnection> connection, Exporter exporter);
  void allowDescriptors();
  void drop(const std::string &why);  // ends the session because of what the peer did, and logs it
  void endWhenWritten();
  void endOnLoop(bool byPeer);
  void tearDown();
  void track(std::uint64_t number, std::optional<std::chrono::milliseconds> deadline, kj::Promise<void> work);
  void refuse(std::unique_ptr<CallRecord> record);
  std::unique_ptr<CallRecord> take(std::uint64_t number);
  void answer(std::uint64_t number, ReplyBlock reply);
  void fail(std::uint64_t number, kj::Exception &&problem);
  void taskFailed(kj::Exception &&problem) override;

  // Constant after construction.
  const std::int32_t peer_;
  const std::shared_ptr<CallGate> gate_ = std::make_shared<CallGate>();
  // Any thread.
  std::atomic<std::int64_t> callDeadline_ = 30000;
  // The loop's.
  kj::AutoCloseFd socket_;
  std::shared_ptr<XPCConnection> connection_;  // from the start to the end
  std::weak_ptr<XPCConnection> weakConnection_;
  kj::Own<kj::PromiseFulfiller<capnp::Capability::Client>> started_;
  capnp::Capability::Client peerObject_;
  kj::Own<SessionStream> stream_;
  kj::Own<capnp::TwoPartyVatNetwork> network_;
  kj::Own<capnp::RpcSystem<capnp::rpc::twoparty::VatId>> rpc_;
  kj::Own<kj::TaskSet> tasks_;
  std::unordered_map<std::uint64_t, std::unique_ptr<CallRecord>> calls_;
  std::unordered_map<std::uint64_t, UnansweredCall *> unanswered_;
  std::uint64_t lastCall_ = 0;  // how many there were
  std::uint64_t lastUnanswered_ = 0;
  bool isEnding_ = false;  // by this side's wish; over as soon as what waits is written
  kj::TimePoint writingEnds_ = kj::origin<kj::TimePoint>();
  bool over_ = false;
};

}  // namespace droxa
