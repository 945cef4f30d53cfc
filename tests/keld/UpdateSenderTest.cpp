// What the daemon pushes of real files.

#include <algorithm>
#include <thread>

#include "tests/keld/KeldFixture.h"

namespace droxa::keld {

namespace {

class SenderPushes : public testing::Test {
 protected:
  static constexpr std::uint64_t kChildren = QVWatchUpdates | QVWatchDeaths | QVWatchCoalesced;

  std::shared_ptr<QVItemNotificationSender> senderInto(const std::shared_ptr<RecordingReceiver> &into) {
    Once<std::shared_ptr<QVItemNotificationSender>, std::map<std::string, std::string>, NSError> answer(
        "sender");
    drive.session()->getItemUpdateSenderWithReceiver(into, answer.completion());
    return answer.value<0>();
  }
  NSError watchBy(const std::shared_ptr<QVItemNotificationSender> &sender, const std::string &path,
                  std::uint64_t options = kChildren) {
    Once<NSError> standing("watch of " + path);
    sender->watchItemAtURL(NSURL::fileURLWithPath(drive.at(path)), options, standing.completion());
    return standing.value<0>();
  }
  std::shared_ptr<QVItemNotificationSender> watch(const std::string &path,
                                                  const std::shared_ptr<RecordingReceiver> &into,
                                                  std::uint64_t options = kChildren) {
    const auto sender = senderInto(into);
    EXPECT_EQ(watchBy(sender, path, options), NSError());
    return sender;
  }
  // How often the item was pushed.
  std::size_t pushesOf(const QVFileObjectID &id) const {
    const auto items = receiver->items();
    return static_cast<std::size_t>(std::count_if(
        items.begin(), items.end(), [&](const auto &item) { return item->fileObjectID() == id; }));
  }

