#include <algorithm>
#include <gtest/gtest.h>
#include <random>

#include "tests/xpc/CallOutcomes.h"
#include "tests/xpc/PeerProcess.h"

// What becomes of calls whose peer, another process, dies or hangs.

namespace droxa {
namespace {

TEST(PeerDeath, aKilledPeersCallsFailThenItsConnectionEnds) {
  PeerProcess peer;
  CallOutcomes outcomes;
  outcomes.follow(peer.connection());
  peer.connection()->resume();
  for (int call = 0; call < 50; ++call) outcomes.call(peer.connection(), "hang");
  CallOutcomes answered;
  answered.call(peer.connection(), "answer");
  EXPECT_TRUE(answered.waitForAll());
  EXPECT_EQ(answered.replies(), 1);
  peer.signal(SIGKILL);
  EXPECT_TRUE(outcomes.waitForLast("invalidation"));
  outcomes.expectEachEndedOnce();
  EXPECT_EQ(outcomes.codes(), std::vector<std::int64_t>(50, NSXPCConnectionInterrupted));
  const auto order = outcomes.order();
  EXPECT_EQ(order[order.size() - 2], "interruption");
}

TEST(PeerDeath, anExitInTheMiddleOfACallFailsIt) {
  PeerProcess peer;
  CallOutcomes outcomes;
  peer.connection()->resume();
  outcomes.call(peer.connection(), "exit");
  EXPECT_TRUE(outcomes.waitForAll());
  EXPECT_EQ(outcomes.codes(), std::vector<std::int64_t>{NSXPCConnectionInterrupted});
  EXPECT_EQ(peer.waitForEnd(), 0);
}

TEST(PeerDeath, aStoppedPeersCallsFailAtTheirDeadline) {
  PeerProcess peer;
  CallOutcomes outcomes;
  peer.connection()->resume();
  outcomes.call(peer.connection(), "answer");
  EXPECT_TRUE(outcomes.waitForAll());
  peer.signal(SIGSTOP);
  peer.connection()->setCallDeadline(std::chrono::milliseconds(30));
  for (int call = 0; call < 20; ++call) outcomes.call(peer.connection(), "answer");
  EXPECT_TRUE(outcomes.waitForAll());
  EXPECT_EQ(outcomes.codes(), std::vector<std::int64_t>(20, NSXPCConnectionReplyInvalid));
  peer.signal(SIGCONT);
  peer.connection()->setCallDeadline(std::chrono::seconds(30));
  outcomes.call(peer.connection(), "answer");
  EXPECT_TRUE(outcomes.waitForAll());
  EXPECT_EQ(outcomes.replies(), 2);
  outcomes.expectEachEndedOnce();
}

TEST(PeerDeath, aStormOfKillsEndsEveryCallOnce) {
  std::minstd_rand random(17);
  for (int round = 0; round < 8; ++round) {
    PeerProcess peer;
    CallOutcomes outcomes;
    outcomes.follow(peer.connection());
    peer.connection()->resume();
    const auto killAt = static_cast<unsigned>(random() % 300);
    for (unsigned call = 0; call < 300; ++call) {
      if (call == killAt) peer.signal(SIGKILL);
      outcomes.call(peer.connection(), call % 7 == 0 ? "hang" : "answer");
    }
    EXPECT_TRUE(outcomes.waitForAll());
    EXPECT_TRUE(eventually([&] {
      const auto order = outcomes.order();
      return std::count(order.begin(), order.end(), "invalidation") == 1;
    }));
    outcomes.expectEachEndedOnce();
  }
}

TEST(PeerDeath, aProcessWhoseConnectionEndedExitsCleanly) {
  PeerProcess peer;
  CallOutcomes outcomes;
  peer.connection()->resume();
  outcomes.call(peer.connection(), "answer");
  outcomes.call(peer.connection(), "hang");
  EXPECT_TRUE(eventually([&] { return outcomes.replies() == 1; }));
  peer.connection()->invalidate();
  EXPECT_EQ(peer.waitForEnd(), 0);
  EXPECT_TRUE(outcomes.waitForAll());
  outcomes.expectEachEndedOnce();
}

}  // namespace
}  // namespace droxa
