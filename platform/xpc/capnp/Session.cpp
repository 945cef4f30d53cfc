#include "platform/xpc/capnp/Session.h"

#include <utility>
#include <vector>

#include "platform/xpc/capnp/Connection.h"
#include "platform/xpc/capnp/Limits.h"

namespace droxa {
namespace {

using VatId = capnp::rpc::twoparty::VatId;

// How long a connection that this side ends waits for the peer to read what was written before.
constexpr kj::Duration EndingTime = 1 * kj::SECONDS;

capnp::ReaderOptions receiveOptions() {
  capnp::ReaderOptions options;
  options.traversalLimitInWords = XPCMaximumMessageWords;
  return options;
}

NSError transportError(std::int64_t code, std::string description) {
  return {NSCocoaErrorDomain, code, {{NSLocalizedDescriptionKey, std::move(description)}}};
}

}  // namespace

NSError Session::invalidError() {
  return transportError(NSXPCConnectionInvalid, "The connection was invalidated");
}

std::shared_ptr<Session> Session::create(int socket, std::int32_t peer) {
  std::shared_ptr<Session> session(new Session(socket, peer), XPCLoopDeleter());
  XPCLoop::shared().post([session] { session->prepare(); });
  return session;
}

Session::Session(int socket, std::int32_t peer) : peer_(peer), socket_(socket), peerObject_(nullptr) {}

Session::~Session() noexcept(false) {
  XPCLoop::shared().remove(*this);
  tearDown();
}

void Session::prepare() {
  XPCLoop::shared().add(*this);
  tasks_ = kj::heap<kj::TaskSet>(static_cast<kj::TaskSet::ErrorHandler &>(*this));
  auto starting = kj::newPromiseAndFulfiller<capnp::Capability::Client>();
  started_ = kj::mv(starting.fulfiller);
  peerObject_ = kj::mv(starting.promise);
}

void Session::start(std::shared_ptr<XPCConnection> connection, Exporter exporter) {
  XPCLoop::shared().post(
      [self = shared_from_this(), kept = std::move(connection), exporting = kj::mv(exporter)]() mutable {
        self->startOnLoop(std::move(kept), kj::mv(exporting));
      });
}

void Session::end(std::shared_ptr<XPCConnection> connection) {
  XPCLoop::shared().post([self = shared_from_this(), told = std::move(connection)]() mutable {
    if (self->over_) return;
    if (told) self->connection_ = std::move(told);
    if (std::exchange(self->isEnding_, true)) return;
    self->writingEnds_ = XPCLoop::shared().timer().now() + EndingTime;
    // The library writes an answer only some steps after it was given.
    Session &session = *self;
    session.tasks_->add(kj::evalLast([kept = std::move(self)] { kept->endWhenWritten(); }));
  });
}

void Session::endWhenWritten() {
  if (over_) return;
  XPCLoop &loop = XPCLoop::shared();
  if (!network_ || network_->getCurrentQueueSize() == 0 || loop.timer().now() >= writingEnds_)
    return endOnLoop(false);
  tasks_->add(loop.timer().afterDelay(5 * kj::MILLISECONDS).then([kept = shared_from_this()] {
    kept->endWhenWritten();
  }));
}

void Session::startOnLoop(std::shared_ptr<XPCConnection> connection, Exporter exporter) {
  if (over_ || isEnding_) {  // the exported object is a user's
    dispatch_async_global([unused = std::make_shared<Exporter>(kj::mv(exporter))] {});
    return;
  }
  connection_ = std::move(connection);
  weakConnection_ = connection_;
  constexpr unsigned flags = kj::LowLevelAsyncIoProvider::TAKE_OWNERSHIP |
                             kj::LowLevelAsyncIoProvider::ALREADY_CLOEXEC |
                             kj::LowLevelAsyncIoProvider::ALREADY_NONBLOCK;
  stream_ =
      kj::heap<SessionStream>(XPCLoop::shared().io().wrapUnixSocketFd(socket_.release(), flags),
                              XPCMaximumDescriptorsOfPeer, [this](const std::string &why) { drop(why); });
  stream_->allowDescriptors(lastCall_ * XPCMaximumDescriptorsInMessage);
  // Both ends say that they are the client: it makes each of them ask for the other's object, and nothing
  // else depends on it.
  network_ = kj::heap<capnp::TwoPartyVatNetwork>(*stream_, XPCMaximumDescriptorsInMessage,
                                                 capnp::rpc::twoparty::Side::CLIENT, receiveOptions());
  rpc_ = kj::heap<capnp::RpcSystem<VatId>>(capnp::makeRpcServer(*network_, exporter(*this)));
  rpc_->setFlowLimit(XPCMaximumUnansweredWords);
  tasks_->add(network_->onDisconnect().then([this] { endOnLoop(true); }));
  capnp::MallocMessageBuilder message;
  auto peer = message.initRoot<VatId>();
  peer.setSide(capnp::rpc::twoparty::Side::SERVER);
  started_->fulfill(rpc_->bootstrap(peer));
  watchQueueSoon();
}

void Session::drop(const std::string &why) {
  if (over_) return;
  os_log_error(xpcLog(), "[ERROR] the connection with process %d is dropped: %s", peer_, why);
  endOnLoop(true);
}

void Session::endOnLoop(bool byPeer) {
  if (over_) return;
  over_ = true;
  if (stream_) stream_->closing();
  // Let go of by the last call that is failed, so that the connection's handlers come after all of those.
  std::shared_ptr<void> last;
  if (connection_) {
    last = std::shared_ptr<void>(nullptr, [connection = std::move(connection_), byPeer](void *) mutable {
      dispatch_async_global([ended = std::move(connection), byPeer] { ended->sessionDidEnd(byPeer); });
    });
  }
  const NSError error =
      byPeer ? transportError(NSXPCConnectionInterrupted,
                              "The process at the other end (" + std::to_string(peer_) + ") went away")
             : invalidError();
  for (auto &[number, record] : std::exchange(calls_, {})) {
    CallRecord::answer(
        std::move(record), [error](CallRecord &failed) { failed.fail(error); }, last);
  }
  for (const auto &[number, call] : std::exchange(unanswered_, {})) call->abandon("the connection ended");
  gate_->close();
  // The library's objects may be the callers of this.
  XPCLoop::shared().post([self = shared_from_this()] { self->tearDown(); });
}

// Replies can't come any more. Only who waits for one is told: the process exits, and code that nobody waits
// for had better not run now.
void Session::loopDidEnd() {
  std::vector<std::uint64_t> synchronous;
  for (const auto &[number, record] : calls_) {
    if (record->waiter) synchronous.push_back(number);
  }
  for (const std::uint64_t number : synchronous) refuse(take(number));
}

void Session::tearDown() {
  over_ = true;
  if (stream_) stream_->closing();
  tasks_ = nullptr;
  started_ = nullptr;
  peerObject_ = nullptr;
  rpc_ = nullptr;
  network_ = nullptr;
  stream_ = nullptr;
  socket_ = nullptr;
}

void Session::track(std::uint64_t number, std::optional<std::chrono::milliseconds> deadline,
                    kj::Promise<void> work) {
  if (deadline) {
    const auto limit = *deadline;
    work = work.exclusiveJoin(
        XPCLoop::shared().timer().afterDelay(limit.count() * kj::MILLISECONDS).then([limit] {
          KJ_FAIL_REQUIRE("no reply came", limit.count());
        }));
  }
  tasks_->add(work.catch_([this, number](kj::Exception &&problem) { fail(number, kj::mv(problem)); }));
  watchQueueSoon();
}

// Calls made before the start count in startOnLoop().
void Session::allowDescriptors() {
  if (stream_) stream_->allowDescriptors(XPCMaximumDescriptorsInMessage);
}

void Session::refuse(std::unique_ptr<CallRecord> record) {
  CallRecord::answer(std::move(record), [](CallRecord &refused) { refused.fail(invalidError()); });
}

std::unique_ptr<CallRecord> Session::take(std::uint64_t number) {
  auto node = calls_.extract(number);
  return node ? std::move(node.mapped()) : nullptr;
}

void Session::answer(std::uint64_t number, ReplyBlock reply) {
  if (auto record = take(number)) CallRecord::answer(std::move(record), std::move(reply));
}

void Session::fail(std::uint64_t number, kj::Exception &&problem) {
  if (over_) return;
  if (problem.getType() == kj::Exception::Type::DISCONNECTED) {
    endOnLoop(true);  // answers this call along with the others
    return;
  }
  const NSError error = transportError(NSXPCConnectionReplyInvalid, problem.getDescription().cStr());
  if (auto record = take(number)) {
    CallRecord::answer(std::move(record), [error](CallRecord &failed) { failed.fail(error); });
  }
}

std::uint64_t Session::addUnanswered(UnansweredCall &call) {
  if (over_) return 0;
  if (unanswered_.size() >= XPCMaximumUnansweredCalls) {
    drop("it has " + std::to_string(unanswered_.size()) + " calls unanswered");
    return 0;
  }
  unanswered_.emplace(++lastUnanswered_, &call);
  return lastUnanswered_;
}

// A call reaches the queue only after what the loop has to do before, the connection's start among it.
void Session::watchQueueSoon() {
  tasks_->add(kj::evalLast([this] { watchQueue(); }));
}

void Session::watchQueue() {
  if (!network_ || over_ || network_->getCurrentQueueSize() <= XPCMaximumQueuedBytes) return;
  drop("it doesn't read what is written to it");
}

void Session::taskFailed(kj::Exception &&problem) {
  os_log_error(xpcLog(), "[ERROR] a task of the connection with process %d failed: %s", peer_,
               problem.getDescription().cStr());
}

}  // namespace droxa
