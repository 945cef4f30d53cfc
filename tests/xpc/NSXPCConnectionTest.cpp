#include <atomic>
#include <cstdlib>
#include <gtest/gtest.h>
#include <thread>
#include <unistd.h>

#include "platform/fileprovider/xpc/FileProviderInterfaces.h"
#include "platform/oslog/os_log.h"
#include "platform/xpc/NSXPCConnection.h"
#include "tests/support/Once.h"
#include "tests/xpc/CallOutcomes.h"
#include "tests/xpc/ConnectedPair.h"
#include "tests/xpc/ScriptedHost.h"

namespace droxa {
namespace {

using Host = NSFileProviderHostProtocol;

void serveHost(ConnectedPair &pair, std::shared_ptr<Host> host) {
  pair.serve<Host>(NSFileProviderHostInterface(), std::move(host));
}

std::shared_ptr<Host> proxy(const std::shared_ptr<NSXPCConnection> &connection) {
  return connection->remoteObjectProxyWithErrorHandler<Host>(
      [](const NSError &error) { ADD_FAILURE() << error.description(); });
}

TEST(NSXPCConnection, aCallIsAnsweredByTheExportedObject) {
  ConnectedPair pair;
  serveHost(pair, std::make_shared<ScriptedHost>([](const std::string &asked, const auto &completion) {
              completion(NSError("Asked", 7, {{NSLocalizedDescriptionKey, asked}}));
            }));
  Once<NSError> answer("answer");
  proxy(pair.client)->signalEnumerator(std::string("\xff\0\n", 3), answer.completion());
  EXPECT_EQ(answer.value<0>(),
            NSError("Asked", 7, {{NSLocalizedDescriptionKey, std::string("\xff\0\n", 3)}}));
}

TEST(NSXPCConnection, bothEndsMayCallAtOnce) {
  ConnectedPair pair;
  for (const auto &end : {pair.server, pair.client}) {
    end->setExportedObject<Host>(NSFileProviderHostInterface(), ScriptedHost::answering());
    end->setRemoteObjectInterface(NSFileProviderHostInterface());
    end->resume();
  }
  CallOutcomes outcomes;
  for (int round = 0; round < 100; ++round) {
    outcomes.call(pair.client, "to the server");
    outcomes.call(pair.server, "to the client");
  }
  EXPECT_TRUE(outcomes.waitForAll());
  EXPECT_EQ(outcomes.replies(), 200);
  outcomes.expectEachEndedOnce();
}

TEST(NSXPCConnection, aCallMadeBeforeTheResumptionIsDeliveredAfterIt) {
  ConnectedPair pair;
  pair.client->setRemoteObjectInterface(NSFileProviderHostInterface());
  Once<NSError> answer("answer");
  proxy(pair.client)->signalEnumerator("early", answer.completion());
  serveHost(pair, ScriptedHost::answering());
  EXPECT_EQ(answer.value<0>(), NSError());
}

TEST(NSXPCConnection, aSynchronousCallReturnsAfterItsReplyOnTheCallingThread) {
  ConnectedPair pair;
  serveHost(pair, ScriptedHost::answering());
  const auto host = pair.client->synchronousRemoteObjectProxyWithErrorHandler<Host>(
      [](const NSError &error) { ADD_FAILURE() << error.description(); });
  for (int round = 0; round < 50; ++round) {
    std::thread::id replied;
    host->signalEnumerator("now", [&replied](const NSError &) { replied = std::this_thread::get_id(); });
    EXPECT_EQ(replied, std::this_thread::get_id());
  }
}

TEST(NSXPCConnection, aSynchronousCallToAGonePeerReturnsAfterItsErrorHandlerOnTheCallingThread) {
  ConnectedPair pair;
  serveHost(pair, ScriptedHost::answering());
  pair.client->invalidate();
  std::thread::id failed;
  NSError told;
  const auto host =
      pair.client->synchronousRemoteObjectProxyWithErrorHandler<Host>([&](const NSError &error) {
        failed = std::this_thread::get_id();
        told = error;
      });
  host->signalEnumerator("now", [](const NSError &) { ADD_FAILURE(); });
  EXPECT_EQ(failed, std::this_thread::get_id());
  EXPECT_TRUE(told.is(NSCocoaErrorDomain, NSXPCConnectionInvalid)) << told.description();
}

TEST(NSXPCConnection, anInvalidationFailsTheCallsUnderWayAndTellsItsHandlerLast) {
  ConnectedPair pair;
  const auto host = std::make_shared<SilentHost>();
  CallOutcomes outcomes;
  outcomes.follow(pair.client);
  serveHost(pair, host);
  for (int round = 0; round < 20; ++round) outcomes.call(pair.client, "");
  EXPECT_TRUE(eventually([&] { return host->calls() == 20; }));
  pair.client->invalidate();
  EXPECT_TRUE(outcomes.waitForLast("invalidation"));
  outcomes.expectEachEndedOnce();
  std::vector<std::string> expected(20, "failure");
  expected.push_back("invalidation");
  EXPECT_EQ(outcomes.order(), expected);
  EXPECT_EQ(outcomes.codes(), std::vector<std::int64_t>(20, NSXPCConnectionInvalid));
}

TEST(NSXPCConnection, thePeersEndInterruptsBeforeItInvalidates) {
  ConnectedPair pair;
  const auto host = std::make_shared<SilentHost>();
  CallOutcomes outcomes;
  outcomes.follow(pair.client);
  serveHost(pair, host);
  outcomes.call(pair.client, "");
  EXPECT_TRUE(eventually([&] { return host->calls() == 1; }));
  pair.server->invalidate();
  EXPECT_TRUE(outcomes.waitForLast("invalidation"));
  EXPECT_EQ(outcomes.order(), (std::vector<std::string>{"failure", "interruption", "invalidation"}));
  EXPECT_EQ(outcomes.codes(), std::vector<std::int64_t>{NSXPCConnectionInterrupted});
  outcomes.call(pair.client, "after the end");
  EXPECT_TRUE(outcomes.waitForAll());
  EXPECT_EQ(outcomes.codes().back(), NSXPCConnectionInvalid);
  pair.client->invalidate();
  outcomes.expectEachEndedOnce();
}

// A reply of any size that the server gives before it ends the connection is the call's answer.
void expectAnsweredBeforeTheEnd(std::size_t size) {
  for (int round = 0; round < 50; ++round) {
    ConnectedPair pair;
    CallOutcomes outcomes;
    outcomes.follow(pair.client);
    serveHost(
        pair, std::make_shared<ScriptedHost>([&](const std::string &,
                                                 const NSFileProviderErrorCompletion &completion) {
          completion(NSError(NSPOSIXErrorDomain, 1, {{NSLocalizedDescriptionKey, std::string(size, 'x')}}));
          pair.server->invalidate();
        }));
    outcomes.call(pair.client, "");
    ASSERT_TRUE(outcomes.waitForLast("invalidation"));
    ASSERT_TRUE(outcomes.waitForAll());
    ASSERT_EQ(outcomes.replies(), 1) << "round " << round;
    outcomes.expectEachEndedOnce();
  }
}

TEST(NSXPCConnection, aReplyGivenJustBeforeTheInvalidationArrives) {
  expectAnsweredBeforeTheEnd(10);
}

TEST(NSXPCConnection, aReplyLargerThanTheSocketGivenJustBeforeTheInvalidationArrives) {
  expectAnsweredBeforeTheEnd(4U << 20);
}

TEST(NSXPCConnection, aCallMadeJustBeforeTheInvalidationIsDeliveredAndFailsOnce) {
  ConnectedPair pair;
  const auto host = std::make_shared<SilentHost>();
  CallOutcomes outcomes;
  serveHost(pair, host);
  outcomes.call(pair.client, "");
  EXPECT_TRUE(eventually([&] { return host->calls() == 1; }));
  outcomes.call(pair.client, "");
  pair.client->invalidate();
  outcomes.call(pair.client, "too late");
  EXPECT_TRUE(outcomes.waitForAll());
  EXPECT_EQ(outcomes.codes(), std::vector<std::int64_t>(3, NSXPCConnectionInvalid));
  outcomes.expectEachEndedOnce();
}

TEST(NSXPCConnection, aPeerThatDoesntReadHoldsTheEndUpForASecondAtMost) {
  ConnectedPair pair;
  CallOutcomes outcomes;
  outcomes.follow(pair.client);
  pair.client->setRemoteObjectInterface(NSFileProviderHostInterface());
  pair.client->resume();  // the server never is: nobody reads
  outcomes.call(pair.client, std::string(4U << 20, 'x'));
  pair.client->invalidate();
  EXPECT_TRUE(outcomes.waitForLast("invalidation"));
  EXPECT_EQ(outcomes.codes(), std::vector<std::int64_t>{NSXPCConnectionInvalid});
}

// Exits with a synchronous call under way and one that is made later. Both have to return.
void exitDuringSynchronousCalls() {
  static std::shared_ptr<Host> host;
  static std::thread caller;
  static std::atomic<int> failures = 0;
  // Registered before the loop's own handler, hence run after it.
  std::atexit([] {
    caller.join();
    host->signalEnumerator("after the loop's end", [](const NSError &) {});
    _exit(failures == 2 ? 7 : 1);
  });
  ConnectedPair pair;
  const auto silent = std::make_shared<SilentHost>();
  serveHost(pair, silent);
  host = pair.client->synchronousRemoteObjectProxyWithErrorHandler<Host>([](const NSError &error) {
    if (error.is(NSCocoaErrorDomain, NSXPCConnectionInvalid)) ++failures;
  });
  caller = std::thread([] { host->signalEnumerator("under way", [](const NSError &) {}); });
  if (eventually([&] { return silent->calls() == 1; })) std::exit(0);
  _exit(2);
}

TEST(NSXPCConnectionDeathTest, synchronousCallsWhileTheProcessExitsReturn) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_EXIT(exitDuringSynchronousCalls(), testing::ExitedWithCode(7), "");
}

// What it holds must not count as lost at the process's exit.
TEST(NSXPCConnection, aQuietConnectionMayLastUntilTheProcessExits) {
  int ends[2] = {-1, -1};
  ASSERT_EQ(socketpair(AF_UNIX, SOCK_STREAM, 0, ends), 0);
  for (const int end : ends) {
    const auto connection = NSXPCConnection::connectionWithDescriptor(end);
    connection->setExportedObject<Host>(NSFileProviderHostInterface(), ScriptedHost::answering());
    connection->setRemoteObjectInterface(NSFileProviderHostInterface());
    connection->resume();
    if (end == ends[0]) continue;
    Once<NSError> answer("answer");
    proxy(connection)->signalEnumerator("", answer.completion());
    EXPECT_EQ(answer.value<0>(), NSError());
  }
}

TEST(NSXPCConnection, anInvalidationBeforeTheResumptionIsToldToo) {
  ConnectedPair pair;
  CallOutcomes outcomes;
  outcomes.follow(pair.client);
  pair.client->invalidate();
  EXPECT_TRUE(outcomes.waitForLast("invalidation"));
  pair.client->resume();
  pair.client->invalidate();
  EXPECT_EQ(outcomes.order(), std::vector<std::string>{"invalidation"});
}

TEST(NSXPCConnection, aCallPastItsDeadlineFailsAndItsLateReplyIsDropped) {
  ConnectedPair pair;
  const auto host = std::make_shared<SilentHost>();
  pair.client->setCallDeadline(std::chrono::milliseconds(20));
  serveHost(pair, host);
  CallOutcomes outcomes;
  outcomes.call(pair.client, "");
  EXPECT_TRUE(outcomes.waitForAll());
  EXPECT_EQ(outcomes.codes(), std::vector<std::int64_t>{NSXPCConnectionReplyInvalid});
  EXPECT_TRUE(eventually([&] { return host->calls() == 1; }));
  for (const auto &reply : host->take()) reply({});
  pair.client->setCallDeadline(std::chrono::seconds(30));
  outcomes.call(pair.client, "");
  EXPECT_TRUE(eventually([&] { return host->calls() == 1; }));
  for (const auto &reply : host->take()) reply({});
  EXPECT_TRUE(outcomes.waitForAll());
  EXPECT_EQ(outcomes.replies(), 1);
  outcomes.expectEachEndedOnce();
}

TEST(NSXPCConnection, aSecondAnswerIsAFaultAndIgnored) {
  const OSLogCapture log;
  ConnectedPair pair;
  serveHost(pair, std::make_shared<ScriptedHost>([](const std::string &, const auto &completion) {
              completion({});
              completion(NSError("Twice", 2));
            }));
  Once<NSError> answer("answer");
  proxy(pair.client)->signalEnumerator("", answer.completion());
  EXPECT_EQ(answer.value<0>(), NSError());
  EXPECT_TRUE(eventually([&] { return log.contains("[CRIT] Assertion failed: a call is answered once"); }));
  for (const OSLogLine &line : log.lines()) {
    if (line.text.starts_with("[CRIT]")) {
      EXPECT_EQ(line.type, os_log_type_t::fault);
    }
  }
}

TEST(NSXPCConnection, aReplyDroppedUnansweredFailsTheCall) {
  ConnectedPair pair;
  serveHost(pair, std::make_shared<ScriptedHost>([](const std::string &, const auto &) {}));
  CallOutcomes outcomes;
  outcomes.call(pair.client, "");
  EXPECT_TRUE(outcomes.waitForAll());
  EXPECT_EQ(outcomes.codes(), std::vector<std::int64_t>{NSXPCConnectionReplyInvalid});
}

TEST(NSXPCConnection, aPeerThatExportsNothingFailsTheCallsAndStaysConnected) {
  ConnectedPair pair;
  pair.client->setRemoteObjectInterface(NSFileProviderHostInterface());
  pair.server->resume();
  pair.client->resume();
  CallOutcomes outcomes;
  outcomes.follow(pair.client);
  outcomes.call(pair.client, "");
  outcomes.call(pair.client, "");
  EXPECT_TRUE(outcomes.waitForAll());
  EXPECT_EQ(outcomes.order(), (std::vector<std::string>{"failure", "failure"}));
}

TEST(NSXPCConnection, aPeerThatExportsAnotherProtocolFailsTheCalls) {
  ConnectedPair pair;
  pair.server->setExportedObject<Host>(NSFileProviderHostInterface(), ScriptedHost::answering());
  pair.client->setRemoteObjectInterface(FPDControlInterface());
  pair.server->resume();
  pair.client->resume();
  Once<NSError> failure("failure");
  pair.client->remoteObjectProxyWithErrorHandler<FPDControlProtocol>(failure.completion())
      ->getStatus([](const FPDStatus &) { ADD_FAILURE(); });
  EXPECT_TRUE(failure.value<0>().is(NSCocoaErrorDomain, NSXPCConnectionReplyInvalid));
}

TEST(NSXPCConnection, theServedCallsConnectionIsTheCurrentOne) {
  EXPECT_EQ(NSXPCConnection::currentConnection(), nullptr);
  ConnectedPair pair;
  std::atomic<bool> same = false;
  serveHost(pair, std::make_shared<ScriptedHost>([&](const std::string &, const auto &completion) {
              same = NSXPCConnection::currentConnection() == pair.server;
              completion({});
            }));
  Once<NSError> answer("answer");
  proxy(pair.client)->signalEnumerator("", answer.completion());
  EXPECT_TRUE(answer.wait());
  EXPECT_TRUE(same);
  EXPECT_EQ(NSXPCConnection::currentConnection(), nullptr);
}

TEST(NSXPCConnection, thePeerIsWhoTheKernelSays) {
  const ConnectedPair pair;
  const NSXPCPeer peer = pair.server->peer();
  EXPECT_EQ(peer.processIdentifier, getpid());
  EXPECT_EQ(peer.userIdentifier, getuid());
  EXPECT_EQ(peer.groupIdentifier, getgid());
  EXPECT_GE(peer.processDescriptor, 0);
}

TEST(NSXPCConnection, theExportedObjectIsReleasedOnceTheConnectionEnds) {
  std::atomic<int> released = 0;
  ConnectedPair pair;
  serveHost(pair,
            std::make_shared<ScriptedHost>(
                [](const std::string &, const auto &completion) { completion({}); }, [&] { ++released; }));
  Once<NSError> answer("answer");
  proxy(pair.client)->signalEnumerator("", answer.completion());
  EXPECT_TRUE(answer.wait());
  EXPECT_EQ(released, 0);
  pair.client->invalidate();
  EXPECT_TRUE(eventually([&] { return released == 1; }));
}

// A reply that its object keeps must not keep the object in turn.
TEST(NSXPCConnection, anObjectWithAnUnansweredCallIsReleasedOnceTheConnectionEnds) {
  ConnectedPair pair;
  auto host = std::make_shared<SilentHost>();
  const std::weak_ptr<SilentHost> weak = host;
  serveHost(pair, std::move(host));
  CallOutcomes outcomes;
  outcomes.call(pair.client, "");
  EXPECT_TRUE(eventually([&] {
    const auto held = weak.lock();
    return held && held->calls() == 1;
  }));
  pair.client->invalidate();
  EXPECT_TRUE(eventually([&] { return weak.expired(); }));
  outcomes.expectEachEndedOnce();
}

TEST(NSXPCConnection, manyCallsRunABoundedNumberAtOnceAndAllEnd) {
  std::atomic<int> running = 0;
  std::atomic<int> most = 0;
  ConnectedPair pair;
  serveHost(pair, std::make_shared<ScriptedHost>([&](const std::string &, const auto &completion) {
              const int now = ++running;
              int seen = most;
              while (now > seen && !most.compare_exchange_weak(seen, now)) {
              }
              std::this_thread::yield();
              --running;
              completion({});
            }));
  CallOutcomes outcomes;
  for (int round = 0; round < 2000; ++round) outcomes.call(pair.client, "");
  EXPECT_TRUE(outcomes.waitForAll());
  EXPECT_EQ(outcomes.replies(), 2000);
  EXPECT_LE(most, 64);
  outcomes.expectEachEndedOnce();
}

TEST(NSXPCConnection, aPathWithoutAListenerIsAnInvalidConnection) {
  NSError error;
  EXPECT_EQ(NSXPCConnection::connectionWithSocketPath("/nowhere/at all", &error), nullptr);
  EXPECT_TRUE(error.is(NSCocoaErrorDomain, NSXPCConnectionInvalid));
  EXPECT_TRUE(error.underlyingError().is(NSPOSIXErrorDomain, ENOENT));
  EXPECT_NE(error.localizedDescription().find("/nowhere/at all"), std::string::npos);
  EXPECT_EQ(NSXPCConnection::connectionWithSocketPath("/nowhere", nullptr), nullptr);
}

}  // namespace
}  // namespace droxa
