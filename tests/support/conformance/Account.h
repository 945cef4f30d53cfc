#pragma once

#include "tessaly/QVNotifications.h"
#include "tests/support/conformance/DaemonConformanceFixture.h"
#include "tests/support/conformance/Senders.h"

// The account, the daemon's notifications, its status.

namespace droxa {

using ConformanceAccount = std::optional<QVAccountDescription>;

TEST_P(DaemonConformance, nothingIsListedWhileNobodyIsSignedIn) {
  folder("f");
  settle();
  const QVFileObjectID f = identifier("f");
  signOut();
  EXPECT_EQ(tessalyCode(page(f, 0, 0, 10).error), QVErrorLoggedOut);
  EXPECT_EQ(tessalyCode(page(std::nullopt, 0, 0, 10).error), QVErrorLoggedOut);
  EXPECT_EQ(tessalyCode(folderPage(0, 0, 10).error), QVErrorLoggedOut);
  Once<std::uint64_t, NSError> currentRank("rank");
  daemon()->currentNotifRankWithReply(currentRank.completion());
  EXPECT_EQ(tessalyCode(currentRank.value<1>()), QVErrorLoggedOut);
  Once<QVQueryItems, std::vector<QVFileObjectID>, NSData, NSError> changes("working set");
  daemon()->enumerateWorkingSetChangesFromChangeToken(NSData(), 10, changes.completion());
  EXPECT_EQ(tessalyCode(changes.value<3>()), QVErrorLoggedOut);
}

TEST_P(DaemonConformance, whoSignsInAgainFindsTheDrive) {
  file("a");
  settle();
  signOut();
  signIn("anna");
  settle();
  EXPECT_TRUE(hasName(list(std::nullopt), "a"));
}

TEST_P(DaemonConformance, theAccountIsToldAsItWasSignedIn) {
  const ConformanceAccount signedIn = signIn("J\xc3\xb6rg \"the second\"");
  ASSERT_TRUE(signedIn);
  EXPECT_EQ(signedIn->name, "J\xc3\xb6rg \"the second\"");
  EXPECT_TRUE(signedIn->perAppAccountIdentifier);
  Once<ConformanceAccount, NSError> before("account");
  daemon()->getAccount(before.completion());
  EXPECT_EQ(before.value<0>(), signedIn);
  signOut();
  Once<ConformanceAccount, NSError> after("account");
  daemon()->getAccount(after.completion());
  EXPECT_EQ(after.value<0>(), std::nullopt);
  EXPECT_EQ(after.value<1>(), NSError());
}

TEST_P(DaemonConformance, signingInReplacesWhoWas) {
  signIn("anna");
  signIn("bert");
  Once<ConformanceAccount, NSError> account("account");
  daemon()->getAccount(account.completion());
  ASSERT_TRUE(account.value<0>());
  EXPECT_EQ(account.value<0>()->name, "bert");
}

TEST_P(DaemonConformance, aNameThatIsNoneIsAnInvalidArgument) {
  signIn("anna");
  for (const std::string &name :
       {std::string(), std::string("a\nb"), std::string("a\0b", 3), std::string("\x7f")}) {
    Once<ConformanceAccount, NSError> answer("sign in");
    daemon()->signIn(name, answer.completion());
    EXPECT_EQ(tessalyCode(answer.value<1>()), QVErrorInvalidArgument);
  }
  Once<ConformanceAccount, NSError> account("account");
  daemon()->getAccount(account.completion());
  ASSERT_TRUE(account.value<0>());
  EXPECT_EQ(account.value<0>()->name, "anna");
}

TEST_P(DaemonConformance, subscribersAreToldOfTheAccount) {
  const auto subscriber = std::make_shared<RecordingSubscriber>();
  Once<NSError> subscribed("subscription");
  daemon()->subscribeToNotifications(subscriber, subscribed.completion());
  ASSERT_EQ(subscribed.value<0>(), NSError());
  EXPECT_TRUE(subscriber->names().empty());
  signOut();
  EXPECT_TRUE(subscriber->waitFor(QVAccountTokenDidChangeNotification));
}

TEST_P(DaemonConformance, theStatusTellsRankAndCounts) {
  folder("f");
  file("f/a");
  file("b");
  world_->makeAlias(at("alias"), at("b"));
  settle();
  const ConformanceWatch watch(daemon());
  const std::uint64_t before =
      rank();  // a daemon that looks from time to time may still notice a folder's date
  Once<QVDaemonStatus, NSError> answer("status");
  daemon()->getStatus(answer.completion());
  ASSERT_EQ(answer.value<1>(), NSError());
  const QVDaemonStatus status = answer.value<0>();
  EXPECT_GE(status.rank, before);
  EXPECT_LE(status.rank, rank());
  EXPECT_EQ(status.documents, 2U);
  EXPECT_GE(status.folders, 1U);
  EXPECT_EQ(status.aliases, 1U);
  EXPECT_EQ(status.senders, 1U);
  EXPECT_TRUE(status.firstScanDone);
}

}  // namespace droxa