  KeldFixture drive;
  const std::shared_ptr<RecordingReceiver> receiver = std::make_shared<RecordingReceiver>();
};

}  // namespace

TEST_F(SenderPushes, watchAFolderThatIsBrandNew) {
  drive.settle();
  drive.folder("new");
  const auto sender = watch("new", receiver);
  drive.write("new/a");
  EXPECT_TRUE(receiver->waitForUpdateOfName("a"));
}

TEST_F(SenderPushes, pushManyChangesOfOneItemAsOneWhileAPushIsUnderWay) {
  drive.folder("f");
  drive.write("f/first");
  drive.write("f/second");
  drive.settle();
  const auto sender = watch("f", receiver);
  receiver->holdReplies();
  drive.write("f/first", "12");
  ASSERT_TRUE(receiver->waitForUpdateOfName("first"));
  for (int size = 2; size < 12; ++size) {
    drive.write("f/second", std::string(static_cast<std::size_t>(size), 'x'));
    drive.settle();
  }
  receiver->releaseReplies();
  ASSERT_TRUE(receiver->waitForUpdateOfName("second"));
  std::size_t pushes = 0;
  for (const auto &item : receiver->items())
    if (item->fields().filename == "second") {
      ++pushes;
      EXPECT_EQ(item->fields().documentSize, 11U);
    }
  EXPECT_EQ(pushes, 1U);
}

TEST_F(SenderPushes, pushAContainersChangeAsTheRoots) {
  drive.settle();
  const auto sender = watch("", receiver);
  std::filesystem::create_directories(drive.replica() + "/org.example.Sketches/Documents");
  EXPECT_TRUE(receiver->waitForUpdateOfName("Sketches"));
  drive.write("Desktop");
  EXPECT_TRUE(receiver->waitForUpdateOfName("Desktop (com.quorva.Tessaly.desktop)"));
}

TEST_F(SenderPushes, pushWhatWentIntoPrivateStorageAsDead) {
  drive.write("a");
  drive.settle();
  const QVFileObjectID a = QVFileObjectID::documentID(drive.number("a"));
  const auto sender = watch("", receiver);
  drive.rename("a", drive.replica() + "/" + QVUbiquitousDefaultContainerID + "/private");
  EXPECT_TRUE(receiver->waitForDeath(a));
}

TEST_F(SenderPushes, ofASubtreeSeeWhatAFolderBringsAlong) {
  drive.folder("f");
  drive.folder("g/inner");
  drive.write("g/inner/deep");
  drive.settle();
  const auto sender =
      watch("f", receiver, QVWatchUpdates | QVWatchDeaths | QVWatchSubtree | QVWatchCoalesced);
  drive.rename("g", "f/g");
  EXPECT_TRUE(receiver->waitForUpdateOfName("deep"));
  const QVFileObjectID deep = QVFileObjectID::documentID(drive.number("f/g/inner/deep"));
  drive.remove("f/g");
  EXPECT_TRUE(receiver->waitForDeath(deep));
}

// What happens between the making of a sender and its watch.

TEST_F(SenderPushes, tellOfEachEarlierChangeOnce) {
  drive.folder("f");
  drive.settle();
  const auto sender = senderInto(receiver);
  for (int i = 0; i < 20; ++i) {
    drive.write("f/" + std::to_string(i));
    if (i % 5 == 0) drive.settle();
  }
  drive.settle();
  ASSERT_EQ(watchBy(sender, "f"), NSError());
  drive.write("f/last");
  ASSERT_TRUE(receiver->waitForUpdateOfName("last"));
  for (int i = 0; i < 20; ++i)
    EXPECT_EQ(pushesOf(QVFileObjectID::documentID(drive.number("f/" + std::to_string(i)))), 1U) << i;
}

TEST_F(SenderPushes, tellOfWhatMovedAwayEarlierAndDiedThereAsDead) {
  drive.folder("f");
  drive.folder("g");
  drive.write("f/a");
  drive.settle();
  const QVFileObjectID a = QVFileObjectID::documentID(drive.number("f/a"));
  const auto sender = senderInto(receiver);
  drive.rename("f/a", "g/a");
  drive.settle();
  drive.remove("g/a");
  drive.settle();
  ASSERT_EQ(watchBy(sender, "f"), NSError());
  EXPECT_TRUE(receiver->waitForDeath(a));
}

TEST_F(SenderPushes, tellOfWhatMovesAwayAndDiesWhileAPushIsUnderWayAsDead) {
  drive.folder("f");
  drive.folder("g");
  drive.write("f/a");
  drive.settle();
  const QVFileObjectID a = QVFileObjectID::documentID(drive.number("f/a"));
  const auto sender = watch("f", receiver);
  receiver->holdReplies();
  drive.write("f/first");
  ASSERT_TRUE(receiver->waitForUpdateOfName("first"));
  drive.rename("f/a", "g/a");
  drive.settle();
  drive.remove("g/a");
  drive.settle();
  receiver->releaseReplies();
  EXPECT_TRUE(receiver->waitForDeath(a));
}

TEST_F(SenderPushes, tellTheRootOfContainersThatCameAndWentEarlier) {
  std::filesystem::create_directories(drive.replica() + "/org.example.Old/Documents");
  drive.settle();
  const QVFileObjectID old =
      QVFileObjectID::folderOrAliasID(drive.number(drive.replica() + "/org.example.Old/Documents"));
  const auto sender = senderInto(receiver);
  std::filesystem::create_directories(drive.replica() + "/org.example.New/Documents");
  std::filesystem::remove_all(drive.replica() + "/org.example.Old");
  drive.write("Desktop");
  drive.settle();
  ASSERT_EQ(watchBy(sender, ""), NSError());
  EXPECT_TRUE(receiver->waitForUpdateOfName("New"));
  EXPECT_TRUE(receiver->waitForUpdateOfName("Desktop"));
  EXPECT_TRUE(receiver->waitForUpdateOfName("Desktop (com.quorva.Tessaly.desktop)"));
  EXPECT_TRUE(receiver->waitForDeath(old));
}

TEST_F(SenderPushes, ofASubtreeTellOfEarlierChangesBelow) {
  drive.folder("f");
  drive.folder("g/inner");
  drive.write("g/inner/deep");
  drive.folder("f/h");
  drive.write("f/h/dead");
  drive.settle();
  const QVFileObjectID dead = QVFileObjectID::documentID(drive.number("f/h/dead"));
  const auto sender = senderInto(receiver);
  drive.rename("g", "f/g");
  drive.settle();
  drive.write("f/g/inner/new");
  drive.remove("f/h");
  drive.settle();
  ASSERT_EQ(watchBy(sender, "f", kChildren | QVWatchSubtree), NSError());
  EXPECT_TRUE(receiver->waitForUpdateOfName("deep"));
  EXPECT_TRUE(receiver->waitForUpdateOfName("new"));
  EXPECT_TRUE(receiver->waitForDeath(dead));
}

TEST_F(SenderPushes, ofAFolderThatWasAwayForAWhileGoOn) {
  drive.folder("f");
  drive.folder("elsewhere");
  drive.settle();
  const auto sender = senderInto(receiver);
  drive.rename("f", "elsewhere/f");
  drive.settle();
  drive.write("elsewhere/f/a");
  drive.settle();
  drive.rename("elsewhere/f", "f");
  drive.settle();
  ASSERT_EQ(watchBy(sender, "f"), NSError());
  EXPECT_TRUE(receiver->waitForUpdateOfName("a"));
  drive.write("f/b");
  EXPECT_TRUE(receiver->waitForUpdateOfName("b"));
}

TEST_F(SenderPushes, areRefusedAWatchWhenTooMuchChangedEarlier) {
  drive.folder("f");
  drive.folder("g");
  drive.settle();
  const auto sender = senderInto(receiver);
  for (int i = 0; i < 5100; ++i) drive.write("g/" + std::to_string(i), "");
  ASSERT_TRUE(eventually([&] { return drive.knows("g/5099"); }));
  drive.settle();
  EXPECT_EQ(watchBy(sender, "f").code(), QVErrorChangeTokenExpired);
  drive.write("f/a");
  drive.settle();
  EXPECT_TRUE(receiver->items().empty());
  const auto next = watch("f", receiver);
  drive.write("f/b");
  EXPECT_TRUE(receiver->waitForUpdateOfName("b"));
}

TEST_F(SenderPushes, loseNothingWhileWatchesBegin) {
  drive.folder("f");
  drive.settle();
  for (int round = 0; round < 30; ++round) {
    const auto into = std::make_shared<RecordingReceiver>();
    const auto sender = senderInto(into);
    const std::string name = "early " + std::to_string(round);
    std::thread writer([&] { drive.write("f/" + name); });
    EXPECT_EQ(watchBy(sender, "f"), NSError());
    writer.join();
    EXPECT_TRUE(into->waitForUpdateOfName(name));
    sender->invalidate();
  }
}

TEST_F(SenderPushes, endWithTheirSession) {
  drive.settle();
  const auto session = drive.daemon().newSession();
  Once<std::shared_ptr<QVItemNotificationSender>, std::map<std::string, std::string>, NSError> answer(
      "sender");
  session->getItemUpdateSenderWithReceiver(receiver, answer.completion());
  Once<> boostEnded("end of the boost");
  answer.value<0>()->boostPriority(boostEnded.completion());
  EXPECT_EQ(drive.daemon().senders().count(), 1U);
  std::static_pointer_cast<KeldSession>(session)->end();
  EXPECT_TRUE(boostEnded.wait());
  EXPECT_EQ(drive.daemon().senders().count(), 0U);
}

TEST_F(SenderPushes, releaseTheirReceiverWhenInvalidated) {
  drive.settle();
  auto own = std::make_shared<RecordingReceiver>();
  const auto sender = watch("", own);
  const std::weak_ptr<RecordingReceiver> weak = own;
  own.reset();
  EXPECT_FALSE(weak.expired());
  sender->invalidate();
  EXPECT_TRUE(eventually([&] { return weak.expired(); }));
}

}  // namespace droxa::keld
